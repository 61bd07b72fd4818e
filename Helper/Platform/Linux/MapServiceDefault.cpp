// SPDX-License-Identifier: Apache-2.0
//
// The map service of this system: the atlas, and the online geocoder where the build names one.
#include "Helper/Platform/Linux/AtlasGeocoder.h"
#include "Helper/Platform/Linux/GeocoderChain.h"
#include "Helper/Platform/Linux/GeocodingMapService.h"
#include "Helper/Platform/Linux/NominatimGeocoder.h"

namespace platform {
namespace {

constexpr const char* kEndpoint = HALVEC_GEOCODER_ENDPOINT;
/// Less than the five seconds after which nobody waits for the answer any more.
constexpr Duration kOnlineLimit = std::chrono::seconds(4);

MapService& MakeMapService() {
  auto& atlas = *new AtlasGeocoder(HALVEC_ATLAS_FILE);
  if (*kEndpoint == '\0') return *new GeocodingMapService(atlas, atlas);
  auto& online = *new NominatimGeocoder(kEndpoint, kOnlineLimit);
  return *new GeocodingMapService(*new GeocoderChain(atlas, online), atlas);
}

}  // namespace

template <>
MapService& DefaultProvider<MapService>() {
  static MapService& service = MakeMapService();  // never destroyed: look-ups may be under way
  return service;
}

}  // namespace platform
