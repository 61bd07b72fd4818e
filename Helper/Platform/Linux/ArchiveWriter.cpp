// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/ArchiveWriter.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <utility>

#include "Helper/Platform/Linux/FileBody.h"
#include "Helper/Platform/Linux/FileLocation.h"

namespace platform {
namespace {

constexpr int kPathOnly = O_PATH | O_DIRECTORY;
constexpr mode_t kFileMode = 0644;
constexpr mode_t kFolderMode = 0755;
constexpr mode_t kPermissionBits = 0777;

std::string_view FolderOf(std::string_view path) {
  const std::size_t slash = path.rfind('/');
  return slash == std::string_view::npos ? std::string_view() : path.substr(0, slash);
}

/// The last component, which ends with the path.
const char* NameOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  return path.c_str() + (slash == std::string::npos ? 0 : slash + 1);
}

mode_t PermissionsOf(const ArchiveItemStatus& status, mode_t without) {
  const mode_t permissions = status.permissions & kPermissionBits;
  return permissions != 0 ? permissions : without;
}

/// Takes away what a link or a folder is to replace. EISDIR for a directory, 0 when nothing stands
/// there now.
int MakeRoom(int folder, const char* name) {
  return ::unlinkat(folder, name, 0) == 0 || errno == ENOENT ? 0 : errno;
}

}  // namespace

int ArchiveItemPath(std::string_view name, std::string& path) {
  path.clear();
  if (name.starts_with('/')) return EINVAL;
  int levels = 0;
  while (!name.empty()) {
    const std::string_view component = name.substr(0, name.find('/'));
    name.remove_prefix(std::min(name.size(), component.size() + 1));
    if (component.empty() || component == ".") continue;
    if (component == "..") return EINVAL;
    if (!path.empty()) path += '/';
    path += component;
    // Nothing is made that the file manager could not remove again.
    if (++levels > kDeepestLevel || path.size() >= PATH_MAX) return ENAMETOOLONG;
  }
  return 0;
}

/// Walks to a folder from the destination, making what is missing.
int ArchiveWriter::openOrMakeFolder(std::string_view path) {
  FileDescriptor at(::openat(root_.get(), ".", kPathOnly | O_CLOEXEC));
  for (std::size_t end = 0; at && end < path.size();) {
    const std::size_t start = end == 0 ? 0 : end + 1;
    end = std::min(path.find('/', start), path.size());
    const std::string name(path.substr(start, end - start));
    const int flags = kPathOnly | O_NOFOLLOW | O_CLOEXEC;
    FileDescriptor next(::openat(at.get(), name.c_str(), flags));
    if (!next && errno == ENOENT) {
      if (::mkdirat(at.get(), name.c_str(), 0700) != 0) return errno;
      folders_.emplace(path.substr(0, end), ArchiveItemStatus{});
      next.reset(::openat(at.get(), name.c_str(), flags));
    }
    at = std::move(next);
  }
  if (!at) return errno;
  folder_ = std::move(at);
  return 0;
}

/// Makes the folder that holds an item the current one.
int ArchiveWriter::openFolderOf(const std::string& path) {
  const std::string_view wanted = FolderOf(path);
  if (folder_ && folderPath_ == wanted) return 0;
  folder_.reset();
  folderPath_ = wanted;
  if (!wanted.empty()) folder_ = OpenBeneath(root_.get(), folderPath_, kPathOnly);
  if (folder_) return 0;
  return wanted.empty() || errno == ENOENT ? openOrMakeFolder(wanted) : errno;
}

int ArchiveWriter::makeFolder(const std::string& path, const ArchiveItemStatus& status) {
  if (path.empty()) return 0;  // the destination itself
  if (const int error = openFolderOf(path)) return error;
  const char* name = NameOf(path);
  struct stat existing {};
  if (::fstatat(folder_.get(), name, &existing, AT_SYMLINK_NOFOLLOW) == 0) {
    if (S_ISDIR(existing.st_mode)) {
      // Made here for something in it that came before, it gets its status after all.
      if (const auto made = folders_.find(path); made != folders_.end()) made->second = status;
      return 0;
    }
    if (const int error = MakeRoom(folder_.get(), name)) return error;
  }
  if (::mkdirat(folder_.get(), name, 0700) != 0) return errno;
  folders_.insert_or_assign(path, status);
  return 0;
}

int ArchiveWriter::makeLink(const std::string& path, const std::string& target,
                            const ArchiveItemStatus& status) {
  if (path.empty()) return EISDIR;
  if (const int error = openFolderOf(path)) return error;
  const char* name = NameOf(path);
  if (const int error = MakeRoom(folder_.get(), name)) return error;
  if (::symlinkat(target.c_str(), folder_.get(), name) != 0) return errno;
  const timespec times[2] = {status.accessed, status.modified};
  // Nothing depends on the times of a link.
  (void)::utimensat(folder_.get(), name, times, AT_SYMLINK_NOFOLLOW);
  return 0;
}

int ArchiveWriter::beginFile(const std::string& path, const ArchiveItemStatus& status,
                             NewFile& file) {
  if (path.empty()) return EISDIR;
  if (const int error = openFolderOf(path)) return error;
  return file.make(folder_.get(), PermissionsOf(status, kFileMode));
}

int ArchiveWriter::write(const NewFile& file, std::span<const std::byte> bytes, off_t offset) {
  return WriteAll(file.descriptor(), bytes.data(), bytes.size(), offset);
}

int ArchiveWriter::finishFile(NewFile& file, const std::string& path,
                              const ArchiveItemStatus& status) {
  const timespec times[2] = {status.accessed, status.modified};
  const int error = SetPermissions(file.descriptor(), PermissionsOf(status, kFileMode));
  if (error != 0) return error;
  if (::futimens(file.descriptor(), times) != 0) return errno;
  return file.giveName(NameOf(path), IfTaken::kReplace);
}

void ArchiveWriter::removeFile(const std::string& path) {
  if (openFolderOf(path) != 0 || ::unlinkat(folder_.get(), NameOf(path), 0) != 0) return;
  for (std::string folder(FolderOf(path)); folders_.contains(folder); folder = FolderOf(folder)) {
    // With the folder above as the current one, none that is removed stays current.
    if (openFolderOf(folder) != 0) return;
    if (::unlinkat(folder_.get(), NameOf(folder), AT_REMOVEDIR) != 0) return;
    folders_.erase(folder);
  }
}

void ArchiveWriter::finishFolders() {
  // Backwards in the order of their paths, what is in a folder comes before the folder.
  for (auto entry = folders_.rbegin(); entry != folders_.rend(); ++entry) {
    const auto& [path, status] = *entry;
    const FileDescriptor folder = OpenBeneath(root_.get(), path, O_RDONLY | O_DIRECTORY);
    if (!folder) continue;  // taken away by somebody else
    const timespec times[2] = {status.accessed, status.modified};
    // The folders belong to this process; where that is not so any more, they are left alone.
    (void)::fchmod(folder.get(), PermissionsOf(status, kFolderMode));
    (void)::futimens(folder.get(), times);
  }
  folders_.clear();
}

}  // namespace platform
