// SPDX-License-Identifier: Apache-2.0
//
// The process-wide queue of default priority: work that belongs to no thread in particular. Its
// thread starts with the first use, so that a helper without such work has none.
#pragma once

#include <functional>

namespace asio {
class io_context;
}

namespace platform {

/// Runs `work` on the global queue, never inside this call. Any thread.
void PostToGlobalQueue(std::function<void()> work);

/// For sources of this folder that deliver there. One thread runs it, so that what it delivers and
/// what is posted never overlap. The first use throws std::system_error where no thread is to be
/// had, and the first source where no descriptor is; a later one tries again.
[[nodiscard]] asio::io_context& GlobalQueueContext();

}  // namespace platform
