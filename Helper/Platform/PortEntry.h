// SPDX-License-Identifier: Apache-2.0
//
// What the name space keeps under one name. Used by the port layer's own files only.
#pragma once

#include <cstddef>

#include "Helper/Platform/Port.h"

namespace platform {

struct PortEntry {
  SharedDescriptor receive;  // null when the receive right is not here
  SharedDescriptor send;     // the other end; null for a service port
  std::size_t sendReferences = 0;
  SharedDescriptor holder;
  [[nodiscard]] bool named() const { return receive && !send; }
};

[[nodiscard]] PortName PortInsertEntry(PortEntry entry);

}  // namespace platform
