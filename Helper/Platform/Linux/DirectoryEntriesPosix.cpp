// SPDX-License-Identifier: Apache-2.0
//
// Directory entries through lstat(2), symlink(2) and remove(3). Any thread; no state.
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>

#include "Helper/Platform/DirectoryEntries.h"

namespace platform {
namespace {

class PosixDirectoryEntries final : public DirectoryEntries {
 public:
  std::optional<mode_t> mode(const char* path) override {
    struct stat status {};
    if (::lstat(path, &status) != 0) return std::nullopt;
    return status.st_mode;
  }
  bool makeLink(const char* target, const char* path) override {
    return ::symlink(target, path) == 0;
  }
  bool remove(const char* path) override { return std::remove(path) == 0; }
};

}  // namespace

template <>
DirectoryEntries& DefaultProvider<DirectoryEntries>() {
  static auto& entries = *new PosixDirectoryEntries;
  return entries;
}

}  // namespace platform
