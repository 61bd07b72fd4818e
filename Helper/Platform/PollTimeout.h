// SPDX-License-Identifier: Apache-2.0
//
// How long to wait for something that is over at a point in time. No state; any thread.
#pragma once

#include <algorithm>
#include <chrono>
#include <climits>
#include <cstdint>

#include "Helper/Platform/Clock.h"

namespace platform {

/// Milliseconds until `time` as poll(2) and epoll_wait(2) take them: 0 when it has passed, -1 (wait
/// for as long as nothing happens) for TimePoint::max(). Rounded up, so that nobody spins through
/// the last millisecond.
[[nodiscard]] inline int MillisecondsUntil(TimePoint time) {
  if (time == TimePoint::max()) return -1;
  const auto left =
      std::chrono::ceil<std::chrono::milliseconds>(time - std::chrono::steady_clock::now());
  return static_cast<int>(std::clamp<std::int64_t>(left.count(), 0, INT_MAX));
}

}  // namespace platform
