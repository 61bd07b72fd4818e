// SPDX-License-Identifier: Apache-2.0
//
// How much of the heap this process holds through `new`, for tests that let much time pass
// or much through. Belongs to the sources of the programs that ask for it.
#pragma once

#include <cstddef>

namespace support {

/// Blocks that have been allocated and not given back, on any thread.
[[nodiscard]] std::ptrdiff_t LiveAllocations();

}  // namespace support
