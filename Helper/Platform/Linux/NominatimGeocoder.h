// SPDX-License-Identifier: Apache-2.0
//
// Asks an https service that answers like Nominatim (its Reverse API, format jsonv2). The calling
// thread waits for the answer; callers on several threads are served side by side.
#pragma once

#include <string>
#include <utility>

#include "Helper/Platform/Clock.h"
#include "Helper/Platform/ReverseGeocoder.h"

namespace platform {

class NominatimGeocoder final : public ReverseGeocoder {
 public:
  /// `endpoint` is the service's base URL without the slash at its end. A look-up waits for `limit`
  /// at most.
  NominatimGeocoder(std::string endpoint, Duration limit)
      : endpoint_(std::move(endpoint)), limit_(limit) {}

  /// Sends the place rounded to four decimals (11 m), so that the service does not learn more than
  /// it needs. OpenSea where the service knows nothing; a GeocodeError where it does not answer in
  /// time, with status 200, with the JSON that is expected, or names no country.
  [[nodiscard]] GeocodeAnswer lookUp(const Coordinate& place) override;

 private:
  const std::string endpoint_;
  const Duration limit_;
};

}  // namespace platform
