// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/PathWalk.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <string>

namespace platform {
namespace {

constexpr int kMostLinks = 40;  // the kernel's own limit
constexpr int kPathOnly = O_PATH | O_NOFOLLOW | O_CLOEXEC;

FileDescriptor Start(int folder, std::string_view path) {
  return FileDescriptor(
      ::openat(folder, path.starts_with('/') ? "/" : ".", kPathOnly | O_DIRECTORY));
}

/// Whether a link may be followed, and what it says.
bool ReadTrustedLink(int link, std::string& target) {
  struct stat status {};
  if (::fstat(link, &status) != 0) return false;
  if (status.st_uid != 0 && status.st_uid != ::geteuid()) {
    errno = EACCES;
    return false;
  }
  std::array<char, PATH_MAX> text;
  const ssize_t length = ::readlinkat(link, "", text.data(), text.size());
  if (length < 0) return false;
  target.assign(text.data(), static_cast<std::size_t>(length));
  return true;
}

bool IsLink(int item) {
  struct stat status {};
  return ::fstat(item, &status) == 0 && S_ISLNK(status.st_mode);
}

}  // namespace

FileDescriptor OpenPathAt(int folder, std::string_view path, LastLink last) {
  if (path.empty()) {
    errno = ENOENT;
    return {};
  }
  FileDescriptor at = Start(folder, path);
  std::string left;  // what `path` views once a link has been followed
  for (int links = 0; at;) {
    path.remove_prefix(std::min(path.find_first_not_of('/'), path.size()));
    if (path.empty()) break;
    const std::string name(path.substr(0, path.find('/')));
    path.remove_prefix(name.size());
    FileDescriptor next(::openat(at.get(), name.c_str(), kPathOnly | O_DIRECTORY));
    if (!next && errno == ENOTDIR) next.reset(::openat(at.get(), name.c_str(), kPathOnly));
    const bool isLast = path.find_first_not_of('/') == std::string_view::npos;
    if (next && (!isLast || last == LastLink::kFollow) && IsLink(next.get())) {
      std::string target;
      if (!ReadTrustedLink(next.get(), target)) return {};
      if (++links > kMostLinks) {
        errno = ELOOP;
        return {};
      }
      target += path;
      left = std::move(target);
      path = left;
      if (path.starts_with('/')) at = Start(folder, path);
      continue;
    }
    at = std::move(next);
  }
  return at;
}

FileDescriptor OpenDirectoryAt(int folder, std::string_view path) {
  FileDescriptor item = OpenPathAt(folder, path, LastLink::kFollow);
  struct stat status {};
  if (item && ::fstat(item.get(), &status) == 0 && !S_ISDIR(status.st_mode)) {
    item.reset();
    errno = ENOTDIR;
  }
  return item;
}

}  // namespace platform
