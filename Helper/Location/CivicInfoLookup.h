// SPDX-License-Identifier: Apache-2.0
//
// Turns a coordinate into the civic info that the telephony daemon gets: country, state, city and
// postal code from the map service, or after five seconds the configured country alone. Main
// thread, the map service's answer and the fallback included; hence no lock.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "Helper/Platform/MapService.h"

/// UTF-8 each; empty where it is not known.
struct CivicInfo {
  std::string countryCode;
  std::string state;
  std::string city;
  std::string postalCode;
};

/// 1 while an answer of the map service is awaited, else 0. Kept: one flag for all requests, so of
/// overlapping ones the first answer or fallback to come is delivered and the rest is dropped.
extern std::uint8_t waitingForGeocode;

/// Starts the look-up that ends in one delivery. For (0, 0) that is the configured country, without
/// asking the map service.
void RequestCivicInfoFromLatitudeLongitude(double latitude, double longitude);

/// Takes the map service's answer. `mapItems` and `error` may be null; `civicInfo` is empty and
/// receives what the answer holds. Delivers exactly once if an answer was awaited, otherwise never.
void CivicInfoCompletion(const std::shared_ptr<CivicInfo>& civicInfo,
                         const platform::MapItems* mapItems, const platform::MapError* error);

/// Delivers the configured country if the answer is still awaited.
void CivicInfoTimeout();

/// Delivers the configured country, with empty state, city and postal code.
void SendCountryOnlyCivicInfo();

/// The country code that the handset is set up for; empty, with one error line, without one.
[[nodiscard]] std::string CopyConfiguredCountryCode();
