// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/FileBody.h"

#include <fcntl.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <span>
#include <string_view>
#include <vector>

namespace platform {
namespace {

constexpr std::size_t kBlock = 256 * 1024;

/// Through a buffer, up to `end` or the end of the file.
int CopyByReading(int from, int to, off_t offset, off_t end) {
  std::vector<std::byte> buffer(kBlock);
  while (offset < end) {
    const auto wanted = static_cast<std::size_t>(std::min<off_t>(kBlock, end - offset));
    const ssize_t got = ::pread(from, buffer.data(), wanted, offset);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return errno;
    if (got == 0) return 0;
    if (const int error = WriteAll(to, buffer.data(), static_cast<std::size_t>(got), offset)) {
      return error;
    }
    offset += got;
  }
  return 0;
}

/// Whether the kernel copies between these two files at all.
bool IsRefusalToCopyInKernel(int error) {
  return error == EXDEV || error == EINVAL || error == ENOSYS || error == EOPNOTSUPP ||
         error == EPERM || error == ETXTBSY || error == EBADF;
}

int CopyRange(int from, int to, off_t offset, off_t end) {
  while (offset < end) {
    off_t in = offset;
    off_t out = offset;
    const ssize_t copied =
        ::copy_file_range(from, &in, to, &out, static_cast<std::size_t>(end - offset), 0);
    if (copied < 0 && errno == EINTR) continue;
    if (copied < 0) {
      return IsRefusalToCopyInKernel(errno) ? CopyByReading(from, to, offset, end) : errno;
    }
    // Nothing copied is the end of a file that became shorter, or of one whose size lies.
    if (copied == 0) return CopyByReading(from, to, offset, end);
    offset += copied;
  }
  return 0;
}

int CopySparse(int from, int to, off_t size) {
  for (off_t at = 0; at < size;) {
    const off_t data = ::lseek(from, at, SEEK_DATA);
    if (data < 0 && errno == ENXIO) break;  // only a hole is left
    const off_t hole = data < 0 ? -1 : ::lseek(from, data, SEEK_HOLE);
    if (hole < 0) return CopyRange(from, to, at, size);
    if (const int error = CopyRange(from, to, data, std::min(hole, size))) return error;
    at = hole;
  }
  return ::ftruncate(to, size) == 0 ? 0 : errno;
}

bool IsCarried(std::string_view attribute) {
  // A capability is a privilege like a set-id bit, and a label belongs to the place.
  return !attribute.starts_with("security.") && !attribute.starts_with("trusted.");
}

/// Sets an attribute, unless it is of a kind that this file system or process may not set.
int SetAttribute(int to, const char* name, std::span<const char> value) {
  if (::fsetxattr(to, name, value.data(), value.size(), 0) == 0) return 0;
  switch (errno) {
    case EOPNOTSUPP:
    case EPERM:
    case EACCES:
      return 0;
    case ENOSPC:
    case EDQUOT:
      return E2BIG;  // no room where attributes are kept, one block as a rule: the disk is not full
    default:
      return errno;
  }
}

/// The names of a file's attributes, each with a zero behind it; none on a file system without.
std::vector<char> AttributeNames(int file) {
  std::vector<char> names;
  for (;;) {
    ssize_t length = ::flistxattr(file, nullptr, 0);
    if (length <= 0) return {};
    names.resize(static_cast<std::size_t>(length));
    length = ::flistxattr(file, names.data(), names.size());
    if (length < 0 && errno == ERANGE) continue;  // one has been added meanwhile
    names.resize(static_cast<std::size_t>(std::max<ssize_t>(length, 0)));
    return names;
  }
}

int CopyExtendedAttributes(int from, int to) {
  const std::vector<char> names = AttributeNames(from);
  const char* end = names.data() + names.size();
  std::vector<char> value;
  for (const char* name = names.data(); name < end; name += std::string_view(name).size() + 1) {
    if (!IsCarried(name)) continue;
    value.resize(std::size_t{64} * 1024);  // the kernel's limit
    const ssize_t size = ::fgetxattr(from, name, value.data(), value.size());
    if (size < 0) continue;  // taken away meanwhile
    const std::span<const char> content(value.data(), static_cast<std::size_t>(size));
    if (const int error = SetAttribute(to, name, content)) return error;
  }
  return 0;
}

}  // namespace

bool EndsEveryWrite(int error) {
  return error == ENOSPC || error == EDQUOT || error == EROFS || error == EMFILE ||
         error == ENFILE || error == ENOMEM;
}

int WriteAll(int to, const std::byte* bytes, std::size_t count, off_t offset) {
  while (count > 0) {
    const ssize_t written = ::pwrite(to, bytes, count, offset);
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) return errno;
    bytes += written;
    count -= static_cast<std::size_t>(written);
    offset += written;
  }
  return 0;
}

int CopyFileBytes(int from, int to, const struct stat& status) {
  // Files of the kernel's own making say that they are empty.
  if (status.st_size == 0) return CopyByReading(from, to, 0, static_cast<off_t>(1) << 40);
  if (status.st_blocks < status.st_size / 512) return CopySparse(from, to, status.st_size);
  return CopyRange(from, to, 0, status.st_size);
}

int SetPermissions(int to, mode_t permissions) {
  struct stat status {};
  if (::fstat(to, &status) != 0) return errno;
  // To look is cheaper than to set what is so already.
  if ((status.st_mode & 07777) == permissions) return 0;
  return ::fchmod(to, permissions) == 0 ? 0 : errno;
}

int CopyFileAttributes(int from, int to, const struct stat& status) {
  struct stat made {};
  if (::fstat(to, &made) != 0) return errno;
  if ((made.st_uid != status.st_uid || made.st_gid != status.st_gid) &&
      ::fchown(to, status.st_uid, status.st_gid) != 0 && errno != EPERM && errno != EINVAL) {
    return errno;
  }
  // A folder stays even if not all of its attributes have room, so it gets the rest.
  const int attributes = CopyExtendedAttributes(from, to);
  const mode_t carried = S_ISDIR(status.st_mode) ? 01777 : 0777;
  if (const int error = SetPermissions(to, status.st_mode & carried)) return error;
  const timespec times[2] = {status.st_atim, status.st_mtim};
  return ::futimens(to, times) == 0 ? attributes : errno;
}

}  // namespace platform
