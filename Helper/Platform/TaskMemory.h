// SPDX-License-Identifier: Apache-2.0
//
// Memory of the own address space in whole regions, as results that travel outside a message use
// it: allocated by a routine, handed over by the reply, and gone from here once the reply is sent.
// Any thread.
#pragma once

#include <cstddef>
#include <cstdint>

#include "Helper/Platform/SharedService.h"
#include "Helper/Shared/Interface/ReturnCodes.h"

namespace platform {

/// An address in the own address space; 0 is none.
using VmAddress = std::uint64_t;

class TaskMemory {
 public:
  virtual ~TaskMemory() = default;
  /// Allocates `size` zero-filled bytes anywhere. KERN_SUCCESS; KERN_INVALID_ARGUMENT for a size of
  /// 0; KERN_NO_SPACE. `address` is set on success only.
  [[nodiscard]] virtual KernReturn allocate(VmAddress& address, std::size_t size) = 0;
  /// Gives back a region in the size in which it was allocated.
  virtual void deallocate(VmAddress address, std::size_t size) = 0;
};

template <>
TaskMemory& DefaultProvider<TaskMemory>();

}  // namespace platform
