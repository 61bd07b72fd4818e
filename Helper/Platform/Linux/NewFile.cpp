// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/NewFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <utility>

#include "Helper/Platform/Linux/FileLocation.h"
#include "Helper/Platform/Linux/WorkName.h"

namespace platform {
namespace {

bool IsDirectory(int folder, const char* name) {
  struct stat status {};
  return ::fstatat(folder, name, &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISDIR(status.st_mode);
}

}  // namespace

NewFile::~NewFile() {
  if (!workName_.empty()) ::unlinkat(folder_, workName_.c_str(), 0);
}

int NewFile::make(int folder, mode_t permissions) {
  folder_ = folder;
  item_.reset(::openat(folder, ".", O_TMPFILE | O_WRONLY | O_CLOEXEC, permissions));
  if (item_) return 0;
  // These are the ways to say that the file system has no files without names.
  if (errno != EOPNOTSUPP && errno != EISDIR && errno != ENOENT) return errno;
  WorkItem work;
  const int error = MakeWorkItem(folder, WorkKind::kFile, work);
  item_ = std::move(work.item);
  if (error == 0) workName_ = std::move(work.name);
  return error;
}

int NewFile::linkTo(const char* name) const {
  if (::linkat(item_.get(), "", folder_, name, AT_EMPTY_PATH) == 0) return 0;
  if (errno != ENOENT) return errno;
  // The call above is root's; this one is everybody's, and slower.
  const std::string path = "/proc/self/fd/" + std::to_string(item_.get());
  return ::linkat(AT_FDCWD, path.c_str(), folder_, name, AT_SYMLINK_FOLLOW) == 0 ? 0 : errno;
}

int NewFile::giveName(const char* name, IfTaken rule) {
  if (!workName_.empty()) {
    const char* work = workName_.c_str();
    const int error = rule == IfTaken::kFail ? RenameToFreeName(folder_, work, folder_, name)
                      : ::renameat(folder_, work, folder_, name) == 0 ? 0
                                                                      : errno;
    if (error == 0) workName_.clear();
    return error;
  }
  const int error = linkTo(name);
  if (error != EEXIST || rule == IfTaken::kFail) return error;
  if (IsDirectory(folder_, name)) return EISDIR;
  if (::unlinkat(folder_, name, 0) != 0) return errno;
  return linkTo(name);
}

}  // namespace platform
