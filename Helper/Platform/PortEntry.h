// SPDX-License-Identifier: Apache-2.0
//
// What the name space keeps under one name. Used by the port layer's own files only.
#pragma once

#include <cstddef>
#include <string>

#include "Helper/Platform/Port.h"

namespace platform {

/// The path of a service socket that this process bound; removes it when the right is given up,
/// unless somebody has put another socket there since.
class BoundPath {
 public:
  BoundPath() = default;
  explicit BoundPath(std::string path);
  BoundPath(BoundPath&& other) noexcept;
  BoundPath& operator=(BoundPath&& other) noexcept;
  ~BoundPath();

 private:
  std::string path_;
  dev_t device_ = 0;
  ino_t inode_ = 0;
};

struct PortEntry {
  SharedDescriptor receive;  // null when the receive right is not here
  SharedDescriptor send;     // the other end; null for a service port
  std::size_t sendReferences = 0;
  SharedDescriptor holder;
  BoundPath boundPath;
  [[nodiscard]] bool named() const { return receive && !send; }
};

[[nodiscard]] PortName PortInsertEntry(PortEntry entry);

}  // namespace platform
