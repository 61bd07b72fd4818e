// SPDX-License-Identifier: Apache-2.0
//
// The built atlas against coordinates whose country, state and city somebody wrote down by hand:
// Tests/Location/coordinates.csv. Prints the share that is right, and what is wrong.
#include <gtest/gtest.h>
#include <strings.h>

#include <array>
#include <cstdio>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "Helper/Platform/Linux/AtlasGeocoder.h"

namespace atlas_test {
namespace {

enum Field : std::size_t { kCountry, kState, kCity, kFieldCount };
constexpr std::array<const char*, kFieldCount> kFieldNames{"country", "state", "city"};

/// One line of the table.
struct Case {
  platform::Coordinate place;
  std::array<std::string, kFieldCount> expected;
  std::string note;
};

std::vector<std::string> Split(const std::string& text, char separator) {
  std::vector<std::string> parts;
  std::istringstream stream(text);
  for (std::string part; std::getline(stream, part, separator);) parts.push_back(part);
  return parts;
}

std::vector<Case> ReadCases() {
  std::ifstream file(HALVEC_COORDINATES);
  std::vector<Case> cases;
  for (std::string line; std::getline(file, line);) {
    if (line.starts_with('#')) continue;
    const std::vector<std::string> cells = Split(line, ',');
    if (cells.size() != 6) throw std::runtime_error("not six cells: " + line);
    cases.push_back(
        {{std::stod(cells[0]), std::stod(cells[1])}, {cells[2], cells[3], cells[4]}, cells[5]});
  }
  return cases;
}

bool IsJudged(const std::string& expected) { return expected.find('*') == std::string::npos; }

/// Whether `answer` is one of the names that `expected` allows; nothing expects nothing.
bool IsRight(const std::string& answer, const std::string& expected) {
  if (expected.empty()) return answer.empty();
  for (const std::string& name : Split(expected, '/')) {
    if (::strcasecmp(answer.c_str(), name.c_str()) == 0) return true;
  }
  return false;
}

std::array<std::string, kFieldCount> Ask(platform::AtlasGeocoder& geocoder,
                                         const platform::Coordinate& place) {
  const platform::GeocodeAnswer answer = geocoder.lookUp(place);
  if (const auto* error = std::get_if<platform::GeocodeError>(&answer)) {
    ADD_FAILURE() << error->description;
  }
  const auto* address = std::get_if<platform::CivicAddress>(&answer);
  if (address == nullptr) return {};
  return {address->countryCode.value_or(""), address->state.value_or(""),
          address->city.value_or("")};
}

TEST(BuiltAtlas, IsRightForTheCoordinatesOfTheTable) {
  const std::vector<Case> cases = ReadCases();
  ASSERT_GE(cases.size(), 150U);
  platform::AtlasGeocoder geocoder(HALVEC_BUILT_ATLAS);
  std::array<int, kFieldCount> judged{};
  std::array<int, kFieldCount> right{};
  for (const Case& one : cases) {
    const auto answer = Ask(geocoder, one.place);
    for (std::size_t field = 0; field < kFieldCount; ++field) {
      if (!IsJudged(one.expected[field])) continue;
      ++judged[field];
      if (IsRight(answer[field], one.expected[field])) {
        ++right[field];
      } else {
        std::printf("%g %g (%s): %s \"%s\" instead of \"%s\"\n", one.place.latitude,
                    one.place.longitude, one.note.c_str(), kFieldNames[field],
                    answer[field].c_str(), one.expected[field].c_str());
      }
    }
  }
  constexpr std::array<double, kFieldCount> kGoals{98, 95, 93};
  for (std::size_t field = 0; field < kFieldCount; ++field) {
    const double percent = 100.0 * right[field] / judged[field];
    std::printf("%s: %d of %d, %.1f %%\n", kFieldNames[field], right[field], judged[field],
                percent);
    EXPECT_GE(percent, kGoals[field]) << kFieldNames[field];
  }
}

TEST(BuiltAtlas, SaysNothingAboutTheOpenSea) {
  platform::AtlasGeocoder geocoder(HALVEC_BUILT_ATLAS);
  int count = 0;
  for (const Case& one : ReadCases()) {
    if (!one.expected[kCountry].empty()) continue;
    ++count;
    EXPECT_TRUE(std::holds_alternative<platform::OpenSea>(geocoder.lookUp(one.place)))
        << one.place.latitude << ' ' << one.place.longitude;
  }
  EXPECT_GE(count, 20);
}

}  // namespace
}  // namespace atlas_test
