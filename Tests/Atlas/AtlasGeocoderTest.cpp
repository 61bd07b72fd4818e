// SPDX-License-Identifier: Apache-2.0
//
// The offline geocoder on atlases of a few areas and places.
#include <array>
#include <cstring>
#include <fstream>
#include <limits>
#include <thread>
#include <vector>

#include "Tests/Atlas/AtlasFixture.h"
#include "Tests/Atlas/TinyAtlas.h"

namespace atlas_test {
namespace {

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kInfinity = std::numeric_limits<double>::infinity();

// The south-west root cell is (-180..0, -90..0); its middle, and the unit of its leaf.
constexpr double kWestDegrees = 360.0 / 2 / 65535;
constexpr double kNorthDegrees = 180.0 / 2 / 65535;

class AtlasGeocoderTest : public AtlasFixture {
 protected:
  /// What is at this point of the leaf in the south-west root cell.
  [[nodiscard]] std::string inLeaf(double x, double y) {
    return at(-90 + y * kNorthDegrees, -180 + x * kWestDegrees);
  }
  /// Changes one byte of the written file in place.
  void changeByte(std::size_t offset, char byte) const {
    std::fstream file(path_, std::ios::in | std::ios::out | std::ios::binary);
    file.seekp(static_cast<std::streamoff>(offset)).put(byte);
  }
  TinyAtlas tiny_;
};

TEST_F(AtlasGeocoderTest, RefusesWhatIsNoCoordinate) {
  write(tiny_.bytes());
  for (const auto& [latitude, longitude] : {std::pair{kNaN, 0.0},
                                            {0.0, kNaN},
                                            {90.001, 0.0},
                                            {-90.001, 0.0},
                                            {0.0, 180.001},
                                            {0.0, -180.001},
                                            {kInfinity, 0.0},
                                            {0.0, -kInfinity}}) {
    EXPECT_EQ(at(latitude, longitude), "error: not a coordinate") << latitude << ' ' << longitude;
  }
}

TEST_F(AtlasGeocoderTest, OpensTheFileWithTheFirstLookUpAndTriesAgainAfterAFailure) {
  EXPECT_EQ(at(10, 10), "error: " + path_ + ": No such file or directory");
  write("this is no atlas");
  EXPECT_EQ(at(10, 10), "error: " + path_ + ": not an atlas");
  write(tiny_.bytes());
  EXPECT_EQ(at(10, 10), "BB||");
}

TEST_F(AtlasGeocoderTest, FindsWholeCells) {
  write(tiny_.bytes());
  EXPECT_EQ(at(45, -90), "AA||");
  EXPECT_EQ(at(45, 90), "BB||");
  EXPECT_EQ(at(-45, 90), "open sea");
}

TEST_F(AtlasGeocoderTest, FindsSmallerCellsInBranches) {
  tiny_.countryNodes = U32({kNothing, 4, kNothing, kNothing,  // the south-east is divided
                            Whole(1), Whole(2), Whole(2), Whole(1)});
  write(tiny_.bytes());
  EXPECT_EQ(at(-60, 45), "AA||");
  EXPECT_EQ(at(-60, 135), "BB||");
  EXPECT_EQ(at(-30, 45), "BB||");
  EXPECT_EQ(at(-30, 135), "AA||");
}

TEST_F(AtlasGeocoderTest, TakesTheEdgesOfTheWorldForThePlacesBesideThem) {
  write(tiny_.bytes());
  EXPECT_EQ(at(45, 180), "BB||");
  EXPECT_EQ(at(45, 179.99999), "BB||");
  EXPECT_EQ(at(45, -180), "AA||");
  EXPECT_EQ(at(45, -179.99999), "AA||");
  EXPECT_EQ(at(90, 90), "BB||");
  EXPECT_EQ(at(90, -90), "AA||");
  EXPECT_EQ(at(-90, 90), "open sea");
}

TEST_F(AtlasGeocoderTest, TellsInsideAPolygonFromOutside) {
  tiny_.countryNodes = U32({Leaf(0), kNothing, kNothing, kNothing});
  tiny_.countryLeaves =
      U32({1}) + U16({1, 4, 10000, 10000, 50000, 10000, 50000, 50000, 10000, 50000});
  write(tiny_.bytes());
  EXPECT_EQ(inLeaf(30000, 30000), "AA||");
  EXPECT_EQ(inLeaf(10001, 49999), "AA||");
  EXPECT_EQ(inLeaf(9999, 30000), "open sea");
  EXPECT_EQ(inLeaf(30000, 50001), "open sea");
  EXPECT_EQ(inLeaf(50001, 30000), "open sea");
}

TEST_F(AtlasGeocoderTest, TakesAnEmptyPathForTheRestOfTheCell) {
  tiny_.countryNodes = U32({Leaf(0), kNothing, kNothing, kNothing});
  tiny_.countryLeaves = U32({2}) + U16({1, 3, 0, 0, 60000, 0, 0, 60000}) + U16({2, 0});
  write(tiny_.bytes());
  EXPECT_EQ(inLeaf(1000, 1000), "AA||");
  EXPECT_EQ(inLeaf(40000, 40000), "BB||");
}

TEST_F(AtlasGeocoderTest, SeesHolesAndIslandsInOnePath) {
  // A square with a hole, and an island in the hole; the ways between the rings count twice.
  tiny_.countryNodes = U32({Leaf(1), kNothing, kNothing, kNothing});
  tiny_.countryLeaves =
      U32({0}) + U32({1}) +
      U16({1,     16,                                                             //
           0,     0,     60000, 0,     60000, 60000, 0,     60000, 0,     0,      // the square
           20000, 20000, 40000, 20000, 40000, 40000, 20000, 40000, 20000, 20000,  // the hole
           0,     0,                                                              //
           28000, 28000, 32000, 28000, 32000, 32000, 28000, 32000, 28000, 28000});
  write(tiny_.bytes());
  EXPECT_EQ(inLeaf(10000, 10000), "AA||");
  EXPECT_EQ(inLeaf(50000, 30000), "AA||");
  EXPECT_EQ(inLeaf(24000, 24000), "open sea");
  EXPECT_EQ(inLeaf(36000, 30000), "open sea");
  EXPECT_EQ(inLeaf(30000, 30000), "AA||");
}

TEST_F(AtlasGeocoderTest, NamesTheStateOfItsOwnCountryOnly) {
  tiny_.state(tiny_.name("Westland"), 1);
  tiny_.state(tiny_.name("Eastland"), 2);
  tiny_.stateNodes = U32({kNothing, kNothing, Whole(1), Whole(1)});
  write(tiny_.bytes());
  EXPECT_EQ(at(45, -90), "AA|Westland|");
  EXPECT_EQ(at(45, 90), "BB||");
  EXPECT_EQ(at(-45, -90), "open sea");
}

TEST_F(AtlasGeocoderTest, TakesTheNearestStateOfTheCellOutsideItsOutlines) {
  tiny_.state(tiny_.name("Left"), 1);
  tiny_.state(tiny_.name("Right"), 1);
  tiny_.state(tiny_.name("Foreign"), 2);
  tiny_.countryNodes = U32({Whole(1), kNothing, kNothing, kNothing});
  tiny_.stateNodes = U32({Leaf(0), kNothing, kNothing, kNothing});
  tiny_.stateLeaves = U32({3}) + U16({1, 4, 0, 0, 20000, 0, 20000, 20000, 0, 20000}) +
                      U16({2, 4, 20000, 0, 40000, 0, 40000, 20000, 20000, 20000}) +
                      U16({3, 4, 0, 30000, 65535, 30000, 65535, 65535, 0, 65535});
  write(tiny_.bytes());
  EXPECT_EQ(inLeaf(10000, 10000), "AA|Left|");
  EXPECT_EQ(inLeaf(30000, 10000), "AA|Right|");
  EXPECT_EQ(inLeaf(10000, 40000), "AA|Left|");
  EXPECT_EQ(inLeaf(50000, 40000), "AA|Right|");
}

TEST_F(AtlasGeocoderTest, AsksTheNearestPlaceWhereTheOutlineHasNoName) {
  const auto unknown = tiny_.state(0, 1);
  const auto north = tiny_.state(tiny_.name("North"), 1);
  const auto south = tiny_.state(tiny_.name("South"), 1);
  const auto foreign = tiny_.state(tiny_.name("Foreign"), 2);
  tiny_.stateNodes = U32({kNothing, kNothing, Whole(unknown), kNothing});
  tiny_.place(40, -100, "Southtown", south, 0);
  tiny_.place(40.8, -100, "Abroad", foreign, 256);
  tiny_.place(41.5, -100, "Northtown", north, 0);
  write(tiny_.bytes());
  EXPECT_EQ(at(40.7, -100), "AA|South|");
  EXPECT_EQ(at(40.9, -100), "AA|North|");
  EXPECT_EQ(at(44, -100), "AA||") << "farther than 200 km from everything";
}

TEST_F(AtlasGeocoderTest, PrefersTheLargerCityAtAnEqualDistance) {
  const auto state = tiny_.state(0, 1);
  tiny_.place(40, -100.05, "Village", state, 128);
  tiny_.place(40, -99.95, "City", state, 1280);
  write(tiny_.bytes());
  EXPECT_EQ(at(40, -100), "AA||City");
  EXPECT_EQ(at(40, -100.05), "AA||Village") << "at its centre";
}

TEST_F(AtlasGeocoderTest, CountsACityInAnotherStateThreeTimesAsFar) {
  const auto here = tiny_.state(tiny_.name("Here"), 1);
  const auto there = tiny_.state(tiny_.name("There"), 1);
  tiny_.stateNodes = U32({kNothing, kNothing, Whole(here), kNothing});
  tiny_.place(40, -100.05, "Hereville", here, 256);
  tiny_.place(40, -99.95, "Theretown", there, 256);
  write(tiny_.bytes());
  EXPECT_EQ(at(40, -99.98), "AA|Here|Hereville") << "2 km from the other";
  EXPECT_EQ(at(40, -99.96), "AA|Here|Theretown") << "1 km from the other, 8 km from its own";
}

TEST_F(AtlasGeocoderTest, FindsNoCityAbroadFartherThanThirtyKilometresOrInPartsOfCities) {
  const auto state = tiny_.state(0, 1);
  const auto foreign = tiny_.state(0, 2);
  tiny_.place(30, -100, "Quarter", state, 0);
  tiny_.place(35, -100, "Foreign", foreign, 256);
  tiny_.place(40, -100, "Town", state, 256);
  write(tiny_.bytes());
  EXPECT_EQ(at(40.26, -100), "AA||Town") << "29 km";
  EXPECT_EQ(at(40.28, -100), "AA||") << "31 km";
  EXPECT_EQ(at(35, -100), "AA||");
  EXPECT_EQ(at(30, -100), "AA||");
}

TEST_F(AtlasGeocoderTest, FindsACityAcrossTheAntimeridian) {
  const auto state = tiny_.state(0, 2);
  tiny_.countryNodes = U32({Whole(2), Whole(2), Whole(2), Whole(2)});
  tiny_.place(-17, -179.95, "Eastward", state, 256);
  tiny_.place(-15, 179.95, "Westward", state, 256);
  write(tiny_.bytes());
  EXPECT_EQ(at(-17, 179.95), "BB||Eastward");
  EXPECT_EQ(at(-17, 180), "BB||Eastward");
  EXPECT_EQ(at(-15, -179.95), "BB||Westward");
  EXPECT_EQ(at(-15, -180), "BB||Westward");
}

TEST_F(AtlasGeocoderTest, LooksAllAroundAPole) {
  const auto state = tiny_.state(0, 1);
  tiny_.countryNodes = U32({Whole(1), Whole(1), Whole(1), Whole(1)});
  tiny_.place(89.9, 100, "Camp", state, 256);
  write(tiny_.bytes());
  EXPECT_EQ(at(90, 0), "AA||Camp");
  EXPECT_EQ(at(89.95, 100), "AA||Camp");
}

TEST_F(AtlasGeocoderTest, CallsATreeThatLeadsNowhereDamaged) {
  const std::string error = "error: " + path_ + ": damaged tree of countries";
  tiny_.countryNodes = U32({0, 4000, Leaf(9), 3U << 30});  // a circle, outside, outside, no kind
  write(tiny_.bytes());
  EXPECT_EQ(at(-45, -90), error);
  EXPECT_EQ(at(-45, 90), error);
  EXPECT_EQ(at(45, -90), error);
  EXPECT_EQ(at(45, 90), error);
}

TEST_F(AtlasGeocoderTest, CallsAStateTreeOrACountryNumberOutsideItsTableDamaged) {
  tiny_.stateNodes = U32({0, 0, Leaf(1), 0});
  tiny_.countryNodes = U32({Whole(3), kNothing, Whole(1), kNothing});
  write(tiny_.bytes());
  EXPECT_EQ(at(45, -90), "error: " + path_ + ": damaged tree of states");
  EXPECT_EQ(at(-45, -90), "error: " + path_ + ": damaged table of countries");
}

TEST_F(AtlasGeocoderTest, CallsALeafThatLeadsBeyondItsSectionDamaged) {
  tiny_.countryNodes = U32({Leaf(0), Leaf(2), Whole(1), kNothing});
  tiny_.countryLeaves = U32({1}) + U16({1, 60000}) +                     // vertices
                        U32({1000000}) + U16({1, 3, 0, 0, 1, 0, 0, 1});  // entries
  tiny_.state(tiny_.name("Left"), 1);
  tiny_.stateNodes = U32({kNothing, kNothing, Leaf(0), kNothing});
  tiny_.stateLeaves = U32({2}) + U16({1, 3, 0, 0, 1, 0, 0, 1});  // the second entry is not there
  write(tiny_.bytes());
  EXPECT_EQ(at(-45, -90), "error: " + path_ + ": damaged tree of countries");
  EXPECT_EQ(at(-45, 90), "error: " + path_ + ": damaged tree of countries");
  EXPECT_EQ(at(45, -90), "error: " + path_ + ": damaged tree of states");
}

TEST_F(AtlasGeocoderTest, ReadsNoNameStateOrPlaceBeyondItsSection) {
  tiny_.names += std::string("\xFF", 1) + "cut";
  tiny_.state(1, 1);
  tiny_.state(70000, 1);
  tiny_.stateNodes = U32({Whole(1), Whole(2), Whole(9), kNothing});
  tiny_.countryNodes = U32({Whole(1), Whole(1), Whole(1), kNothing});
  std::string file = tiny_.bytes();
  write(file);
  EXPECT_EQ(at(-45, -90), "AA||");
  EXPECT_EQ(at(-45, 90), "AA||");
  EXPECT_EQ(at(45, -90), "AA||");
}

TEST_F(AtlasGeocoderTest, ReadsNoPlaceThatTheGridOnlyClaims) {
  std::string file = tiny_.bytes();
  const std::size_t places = kTableOffset + 7 * 16;
  const std::size_t cell = std::size_t{260} * 720 + 160;  // around 40 north, 100 west
  std::uint32_t grid = 0;
  std::memcpy(&grid, file.data() + kTableOffset + 6 * 16 + 4, sizeof grid);
  ASSERT_EQ(file.substr(places, 4), "PLAC");
  file.replace(grid + (cell + 1) * 4, 4, U32({0xFFFFFFFF}));
  write(file);
  EXPECT_EQ(at(40.2, -99.8), "AA||");
}

TEST_F(AtlasGeocoderTest, AnswersThroughAnyChangedByteOfTheBody) {
  const auto state = tiny_.state(tiny_.name("State"), 1);
  tiny_.countryNodes = U32({Leaf(0), 4, kNothing, Whole(1),  //
                            Whole(1), Whole(2), kNothing, kNothing});
  tiny_.countryLeaves = U32({2}) + U16({1, 3, 0, 0, 60000, 0, 0, 60000}) + U16({2, 0});
  tiny_.stateNodes = U32({Whole(state), Leaf(0), kNothing, Whole(state)});
  tiny_.stateLeaves = U32({1}) + U16({1, 3, 0, 0, 60000, 0, 0, 60000});
  tiny_.place(45, 90, "Town", state, 256);
  const std::string whole = tiny_.bytes();
  write(whole);
  std::uint32_t grid = 0;
  std::memcpy(&grid, whole.data() + kTableOffset + 6 * 16 + 4, sizeof grid);
  for (std::size_t offset = kTableEnd; offset < whole.size(); ++offset) {
    // The grid's million bytes are all alike; its beginning stands for them.
    if (offset > grid + 64 && offset < whole.size() - 256) offset = whole.size() - 256;
    for (const int change : {0x01, 0xFF}) {
      changeByte(offset, static_cast<char>(whole[offset] ^ change));
      platform::AtlasGeocoder geocoder(path_);
      for (const auto& [latitude, longitude] :
           {std::pair{-80.0, -170.0}, {-10.0, -10.0}, {-80.0, 10.0}, {45.0, 90.0}}) {
        const auto answer = geocoder.lookUp({latitude, longitude});
        const auto* address = std::get_if<platform::CivicAddress>(&answer);
        if (address == nullptr) continue;
        EXPECT_EQ(address->countryCode.value_or("").size(), 2U);
      }
      changeByte(offset, whole[offset]);
    }
  }
}

TEST_F(AtlasGeocoderTest, AnswersSeveralThreadsAtOnce) {
  write(tiny_.bytes());
  std::array<int, 4> right{};
  {
    std::vector<std::jthread> threads;
    for (int& count : right) {
      threads.emplace_back([this, &count] {
        for (int round = 0; round < 1000; ++round) {
          const auto answer = geocoder_.lookUp({45, 90});
          if (std::get<platform::CivicAddress>(answer).countryCode == "BB") ++count;
        }
      });
    }
  }
  EXPECT_EQ(right, (std::array<int, 4>{1000, 1000, 1000, 1000}));
}

}  // namespace
}  // namespace atlas_test
