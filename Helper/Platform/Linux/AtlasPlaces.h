// SPDX-License-Identifier: Apache-2.0
//
// The populated places of the atlas around a coordinate, found through a grid of half degrees. Any
// thread; nothing changes. Every number is checked before it is used as a place in the file.
#pragma once

#include <cstdint>

#include "Helper/Platform/Linux/AtlasFile.h"
#include "Helper/Platform/ReverseGeocoder.h"

namespace platform {

/// A populated place as it is stored: 16 bytes.
struct AtlasPlace {
  std::int32_t latitude;   // in units of 10^-5 degree
  std::int32_t longitude;  // in units of 10^-5 degree
  std::uint32_t name;      // offset in the name pool
  std::uint16_t state;
  /// How far the place attracts: 256 times half a kilometre more than the radius of a city of its
  /// population, in kilometres. 0 for a part of a city, which is never an answer itself.
  std::uint16_t weight;
};
static_assert(sizeof(AtlasPlace) == 16);

class AtlasPlaces {
 public:
  AtlasPlaces(AtlasBytes grid, AtlasBytes places) : grid_(grid), places_(places) {}

  /// Calls `visit(place, kilometres)` for every stored place at most `reach` kilometres from
  /// `center`, which is a valid coordinate.
  template <class Visit>
  void forEachWithin(const Coordinate& center, double reach, const Visit& visit) const {
    const Window window = windowAround(center, reach);
    for (std::uint32_t row = window.firstRow; row <= window.lastRow; ++row) {
      for (const ColumnRange& columns : window.columns) {
        const IndexRange range = indices(row, columns);
        for (std::size_t index = range.begin; index < range.end; ++index) {
          const AtlasPlace place = at(index);
          const double distance = kilometres(place, center, window.kilometresPerDegreeEast);
          if (distance <= reach) visit(place, distance);
        }
      }
    }
  }

 private:
  struct ColumnRange {
    std::uint32_t first = 0;
    std::uint32_t end = 0;
  };
  struct IndexRange {
    std::size_t begin = 0;
    std::size_t end = 0;
  };
  /// The cells around a place: whole rows of the same columns, in two ranges where the window
  /// reaches over the 180th meridian.
  struct Window {
    std::uint32_t firstRow = 0;
    std::uint32_t lastRow = 0;
    std::array<ColumnRange, 2> columns;
    double kilometresPerDegreeEast = 0;
  };

  [[nodiscard]] static Window windowAround(const Coordinate& center, double reach);
  [[nodiscard]] static double kilometres(const AtlasPlace& place, const Coordinate& center,
                                         double perDegreeEast);
  [[nodiscard]] IndexRange indices(std::uint32_t row, const ColumnRange& columns) const;
  [[nodiscard]] AtlasPlace at(std::size_t index) const;

  AtlasBytes grid_;
  AtlasBytes places_;
};

}  // namespace platform
