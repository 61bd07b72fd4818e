// SPDX-License-Identifier: Apache-2.0
//
// A clock that a test moves by hand. The test's thread only.
#pragma once

#include "Helper/Platform/Clock.h"

namespace fakes {

class ManualClock final : public platform::Clock {
 public:
  [[nodiscard]] platform::TimePoint now() const override { return now_; }
  [[nodiscard]] bool passes() const override { return false; }
  [[nodiscard]] bool providesTimers() const override { return providesTimers_; }

  void advance(std::chrono::duration<double> step) {
    now_ += std::chrono::duration_cast<platform::Duration>(step);
  }
  void refuseTimers() { providesTimers_ = false; }

 private:
  platform::TimePoint now_{std::chrono::hours(1)};
  bool providesTimers_ = true;
};

}  // namespace fakes
