// SPDX-License-Identifier: Apache-2.0
//
// An open atlas: which country, state and city a coordinate belongs to. Any thread; nothing changes
// after the opening.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <variant>

#include "Helper/Platform/Linux/AtlasFile.h"
#include "Helper/Platform/Linux/AtlasPlaces.h"
#include "Helper/Platform/Linux/AtlasTree.h"
#include "Helper/Platform/ReverseGeocoder.h"

namespace platform {

class Atlas {
 public:
  explicit Atlas(AtlasFile file);

  /// The address of a valid coordinate: OpenSea outside every country's waters, a GeocodeError
  /// without the file's name when the file is damaged there.
  [[nodiscard]] GeocodeAnswer lookUp(const Coordinate& place) const;

 private:
  struct State {
    std::uint32_t name;
    std::uint16_t country;
  };

  [[nodiscard]] std::optional<std::uint16_t> countryAt(const Coordinate& place) const;
  [[nodiscard]] std::optional<std::uint16_t> stateAt(const Coordinate& place,
                                                     std::uint16_t country) const;
  [[nodiscard]] std::uint16_t stateOfNearestPlace(const Coordinate& place,
                                                  std::uint16_t country) const;
  [[nodiscard]] std::optional<std::string> cityAt(const Coordinate& place, std::uint16_t country,
                                                  std::uint16_t state) const;
  [[nodiscard]] State state(std::uint16_t id) const;
  [[nodiscard]] std::optional<std::string> nameAt(std::uint32_t offset) const;
  [[nodiscard]] std::optional<std::string> countryCode(std::uint16_t id) const;

  AtlasFile file_;
  AtlasTree countries_;
  AtlasTree states_;
  AtlasPlaces places_;
};

}  // namespace platform
