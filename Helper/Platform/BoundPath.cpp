// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/BoundPath.h"

#include <sys/stat.h>
#include <unistd.h>

#include <utility>

namespace platform {

BoundPath::BoundPath(std::string path) : path_(std::move(path)) {
  struct stat status {};
  if (::lstat(path_.c_str(), &status) != 0) path_.clear();
  device_ = status.st_dev;
  inode_ = status.st_ino;
}

BoundPath::~BoundPath() {
  struct stat status {};
  if (path_.empty() || ::lstat(path_.c_str(), &status) != 0) return;
  if (status.st_dev == device_ && status.st_ino == inode_) (void)::unlink(path_.c_str());
}

}  // namespace platform
