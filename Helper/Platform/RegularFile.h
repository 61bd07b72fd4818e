// SPDX-License-Identifier: Apache-2.0
//
// The content of a file that somebody else named: whole, bounded, and never waiting. Any thread; no
// state.
#pragma once

#include <cstddef>
#include <optional>
#include <vector>

namespace platform {

/// All bytes of the regular file at `path`, a C string; links are followed. None when there is no
/// such file, it cannot be read, it is of another type (a FIFO or device is not waited for), or it
/// has more than `limit` bytes.
[[nodiscard]] std::optional<std::vector<std::byte>> ReadRegularFile(const char* path,
                                                                    std::size_t limit);

}  // namespace platform
