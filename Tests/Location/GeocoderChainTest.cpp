// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/GeocoderChain.h"

#include <gtest/gtest.h>

#include <string>

#include "Tests/Fakes/FakeGeocoder.h"

namespace {

using platform::CivicAddress;
using platform::GeocodeAnswer;
using platform::GeocodeError;
using platform::OpenSea;

const CivicAddress kAtlas{"CH", "Zurich", "Zollikon", {}};

std::string Text(const GeocodeAnswer& answer) {
  if (const auto* error = std::get_if<GeocodeError>(&answer)) return error->description;
  if (std::holds_alternative<OpenSea>(answer)) return "sea";
  const auto& address = std::get<CivicAddress>(answer);
  return address.countryCode.value_or("-") + '/' + address.state.value_or("-") + '/' +
         address.city.value_or("-") + '/' + address.postCode.value_or("-");
}

std::string LookUp(GeocodeAnswer first, GeocodeAnswer second) {
  fakes::FakeGeocoder atlas(std::move(first));
  fakes::FakeGeocoder online(std::move(second));
  const GeocodeAnswer answer = platform::GeocoderChain(atlas, online).lookUp({1.5, -2.5});
  EXPECT_EQ(atlas.asked().size(), 1U);
  EXPECT_EQ(online.asked().at(0).latitude, 1.5);
  EXPECT_EQ(online.asked().at(0).longitude, -2.5);
  return Text(answer);
}

TEST(GeocoderChain, TakesTheSecondsPartsWhereBothNameTheSameCountry) {
  EXPECT_EQ(LookUp(kAtlas, CivicAddress{"CH", "Zurich", "Zurich", "8008"}),
            "CH/Zurich/Zurich/8008");
}

TEST(GeocoderChain, KeepsTheFirstsAnswerWhereTheCountriesDiffer) {
  EXPECT_EQ(LookUp(kAtlas, CivicAddress{"DE", "Baden", "Konstanz", "78462"}),
            "CH/Zurich/Zollikon/-");
  EXPECT_EQ(LookUp(kAtlas, CivicAddress{{}, "Baden", {}, {}}), "CH/Zurich/Zollikon/-");
}

TEST(GeocoderChain, FillsInFromTheFirstWhatTheSecondLacks) {
  EXPECT_EQ(LookUp(kAtlas, CivicAddress{"CH", {}, {}, "8702"}), "CH/Zurich/Zollikon/8702");
  EXPECT_EQ(LookUp(kAtlas, CivicAddress{"CH", "Zurich", {}, {}}), "CH/Zurich/Zollikon/-");
}

TEST(GeocoderChain, PutsNoCityIntoAStateThatItIsNotIn) {
  EXPECT_EQ(LookUp(kAtlas, CivicAddress{"CH", "Aargau", {}, "5000"}), "CH/Aargau/-/5000");
}

TEST(GeocoderChain, TakesTheSecondsAnswerWhereTheFirstHasNoCountry) {
  const CivicAddress online{"NO", {}, "Ny-Alesund", {}};
  EXPECT_EQ(LookUp(OpenSea{}, online), "NO/-/Ny-Alesund/-");
  EXPECT_EQ(LookUp(GeocodeError{"no atlas"}, online), "NO/-/Ny-Alesund/-");
  EXPECT_EQ(LookUp(GeocodeError{"no atlas"}, OpenSea{}), "sea");
}

TEST(GeocoderChain, DoesWithoutASecondThatFailsOrKnowsNothing) {
  const GeocodeError failure{"late"};
  EXPECT_EQ(LookUp(kAtlas, failure), "CH/Zurich/Zollikon/-");
  EXPECT_EQ(LookUp(kAtlas, OpenSea{}), "CH/Zurich/Zollikon/-");
  EXPECT_EQ(LookUp(OpenSea{}, failure), "sea");
  EXPECT_EQ(LookUp(OpenSea{}, OpenSea{}), "sea");
}

TEST(GeocoderChain, GivesTheFirstsReasonWhereBothFail) {
  EXPECT_EQ(LookUp(GeocodeError{"no atlas"}, GeocodeError{"late"}), "no atlas");
}

}  // namespace
