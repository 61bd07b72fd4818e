// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/FileLocation.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <string_view>
#include <utility>

#include "Helper/Platform/Linux/PathWalk.h"

namespace platform {
namespace {

constexpr int kPathOnly = O_PATH | O_DIRECTORY | O_CLOEXEC;

bool IsLink(int folder, const char* name) {
  struct stat status {};
  return ::fstatat(folder, name, &status, AT_SYMLINK_NOFOLLOW | AT_EMPTY_PATH) == 0 &&
         S_ISLNK(status.st_mode);
}

/// Opens one item of a folder, which must not be a link.
FileDescriptor OpenItem(int folder, const char* name, int flags) {
  FileDescriptor item(::openat(folder, name, flags | O_NOFOLLOW | O_CLOEXEC));
  const int error = errno;
  // A link that is opened for its path alone, or as a folder, is not called one by the kernel.
  const bool isLink = item ? IsLink(item.get(), "") : error == ENOTDIR && IsLink(folder, name);
  errno = isLink ? ELOOP : error;
  return isLink ? FileDescriptor() : std::move(item);
}

/// What the kernel's own walk does, step by step.
FileDescriptor WalkBeneath(int root, std::string_view subpath, int flags) {
  FileDescriptor at;
  while (true) {
    const std::size_t end = std::min(subpath.find('/'), subpath.size());
    const std::string name(subpath.substr(0, end));
    if (name == ".." || subpath.starts_with('/')) {
      errno = EXDEV;
      return {};
    }
    const bool last = end == subpath.size();
    FileDescriptor next = OpenItem(at ? at.get() : root, name.c_str(), last ? flags : kPathOnly);
    if (last || !next) return next;
    at = std::move(next);
    subpath.remove_prefix(std::min(subpath.find_first_not_of('/', end), subpath.size()));
  }
}

}  // namespace

FileDescriptor OpenBeneath(int root, const std::string& subpath, int flags) {
  open_how how{};
  how.flags = static_cast<std::uint64_t>(flags | O_CLOEXEC);
  how.resolve = RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS;
  FileDescriptor found(
      static_cast<int>(::syscall(SYS_openat2, root, subpath.c_str(), &how, sizeof how)));
  // Filters of system calls hide this one, because they cannot see the mode that it is given.
  if (!found && errno == ENOSYS) return WalkBeneath(root, subpath, flags);
  return found;
}

namespace {

SharedFolder Share(FileDescriptor folder) {
  return folder ? std::make_shared<const FileDescriptor>(std::move(folder)) : nullptr;
}

/// Finds the folder of a path.
int LocatePath(std::string_view path, FileLocation& location) {
  while (path.ends_with('/')) path.remove_suffix(1);
  const std::size_t slash = path.rfind('/');
  const std::string folder(slash == std::string_view::npos ? (path.empty() ? "/" : ".")
                                                           : path.substr(0, slash + 1));
  location.name = slash == std::string_view::npos ? path : path.substr(slash + 1);
  if (location.name.empty()) location.name = ".";
  location.holder = Share(OpenDirectoryAt(AT_FDCWD, folder));
  return location.holder ? 0 : errno;
}

/// Finds the folder of what stands below a directory: the one of the last time, as a rule.
int LocateBelow(const FilePlace& place, OpenFolders& opened, FileLocation& location) {
  const std::size_t slash = place.subpath.rfind('/');
  const std::size_t length = slash == std::string::npos ? 0 : slash;
  location.name.assign(place.subpath, slash == std::string::npos ? 0 : slash + 1);
  if (!opened.folder || place.subpath.compare(0, length, opened.path) != 0) {
    if (!opened.root) opened.root = Share(OpenDirectoryAt(AT_FDCWD, place.path));
    if (!opened.root) return errno;
    opened.path.assign(place.subpath, 0, length);
    opened.folder =
        length == 0 ? opened.root : Share(OpenBeneath(opened.root->get(), opened.path, kPathOnly));
  }
  location.holder = opened.folder;
  return location.holder ? 0 : errno;
}

}  // namespace

int Locate(const FilePlace& place, FileLocation& location) {
  if (place.path.empty()) return kNoErrorObject;
  if (place.subpath.empty()) return LocatePath(place.path, location);
  if (!place.opened) place.opened = std::make_shared<OpenFolders>();
  return LocateBelow(place, *place.opened, location);
}

int RenameToFreeName(int fromFolder, const char* from, int toFolder, const char* to) {
  if (::renameat2(fromFolder, from, toFolder, to, RENAME_NOREPLACE) == 0) return 0;
  if (errno != EINVAL) return errno;
  // Either the rename is impossible or the file system does not know the flag.
  struct stat status {};
  if (::fstatat(toFolder, to, &status, AT_SYMLINK_NOFOLLOW) == 0) return EEXIST;
  if (errno != ENOENT) return errno;
  return ::renameat(fromFolder, from, toFolder, to) == 0 ? 0 : errno;
}

bool IsWithin(int inner, const struct stat& outer) {
  FileDescriptor at(::openat(inner, ".", kPathOnly));
  struct stat last {};
  while (at) {
    struct stat status {};
    if (::fstat(at.get(), &status) != 0) return false;
    if (status.st_dev == outer.st_dev && status.st_ino == outer.st_ino) return true;
    if (status.st_dev == last.st_dev && status.st_ino == last.st_ino) return false;
    last = status;
    at.reset(::openat(at.get(), "..", kPathOnly));
  }
  return false;
}

FileDescriptor OpenFolder(int folder, const char* name) {
  return FileDescriptor(
      ::openat(folder, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
}

FolderReader::FolderReader(FileDescriptor folder) {
  if (!folder) return;
  stream_.reset(::fdopendir(folder.get()));
  if (stream_) (void)folder.release();  // the stream closes it
}

const dirent* FolderReader::next() {
  while (true) {
    errno = 0;
    // The stream belongs to this object alone, so the call is safe on any thread.
    const dirent* entry = ::readdir(stream_.get());  // NOLINT(concurrency-mt-unsafe)
    if (!entry) {
      error_ = errno;
      return nullptr;
    }
    const std::string_view name = entry->d_name;
    if (name != "." && name != "..") return entry;
  }
}

int RemoveTree(int folder, const char* name, int level) {
  if (::unlinkat(folder, name, 0) == 0) return 0;
  if (errno != EISDIR) return errno;
  if (level > kDeepestLevel) return ENAMETOOLONG;
  FolderReader reader(OpenFolder(folder, name));
  if (!reader) return errno;
  int first = 0;
  // A file system may pass over names while others are removed, so an emptied folder is read again.
  for (bool removed = true; removed && first == 0; reader.rewind()) {
    removed = false;
    while (const dirent* entry = reader.next()) {
      const int error = RemoveTree(reader.descriptor(), entry->d_name, level + 1);
      removed = removed || error == 0;
      if (first == 0) first = error;
    }
    if (first == 0) first = reader.error();
  }
  if (::unlinkat(folder, name, AT_REMOVEDIR) == 0) return 0;
  return first != 0 ? first : errno;
}

}  // namespace platform
