// SPDX-License-Identifier: Apache-2.0
//
// A clock that a test moves by hand. Any thread may ask it; one thread moves it.
#pragma once

#include <atomic>

#include "Helper/Platform/Clock.h"

namespace fakes {

class ManualClock final : public platform::Clock {
 public:
  [[nodiscard]] platform::TimePoint now() const override {
    return platform::TimePoint(now_.load());
  }
  [[nodiscard]] bool passes() const override { return false; }
  [[nodiscard]] bool providesTimers() const override { return providesTimers_; }

  void advance(std::chrono::duration<double> step) {
    now_ = now_.load() + std::chrono::duration_cast<platform::Duration>(step);
  }
  void refuseTimers() { providesTimers_ = false; }

 private:
  std::atomic<platform::Duration> now_{platform::Duration(std::chrono::hours(1))};
  bool providesTimers_ = true;
};

}  // namespace fakes
