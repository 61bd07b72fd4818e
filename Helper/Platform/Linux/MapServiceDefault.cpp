// SPDX-License-Identifier: Apache-2.0
//
// The map service of this system. Until the atlas is part of the program no geocoder is there, so
// every look-up ends in an error and the configured country is what gets delivered.
#include "Helper/Platform/Linux/GeocodingMapService.h"

namespace platform {
namespace {

class NoGeocoder final : public ReverseGeocoder {
 public:
  GeocodeAnswer lookUp(const Coordinate& /*place*/) override {
    return GeocodeError{"no geocoder is installed"};
  }
};

}  // namespace

template <>
MapService& DefaultProvider<MapService>() {
  static auto& geocoder = *new NoGeocoder;
  static MapService& service = *new GeocodingMapService(geocoder, geocoder);
  return service;
}

}  // namespace platform
