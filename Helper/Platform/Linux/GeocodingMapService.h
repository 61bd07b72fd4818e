// SPDX-License-Identifier: Apache-2.0
//
// The map service over reverse geocoders. Look-ups run one after the other on a work queue of their
// own; only their answers come to the main thread.
#pragma once

#include <memory>

#include "Helper/Platform/Clock.h"
#include "Helper/Platform/MapService.h"

namespace platform {

class GeocodingMapService final : public MapService {
 public:
  /// `geocoder` answers look-ups, and may take its time; `quickGeocoder` those that had to wait for
  /// another one so long that `geocoder` could not answer in time. All three are borrowed and
  /// outlive the service and its look-ups.
  GeocodingMapService(ReverseGeocoder& geocoder, ReverseGeocoder& quickGeocoder,
                      const Clock& clock = SystemClock());

  /// The options have no effect: every geocoder here works in WGS 84, knows no arrival times and no
  /// traits. The answer is an empty list where the place is open sea, else one item or an error.
  [[nodiscard]] std::unique_ptr<MapTicket> reverseGeocodeTicket(
      const Coordinate& coordinate, const ReverseGeocodeOptions& options) override;

 private:
  class Lookup;
  class Ticket;
  const std::shared_ptr<Lookup> lookup_;
};

}  // namespace platform
