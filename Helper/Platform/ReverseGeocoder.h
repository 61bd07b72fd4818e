// SPDX-License-Identifier: Apache-2.0
//
// Turns a coordinate into the civic address around it. A look-up may wait for the network, so it
// belongs on a work queue; a geocoder may be asked from several threads at once.
#pragma once

#include <optional>
#include <string>
#include <variant>

namespace platform {

/// A place on the WGS 84 ellipsoid, in degrees: latitude north of the equator, longitude east of
/// Greenwich. Any value may stand here, NaN too; the geocoder refuses what is no coordinate.
struct Coordinate {
  double latitude = 0;
  double longitude = 0;
};

/// What is known about a place, as UTF-8. A field that is not known is absent, never empty.
struct CivicAddress {
  /// ISO 3166-1, two capital letters.
  std::optional<std::string> countryCode;
  /// The name of the country's first-level division.
  std::optional<std::string> state;
  /// The name of the city, town or village.
  std::optional<std::string> city;
  std::optional<std::string> postCode;
};

/// The place belongs to no country: the open sea.
struct OpenSea {};

/// Why there is no answer, in words for the log.
struct GeocodeError {
  std::string description;
};

/// Exactly one of the three outcomes of a look-up. An address has a country code at least.
using GeocodeAnswer = std::variant<OpenSea, CivicAddress, GeocodeError>;

class ReverseGeocoder {
 public:
  virtual ~ReverseGeocoder() = default;
  /// The civic address of `place`: OpenSea where there is none, a GeocodeError when `place` is no
  /// coordinate (not a number, beyond 90 or 180 degrees) or the source cannot be used.
  [[nodiscard]] virtual GeocodeAnswer lookUp(const Coordinate& place) = 0;
};

}  // namespace platform
