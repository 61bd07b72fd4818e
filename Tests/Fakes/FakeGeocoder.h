// SPDX-License-Identifier: Apache-2.0
//
// A geocoder that answers what the test says. Any thread; one lock, not held while `whenAsked`
// runs.
#pragma once

#include <functional>
#include <mutex>
#include <utility>
#include <vector>

#include "Helper/Platform/ReverseGeocoder.h"

namespace fakes {

class FakeGeocoder final : public platform::ReverseGeocoder {
 public:
  explicit FakeGeocoder(platform::GeocodeAnswer answer) : answer(std::move(answer)) {}

  platform::GeocodeAnswer answer;   // set before anybody asks
  std::function<void()> whenAsked;  // likewise; may block

  platform::GeocodeAnswer lookUp(const platform::Coordinate& place) override {
    {
      const std::lock_guard guard(mutex_);
      asked_.push_back(place);
    }
    if (whenAsked) whenAsked();
    return answer;
  }

  /// The places that were asked for, in that order.
  [[nodiscard]] std::vector<platform::Coordinate> asked() {
    const std::lock_guard guard(mutex_);
    return asked_;
  }

 private:
  std::mutex mutex_;
  std::vector<platform::Coordinate> asked_;
};

}  // namespace fakes
