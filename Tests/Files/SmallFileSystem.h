// SPDX-License-Identifier: Apache-2.0
//
// A small file system in memory, of its own, which only root can mount. One thread.
#pragma once

#include <sys/mount.h>

#include <string>

namespace files_test {

class SmallFileSystem {
 public:
  explicit SmallFileSystem(const std::string& path, const char* options = "size=256k")
      : path_(path) {
    mounted_ = ::mount("tmpfs", path.c_str(), "tmpfs", 0, options) == 0;
  }
  ~SmallFileSystem() {
    if (mounted_) ::umount2(path_.c_str(), MNT_DETACH);
  }
  SmallFileSystem(const SmallFileSystem&) = delete;
  SmallFileSystem& operator=(const SmallFileSystem&) = delete;
  explicit operator bool() const { return mounted_; }

 private:
  std::string path_;
  bool mounted_ = false;
};

}  // namespace files_test
