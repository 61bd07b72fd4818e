// SPDX-License-Identifier: Apache-2.0
//
// Directory entries through lstat(2), symlinkat(2) and unlinkat(2), below the folder that the path
// leads to (PathWalk.h). Any thread; no state.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <string>
#include <string_view>

#include "Helper/Platform/DirectoryEntries.h"
#include "Helper/Platform/Linux/FileLocation.h"

namespace platform {
namespace {

/// Finds the folder of an entry, and its name with the slash that the path may have at its end: the
/// kernel then takes it for a directory's.
bool LocateEntry(std::string_view path, FileLocation& at) {
  if (Locate(std::string(path), at) != 0) return false;
  if (path.ends_with('/')) at.name += '/';
  return true;
}

class PosixDirectoryEntries final : public DirectoryEntries {
 public:
  std::optional<mode_t> mode(const char* path) override {
    struct stat status {};
    if (::lstat(path, &status) != 0) return std::nullopt;
    return status.st_mode;
  }
  bool makeLink(const char* target, const char* path) override {
    FileLocation at;
    return LocateEntry(path, at) && ::symlinkat(target, at.folder(), at.name.c_str()) == 0;
  }
  bool remove(const char* path) override {
    FileLocation at;
    if (!LocateEntry(path, at)) return false;
    return ::unlinkat(at.folder(), at.name.c_str(), 0) == 0 ||
           (errno == EISDIR && ::unlinkat(at.folder(), at.name.c_str(), AT_REMOVEDIR) == 0);
  }
};

}  // namespace

template <>
DirectoryEntries& DefaultProvider<DirectoryEntries>() {
  static auto& entries = *new PosixDirectoryEntries;
  return entries;
}

}  // namespace platform
