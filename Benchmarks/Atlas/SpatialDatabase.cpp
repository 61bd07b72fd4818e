// SPDX-License-Identifier: Apache-2.0
#include "Benchmarks/Atlas/SpatialDatabase.h"

#include <array>
#include <cmath>
#include <limits>
#include <numbers>

#include "Benchmarks/Support/Measure.h"
#include "Helper/Platform/Linux/AtlasPlaces.h"
#include "Helper/Platform/Linux/AtlasTree.h"

namespace bench {
namespace {

using platform::AtlasBytes;
using platform::AtlasSection;

/// A cell in degrees.
struct Cell {
  double west = -179.9999;
  double south = -89.9999;
  double width = 359.9998;
  double height = 179.9998;
};

void Execute(sqlite3* database, const char* sql) {
  if (sqlite3_exec(database, sql, nullptr, nullptr, nullptr) != SQLITE_OK) Fail(sql);
}

sqlite3_stmt* Prepare(sqlite3* database, const char* sql) {
  sqlite3_stmt* statement = nullptr;
  if (sqlite3_prepare_v2(database, sql, -1, &statement, nullptr) != SQLITE_OK) Fail(sql);
  return statement;
}

void Insert(sqlite3_stmt* insert, const Cell& cell, AtlasBytes record) {
  sqlite3_bind_double(insert, 1, cell.west);
  sqlite3_bind_double(insert, 2, cell.west + cell.width);
  sqlite3_bind_double(insert, 3, cell.south);
  sqlite3_bind_double(insert, 4, cell.south + cell.height);
  sqlite3_bind_blob(insert, 5, record.data(), static_cast<int>(record.size()), SQLITE_TRANSIENT);
  if (sqlite3_step(insert) != SQLITE_DONE) Fail("insert");
  sqlite3_reset(insert);
}

/// The bytes of the leaf record at `offset`.
AtlasBytes LeafRecord(AtlasBytes leaves, std::size_t offset) {
  std::size_t end = offset + sizeof(std::uint32_t);
  const auto count = platform::ReadAtlas<std::uint32_t>(leaves, offset).value_or(0);
  for (std::uint32_t entry = 0; entry < count; ++entry) {
    const auto vertices = platform::ReadAtlas<std::uint16_t>(leaves, end + 2).value_or(0);
    end += (std::size_t{1} + vertices) * 4;
  }
  return leaves.subspan(offset, end - offset);
}

/// Inserts every cell below a block of nodes that has an area in it.
void InsertCells(sqlite3_stmt* insert, AtlasBytes nodes, AtlasBytes leaves, std::size_t block,
                 const Cell& parent) {
  for (std::size_t quarter = 0; quarter < 4; ++quarter) {
    const Cell cell{parent.west + static_cast<double>(quarter % 2) * parent.width / 2,
                    parent.south + static_cast<double>(quarter / 2) * parent.height / 2,
                    parent.width / 2, parent.height / 2};
    const std::uint32_t node =
        platform::ReadAtlas<std::uint32_t>(nodes, (block + quarter) * 4).value_or(0);
    const std::uint32_t value = node & 0x3FFFFFFF;
    if (node >> 30 == 0) InsertCells(insert, nodes, leaves, value, cell);
    if (node >> 30 == 2) Insert(insert, cell, LeafRecord(leaves, std::size_t{value} * 4));
    if (node >> 30 == 1 && value != 0) {
      const std::array<std::uint32_t, 2> whole{1, value};  // one area without a path
      Insert(insert, cell, std::as_bytes(std::span(whole)));
    }
  }
}

}  // namespace

void WriteSpatialDatabase(const platform::AtlasFile& atlas, const std::string& path) {
  sqlite3* database = nullptr;
  if (sqlite3_open(path.c_str(), &database) != SQLITE_OK) Fail("sqlite3_open");
  Execute(database, "BEGIN");
  const auto insertInto = [&](const std::string& table) {
    Execute(database, ("CREATE VIRTUAL TABLE " + table +
                       " USING rtree(id, west, east, south, north, +record)")
                          .c_str());
    return Prepare(database, ("INSERT INTO " + table + " VALUES(NULL, ?, ?, ?, ?, ?)").c_str());
  };
  sqlite3_stmt* countries = insertInto("countries");
  InsertCells(countries, atlas.section(AtlasSection::kCountryNodes),
              atlas.section(AtlasSection::kCountryLeaves), 0, {});
  sqlite3_finalize(countries);
  sqlite3_stmt* states = insertInto("states");
  InsertCells(states, atlas.section(AtlasSection::kStateNodes),
              atlas.section(AtlasSection::kStateLeaves), 0, {});
  sqlite3_finalize(states);
  sqlite3_stmt* places = insertInto("places");
  const AtlasBytes records = atlas.section(AtlasSection::kPlaces);
  for (std::size_t offset = 0; offset < records.size(); offset += sizeof(platform::AtlasPlace)) {
    platform::AtlasPlace place;
    std::memcpy(&place, records.data() + offset, sizeof place);
    Insert(places, {place.longitude / 1e5, place.latitude / 1e5, 0, 0},
           records.subspan(offset, sizeof place));
  }
  sqlite3_finalize(places);
  Execute(database, "COMMIT");
  Execute(database, "VACUUM");
  sqlite3_close(database);
}

SpatialDatabase::SpatialDatabase(const std::string& path, const platform::AtlasFile& atlas)
    : atlas_(atlas) {
  if (sqlite3_open_v2(path.c_str(), &database_, SQLITE_OPEN_READONLY, nullptr) != SQLITE_OK) {
    Fail("sqlite3_open_v2");
  }
  const std::string around =
      " WHERE west <= ?1 AND east >= ?1 AND south <= ?2 AND north >= ?2 LIMIT 1";
  const std::string columns = "SELECT west, east, south, north, record FROM ";
  countries_ = Prepare(database_, (columns + "countries" + around).c_str());
  states_ = Prepare(database_, (columns + "states" + around).c_str());
  places_ = Prepare(database_,
                    "SELECT record FROM places WHERE east >= ?1 AND west <= ?2 AND north >= ?3 AND "
                    "south <= ?4");
}

SpatialDatabase::~SpatialDatabase() {
  for (sqlite3_stmt* statement : {countries_, states_, places_}) sqlite3_finalize(statement);
  sqlite3_close(database_);
}

SpatialDatabase::Answer SpatialDatabase::lookUp(const platform::Coordinate& place) {
  Answer answer;
  answer.country = areaAt(countries_, place, 0);
  if (answer.country == 0) return answer;
  answer.state = areaAt(states_, place, answer.country);
  answer.city = cityAt(place, answer);
  return answer;
}

std::uint16_t SpatialDatabase::areaAt(sqlite3_stmt* cells, const platform::Coordinate& place,
                                      std::uint16_t country) {
  sqlite3_reset(cells);
  sqlite3_bind_double(cells, 1, place.longitude);
  sqlite3_bind_double(cells, 2, place.latitude);
  if (sqlite3_step(cells) != SQLITE_ROW) return 0;
  const auto column = [&](int index) { return sqlite3_column_double(cells, index); };
  const platform::AtlasPoint point{(place.longitude - column(0)) / (column(1) - column(0)) * 65535,
                                   (place.latitude - column(2)) / (column(3) - column(2)) * 65535};
  const AtlasBytes record(static_cast<const std::byte*>(sqlite3_column_blob(cells, 4)),
                          static_cast<std::size_t>(sqlite3_column_bytes(cells, 4)));
  const auto count = platform::ReadAtlas<std::uint32_t>(record, 0).value_or(0);
  platform::AtlasLeaf leaf(record, sizeof count, count, point);
  double nearest = std::numeric_limits<double>::infinity();
  std::uint16_t found = 0;
  while (const auto entry = leaf.next()) {
    if (country != 0 && countryOf(entry->id) != country) continue;
    if (entry->path.empty() || entry->path.holds(point)) return entry->id;
    if (country == 0) continue;
    const double distance =
        entry->path.squaredDistance(point, 2 * std::cos(place.latitude * std::numbers::pi / 180));
    if (distance < nearest) {
      nearest = distance;
      found = entry->id;
    }
  }
  return found;
}

std::uint32_t SpatialDatabase::cityAt(const platform::Coordinate& place, const Answer& answer) {
  constexpr double kReach = 30;
  constexpr double kPerDegree = 111.2;
  const double perDegreeEast = kPerDegree * std::cos(place.latitude * std::numbers::pi / 180);
  sqlite3_reset(places_);
  sqlite3_bind_double(places_, 1, place.longitude - kReach / perDegreeEast);
  sqlite3_bind_double(places_, 2, place.longitude + kReach / perDegreeEast);
  sqlite3_bind_double(places_, 3, place.latitude - kReach / kPerDegree);
  sqlite3_bind_double(places_, 4, place.latitude + kReach / kPerDegree);
  double best = std::numeric_limits<double>::infinity();
  std::uint32_t name = 0;
  while (sqlite3_step(places_) == SQLITE_ROW) {
    platform::AtlasPlace other;
    std::memcpy(&other, sqlite3_column_blob(places_, 0), sizeof other);
    if (other.weight == 0 || countryOf(other.state) != answer.country) continue;
    const double distance = std::hypot((other.longitude / 1e5 - place.longitude) * perDegreeEast,
                                       (other.latitude / 1e5 - place.latitude) * kPerDegree);
    if (distance > kReach) continue;
    const double score = (distance * (other.state == answer.state ? 1 : 3) + 0.3) /
                         static_cast<double>(other.weight);
    if (score < best) {
      best = score;
      name = other.name;
    }
  }
  return name;
}

std::uint16_t SpatialDatabase::countryOf(std::uint16_t state) const {
  return platform::ReadAtlas<std::uint16_t>(atlas_.section(AtlasSection::kStates),
                                            std::size_t{state} * 8 + 4)
      .value_or(0);
}

}  // namespace bench
