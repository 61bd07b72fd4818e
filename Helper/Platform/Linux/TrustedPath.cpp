// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/TrustedPath.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <string>

namespace platform {
namespace {

bool IsTrusted(int descriptor) {
  struct stat status {};
  return ::fstat(descriptor, &status) == 0 && status.st_uid == 0 &&
         (status.st_mode & (S_IWGRP | S_IWOTH)) == 0;
}

}  // namespace

FileDescriptor OpenTrustedAt(int folder, const char* name, int flags) {
  FileDescriptor item(::openat(folder, name, flags | O_NOFOLLOW | O_CLOEXEC));
  if (!item || !IsTrusted(item.get())) return {};
  return item;
}

FileDescriptor OpenTrusted(std::string_view path, int flags) {
  if (path.empty() || path.front() != '/') return {};
  FileDescriptor item = OpenTrustedAt(AT_FDCWD, "/", O_PATH | O_DIRECTORY);
  while (item) {
    const std::size_t start = path.find_first_not_of('/');
    if (start == std::string_view::npos) break;
    path.remove_prefix(start);
    const std::string name(path.substr(0, path.find('/')));
    path.remove_prefix(name.size());
    const bool last = path.find_first_not_of('/') == std::string_view::npos;
    // ".." would leave the chain of folders that were looked at.
    if (name == "..") return {};
    item = OpenTrustedAt(item.get(), name.c_str(), last ? flags : O_PATH | O_DIRECTORY);
  }
  return item;
}

}  // namespace platform
