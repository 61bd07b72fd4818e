// SPDX-License-Identifier: Apache-2.0
//
// The window of grid cells around a coordinate. Distances are taken on a plane that touches the
// globe there: within the few dozen kilometres that matter, the error is a few metres.
#include "Helper/Platform/Linux/AtlasPlaces.h"

#include <algorithm>
#include <cmath>

#include "Helper/Platform/Linux/AtlasGeometry.h"

namespace platform {
namespace {

constexpr std::uint32_t kRows = 360;
constexpr std::uint32_t kColumns = 720;
constexpr double kCellsPerDegree = 2;
constexpr double kKilometresPerDegree = 111.2;
constexpr double kUnitsPerDegree = 1e5;

std::uint32_t Row(double latitude) {
  const std::int64_t row = Floor((latitude + 90) * kCellsPerDegree);
  return static_cast<std::uint32_t>(std::clamp<std::int64_t>(row, 0, kRows - 1));
}

}  // namespace

AtlasPlaces::Window AtlasPlaces::windowAround(const Coordinate& center, double reach) {
  Window window;
  const double degrees = reach / kKilometresPerDegree;
  window.firstRow = Row(center.latitude - degrees);
  window.lastRow = Row(center.latitude + degrees);
  window.kilometresPerDegreeEast = kKilometresPerDegree * CosineOfDegrees(center.latitude);
  const double degreesEast = reach / window.kilometresPerDegreeEast;
  const double west = (center.longitude - degreesEast + 180) * kCellsPerDegree;
  const double east = (center.longitude + degreesEast + 180) * kCellsPerDegree;
  // At the poles the window is a whole circle of cells.
  if (!(east - west < kColumns - 1)) {
    window.columns[0] = {0, kColumns};
    return window;
  }
  const auto first = Floor(west);
  const auto last = Floor(east);
  const auto column = [](std::int64_t index) {
    return static_cast<std::uint32_t>((index + kColumns) % kColumns);
  };
  if (column(first) <= column(last)) {
    window.columns[0] = {column(first), column(last) + 1};
  } else {
    window.columns = {ColumnRange{column(first), kColumns}, ColumnRange{0, column(last) + 1}};
  }
  return window;
}

double AtlasPlaces::kilometres(const AtlasPlace& place, const Coordinate& center,
                               double perDegreeEast) {
  const double north = place.latitude / kUnitsPerDegree - center.latitude;
  double east = place.longitude / kUnitsPerDegree - center.longitude;
  if (east > 180) east -= 360;
  if (east < -180) east += 360;
  return std::sqrt(north * north * kKilometresPerDegree * kKilometresPerDegree +
                   east * east * perDegreeEast * perDegreeEast);
}

AtlasPlaces::IndexRange AtlasPlaces::indices(std::uint32_t row, const ColumnRange& columns) const {
  const std::size_t count = places_.size() / sizeof(AtlasPlace);
  const auto start = [&](std::uint32_t column) -> std::size_t {
    const std::size_t cell = std::size_t{row} * kColumns + column;
    return ReadAtlas<std::uint32_t>(grid_, cell * sizeof(std::uint32_t)).value_or(0);
  };
  return {start(columns.first), std::min(start(columns.end), count)};
}

AtlasPlace AtlasPlaces::at(std::size_t index) const {
  AtlasPlace place;
  std::memcpy(&place, places_.data() + index * sizeof place, sizeof place);
  return place;
}

}  // namespace platform
