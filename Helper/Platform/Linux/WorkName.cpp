// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/WorkName.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "Helper/Platform/Linux/FileLocation.h"

namespace platform {
namespace {

/// So many may work in one folder at the same time.
constexpr int kMostWorkers = 16;

FileDescriptor Open(int folder, const char* name, int flags) {
  return FileDescriptor(::openat(folder, name, flags | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0600));
}

/// Makes and opens the item. EEXIST when something stands there.
int Make(int folder, const char* name, WorkKind kind, FileDescriptor& item) {
  if (kind == WorkKind::kFile) {
    item = Open(folder, name, O_RDWR | O_CREAT | O_EXCL);
  } else if (::mkdirat(folder, name, 0700) == 0) {
    item = Open(folder, name, O_RDONLY | O_DIRECTORY);
  } else {
    return errno;
  }
  return item ? 0 : errno;
}

/// Locks what is open, unless it lost the name meanwhile to somebody who took it for a leftover.
bool Lock(int folder, const char* name, const FileDescriptor& item) {
  struct stat open {};
  struct stat named {};
  return ::flock(item.get(), LOCK_EX | LOCK_NB) == 0 && ::fstat(item.get(), &open) == 0 &&
         ::fstatat(folder, name, &named, AT_SYMLINK_NOFOLLOW) == 0 && open.st_dev == named.st_dev &&
         open.st_ino == named.st_ino;
}

/// Removes what stands at the name, unless somebody works on it. Whether the name is free now.
bool SweepLeftover(int folder, const char* name) {
  struct stat status {};
  if (::fstatat(folder, name, &status, AT_SYMLINK_NOFOLLOW) != 0) return errno == ENOENT;
  // Nobody works on anything else, and a device must not be opened.
  FileDescriptor item;
  if (S_ISREG(status.st_mode) || S_ISDIR(status.st_mode)) {
    item = Open(folder, name, O_RDONLY);
    if (!item || !Lock(folder, name, item)) return false;
  }
  return RemoveTree(folder, name) == 0;
}

}  // namespace

int MakeWorkItem(int folder, WorkKind kind, WorkItem& made) {
  for (int number = 0; number < kMostWorkers; ++number) {
    made.name = ".halvec-copy-" + std::to_string(number);
    const char* name = made.name.c_str();
    int error = Make(folder, name, kind, made.item);
    if (error == EEXIST && SweepLeftover(folder, name)) {
      error = Make(folder, name, kind, made.item);
    }
    if (error == 0 && Lock(folder, name, made.item)) return 0;
    // What was just made and is gone was taken for a leftover: the next name is as good.
    if (error != 0 && error != EEXIST && error != ENOENT) return error;
  }
  return EBUSY;
}

}  // namespace platform
