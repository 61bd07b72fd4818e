// SPDX-License-Identifier: Apache-2.0
//
// Time as an argument: a run loop asks its clock, so that tests drive timers by hand. Any thread.
#pragma once

#include <chrono>

namespace platform {

using TimePoint = std::chrono::steady_clock::time_point;
using Duration = std::chrono::steady_clock::duration;

class Clock {
 public:
  virtual ~Clock() = default;
  [[nodiscard]] virtual TimePoint now() const = 0;
  /// Whether the time passes by itself, so that a waiting loop must wake for its next timer.
  [[nodiscard]] virtual bool passes() const = 0;
  /// Whether a timer can be created now; a test answers false to see what happens without one.
  [[nodiscard]] virtual bool providesTimers() const = 0;
};

/// The monotonic clock of the system.
[[nodiscard]] Clock& SystemClock();

}  // namespace platform
