// SPDX-License-Identifier: Apache-2.0
//
// The map service of this system: the online geocoder where the build names one. Until the atlas is
// part of the program, every other look-up ends in an error, so that the configured country is what
// gets delivered.
#include <string_view>

#include "Helper/Platform/Linux/GeocoderChain.h"
#include "Helper/Platform/Linux/GeocodingMapService.h"
#include "Helper/Platform/Linux/NominatimGeocoder.h"

namespace platform {
namespace {

constexpr std::string_view kEndpoint = HALVEC_GEOCODER_ENDPOINT;
/// Less than the five seconds after which nobody waits for the answer any more.
constexpr Duration kOnlineLimit = std::chrono::seconds(4);

class NoGeocoder final : public ReverseGeocoder {
 public:
  GeocodeAnswer lookUp(const Coordinate& /*place*/) override {
    return GeocodeError{"no geocoder is installed"};
  }
};

MapService& MakeMapService() {
  auto& offline = *new NoGeocoder;
  if (kEndpoint.empty()) return *new GeocodingMapService(offline, offline);
  auto& online = *new NominatimGeocoder(std::string(kEndpoint), kOnlineLimit);
  return *new GeocodingMapService(*new GeocoderChain(offline, online), offline);
}

}  // namespace

template <>
MapService& DefaultProvider<MapService>() {
  static MapService& service = MakeMapService();  // never destroyed: look-ups may be under way
  return service;
}

}  // namespace platform
