// SPDX-License-Identifier: Apache-2.0
//
// Two geocoders as one: the first decides which country it is, the second may know more about the
// place. Any thread, as far as the two allow it; no state.
#pragma once

#include "Helper/Platform/ReverseGeocoder.h"

namespace platform {

class GeocoderChain final : public ReverseGeocoder {
 public:
  /// Both are borrowed.
  GeocoderChain(ReverseGeocoder& first, ReverseGeocoder& second) : first_(first), second_(second) {}

  /// The first one's answer, completed from the second's address if both name the same country, or
  /// replaced by it if the first has no country. A second answer that is an error counts for
  /// nothing.
  [[nodiscard]] GeocodeAnswer lookUp(const Coordinate& place) override;

 private:
  ReverseGeocoder& first_;
  ReverseGeocoder& second_;
};

}  // namespace platform
