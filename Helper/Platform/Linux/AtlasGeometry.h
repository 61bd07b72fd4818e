// SPDX-License-Identifier: Apache-2.0
//
// The two functions that the atlas needs of the mathematics library, whose loading would cost every
// start of the helper as much as all its own initialisation. Pure; any thread.
#pragma once

#include <cstdint>
#include <numbers>

namespace platform {

/// The cosine of an angle of at most 90 degrees either way; never negative, less than
/// 1e-12 too large.
[[nodiscard]] constexpr double CosineOfDegrees(double degrees) {
  const double radians = degrees * std::numbers::pi / 180;
  const double square = radians * radians;
  // Taylor's series from its small end. It ends behind a positive term, so that the result of 90
  // degrees is not below zero.
  double sum = 0;
  for (int power = 16; power > 0; power -= 2) sum = (1 - sum) * square / (power * (power - 1));
  return 1 - sum;
}

/// The largest integer that is not above `value`, which must be far inside the range of 64 bits.
[[nodiscard]] constexpr std::int64_t Floor(double value) {
  const auto truncated = static_cast<std::int64_t>(value);
  return truncated - (static_cast<double>(truncated) > value ? 1 : 0);
}

}  // namespace platform
