// SPDX-License-Identifier: Apache-2.0
//
// The same cells, areas and places as an atlas in SQLite R*Trees: what a look-up costs with an
// index from the shelf. One thread.
#pragma once

#include <sqlite3.h>

#include <cstdint>
#include <string>

#include "Helper/Platform/Linux/AtlasFile.h"
#include "Helper/Platform/ReverseGeocoder.h"

namespace bench {

/// Writes every cell and place of `atlas` into a new database at `path`.
void WriteSpatialDatabase(const platform::AtlasFile& atlas, const std::string& path);

class SpatialDatabase {
 public:
  /// Opens the database for reading, with the tables of names still in `atlas`, which is borrowed.
  SpatialDatabase(const std::string& path, const platform::AtlasFile& atlas);
  ~SpatialDatabase();
  SpatialDatabase(const SpatialDatabase&) = delete;
  SpatialDatabase& operator=(const SpatialDatabase&) = delete;

  /// What a look-up found, as numbers in the atlas.
  struct Answer {
    std::uint16_t country = 0;
    std::uint16_t state = 0;
    std::uint32_t city = 0;
  };
  [[nodiscard]] Answer lookUp(const platform::Coordinate& place);

 private:
  [[nodiscard]] std::uint16_t areaAt(sqlite3_stmt* cells, const platform::Coordinate& place,
                                     std::uint16_t country);
  [[nodiscard]] std::uint32_t cityAt(const platform::Coordinate& place, const Answer& answer);
  [[nodiscard]] std::uint16_t countryOf(std::uint16_t state) const;

  const platform::AtlasFile& atlas_;
  sqlite3* database_ = nullptr;
  sqlite3_stmt* countries_ = nullptr;
  sqlite3_stmt* states_ = nullptr;
  sqlite3_stmt* places_ = nullptr;
};

}  // namespace bench
