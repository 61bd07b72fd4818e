// SPDX-License-Identifier: Apache-2.0
//
// How every thread of the helper but the main one begins. Any thread, no lock.
#pragma once

#include <functional>

namespace platform {

/// Runs `body` on a thread of its own, which no signal reaches: signals are the main thread's
/// affair. Throws std::system_error where no thread is to be had.
void StartDetachedThread(std::function<void()> body);

}  // namespace platform
