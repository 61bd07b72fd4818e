// SPDX-License-Identifier: Apache-2.0
//
// How the parts of an atlas make an address: the country exactly, the state within that country,
// the city that attracts the place most. Any thread; no state.
#include "Helper/Platform/Linux/Atlas.h"

#include <limits>

#include "Helper/Platform/Linux/AtlasGeometry.h"

namespace platform {
namespace {

// How far a state is taken from the nearest place where no outline says it, and a city at all.
constexpr double kStateReach = 200;  // kilometres
constexpr double kCityReach = 30;    // kilometres

// The attraction of a city: its distance, and a little so that the very centre of a village does
// not beat everything, divided by its weight.
constexpr double kLeastDistance = 0.3;  // kilometres
constexpr double kOtherState = 3;       // a city in another state counts this much farther

constexpr std::size_t kCodeLength = 2;
constexpr std::size_t kStateBytes = 8;

}  // namespace

Atlas::Atlas(AtlasFile file)
    : file_(std::move(file)),
      countries_(file_.section(AtlasSection::kCountryNodes),
                 file_.section(AtlasSection::kCountryLeaves)),
      states_(file_.section(AtlasSection::kStateNodes), file_.section(AtlasSection::kStateLeaves)),
      places_(file_.section(AtlasSection::kGrid), file_.section(AtlasSection::kPlaces)) {}

GeocodeAnswer Atlas::lookUp(const Coordinate& place) const {
  const auto country = countryAt(place);
  if (!country) return GeocodeError{"damaged tree of countries"};
  if (*country == 0) return OpenSea{};
  CivicAddress address;
  address.countryCode = countryCode(*country);
  if (!address.countryCode) return GeocodeError{"damaged table of countries"};
  auto stateId = stateAt(place, *country);
  if (!stateId) return GeocodeError{"damaged tree of states"};
  if (state(*stateId).name == 0) stateId = stateOfNearestPlace(place, *country);
  address.state = nameAt(state(*stateId).name);
  address.city = cityAt(place, *country, *stateId);
  return address;
}

std::optional<std::uint16_t> Atlas::countryAt(const Coordinate& place) const {
  auto leaf = countries_.leafAt(place);
  if (!leaf) return std::nullopt;
  while (const auto entry = leaf->next()) {
    if (entry->path.empty() || entry->path.holds(leaf->point())) return entry->id;
  }
  return leaf->damaged() ? std::nullopt : std::optional(std::uint16_t{0});
}

std::optional<std::uint16_t> Atlas::stateAt(const Coordinate& place, std::uint16_t country) const {
  auto leaf = states_.leafAt(place);
  if (!leaf) return std::nullopt;
  // A cell is twice as many degrees wide as high.
  const double xScale = 2 * CosineOfDegrees(place.latitude);
  double nearest = std::numeric_limits<double>::infinity();
  std::uint16_t found = 0;
  while (const auto entry = leaf->next()) {
    if (state(entry->id).country != country) continue;
    if (entry->path.empty() || entry->path.holds(leaf->point())) return entry->id;
    // The outlines are coarse at coasts and at borders between countries.
    const double distance = entry->path.squaredDistance(leaf->point(), xScale);
    if (distance < nearest) {
      nearest = distance;
      found = entry->id;
    }
  }
  return leaf->damaged() ? std::nullopt : std::optional(found);
}

std::uint16_t Atlas::stateOfNearestPlace(const Coordinate& place, std::uint16_t country) const {
  double nearest = std::numeric_limits<double>::infinity();
  std::uint16_t found = 0;
  places_.forEachWithin(place, kStateReach, [&](const AtlasPlace& other, double distance) {
    if (distance >= nearest || state(other.state).country != country) return;
    nearest = distance;
    found = other.state;
  });
  return found;
}

std::optional<std::string> Atlas::cityAt(const Coordinate& place, std::uint16_t country,
                                         std::uint16_t stateId) const {
  double best = std::numeric_limits<double>::infinity();
  std::uint32_t name = 0;
  places_.forEachWithin(place, kCityReach, [&](const AtlasPlace& other, double distance) {
    if (other.weight == 0 || state(other.state).country != country) return;
    const bool otherState = stateId != 0 && other.state != stateId;
    const double score =
        (distance * (otherState ? kOtherState : 1) + kLeastDistance) / other.weight;
    if (score >= best) return;
    best = score;
    name = other.name;
  });
  return nameAt(name);
}

Atlas::State Atlas::state(std::uint16_t id) const {
  const AtlasBytes states = file_.section(AtlasSection::kStates);
  const std::size_t offset = id * kStateBytes;
  return {ReadAtlas<std::uint32_t>(states, offset).value_or(0),
          ReadAtlas<std::uint16_t>(states, offset + sizeof(std::uint32_t)).value_or(0)};
}

std::optional<std::string> Atlas::nameAt(std::uint32_t offset) const {
  const AtlasBytes names = file_.section(AtlasSection::kNames);
  const auto length = ReadAtlas<std::uint8_t>(names, offset);
  if (!length || *length == 0 || *length > names.size() - offset - 1) return std::nullopt;
  return std::string(reinterpret_cast<const char*>(names.data()) + offset + 1, *length);
}

std::optional<std::string> Atlas::countryCode(std::uint16_t id) const {
  const AtlasBytes codes = file_.section(AtlasSection::kCountryCodes);
  const std::size_t offset = id * kCodeLength;
  if (offset + kCodeLength > codes.size()) return std::nullopt;
  return std::string(reinterpret_cast<const char*>(codes.data()) + offset, kCodeLength);
}

}  // namespace platform
