// SPDX-License-Identifier: Apache-2.0
//
// The name of a local socket in the file system, for as long as the process that bound it serves
// it. No lock: it belongs to what owns the socket.
#pragma once

#include <sys/types.h>

#include <string>

namespace platform {

/// The path of a local socket that this process bound; removes it at the end, unless somebody has
/// put another file there since.
class BoundPath {
 public:
  /// Owns `path`, at which a socket has just been bound; nothing if there is none.
  explicit BoundPath(std::string path);
  BoundPath(const BoundPath&) = delete;
  BoundPath& operator=(const BoundPath&) = delete;
  ~BoundPath();

 private:
  std::string path_;
  dev_t device_ = 0;
  ino_t inode_ = 0;
};

}  // namespace platform
