// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/GeocoderChain.h"

#include <utility>

namespace platform {
namespace {

/// `detailed` with what it lacks from `basic`. A city of the one in a state of the other may be no
/// place at all, so it is taken only where the two agree on the state.
CivicAddress Completed(CivicAddress detailed, CivicAddress basic) {
  const bool sameState = !detailed.state || detailed.state == basic.state;
  if (!detailed.city && sameState) detailed.city = std::move(basic.city);
  if (!detailed.state) detailed.state = std::move(basic.state);
  if (!detailed.postCode) detailed.postCode = std::move(basic.postCode);
  return detailed;
}

}  // namespace

GeocodeAnswer GeocoderChain::lookUp(const Coordinate& place) {
  GeocodeAnswer first = first_.lookUp(place);
  GeocodeAnswer second = second_.lookUp(place);
  if (std::holds_alternative<GeocodeError>(second)) return first;
  auto* basic = std::get_if<CivicAddress>(&first);
  auto* detailed = std::get_if<CivicAddress>(&second);
  if (!basic) return detailed || std::holds_alternative<GeocodeError>(first) ? second : first;
  if (!detailed || detailed->countryCode != basic->countryCode) return first;
  return Completed(std::move(*detailed), std::move(*basic));
}

}  // namespace platform
