// SPDX-License-Identifier: Apache-2.0
//
// How much of the heap this process holds through `new`, for tests that let much time pass.
#pragma once

#include <cstddef>

namespace heartbeat_test {

/// Blocks that have been allocated and not given back, on any thread.
[[nodiscard]] std::ptrdiff_t LiveAllocations();

}  // namespace heartbeat_test
