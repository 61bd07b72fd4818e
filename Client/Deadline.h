// SPDX-License-Identifier: Apache-2.0
//
// The end of a bounded wait. A value without a lock; waiting blocks the calling thread only.
#pragma once

#include <poll.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <climits>

namespace halvec {

/// A moment on the monotonic clock, or never.
class Deadline {
 public:
  /// `limit` from now; never when it is 0.
  explicit Deadline(std::chrono::milliseconds limit) noexcept
      : never_(limit.count() == 0), end_(never_ ? Clock::time_point{} : Clock::now() + limit) {}

  /// Milliseconds left, rounded up, as poll(2) takes them: 0 when over, -1 for never.
  [[nodiscard]] int remaining() const noexcept {
    if (never_) return -1;
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(end_ - Clock::now()).count();
    return static_cast<int>(std::clamp<long long>(left, 0, INT_MAX));
  }

  /// Waits until `descriptor` shows one of `events`, a hang-up or an error, but no longer than
  /// until the deadline and, where given, `atMost` milliseconds. Answers what it shows, 0 when the
  /// time was over first.
  [[nodiscard]] short wait(int descriptor, short events, int atMost = INT_MAX) const noexcept {
    for (;;) {
      pollfd entry{descriptor, events, 0};
      const int left = remaining();
      const int limit =
          left < 0 && atMost == INT_MAX ? -1 : std::min(left < 0 ? atMost : left, atMost);
      const int ready = ::poll(&entry, 1, limit);
      if (ready >= 0) return entry.revents;
      if (errno != EINTR) return POLLERR;
    }
  }

 private:
  using Clock = std::chrono::steady_clock;
  bool never_;
  Clock::time_point end_;
};

}  // namespace halvec
