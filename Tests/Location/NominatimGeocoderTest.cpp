// SPDX-License-Identifier: Apache-2.0
//
// The online geocoder against a web in memory: what it asks, and what it makes of the answers.
#include "Helper/Platform/Linux/NominatimGeocoder.h"

#include <gtest/gtest.h>

#include <limits>
#include <semaphore>
#include <string>

#include "Tests/Fakes/FakeHttpTransport.h"

namespace {

using platform::CivicAddress;
using platform::Coordinate;
using platform::GeocodeError;
using platform::OpenSea;
using vlu::Http::ErrorType;

constexpr double kNan = std::numeric_limits<double>::quiet_NaN();
constexpr double kInfinity = std::numeric_limits<double>::infinity();

std::string UrlFor(const std::string& latitude, const std::string& longitude) {
  return "https://geocoder.example/base/reverse?format=jsonv2&lat=" + latitude +
         "&lon=" + longitude + "&zoom=18&addressdetails=1&layer=address&accept-language=en";
}

class NominatimGeocoder : public ::testing::Test {
 protected:
  std::string lookUp(const Coordinate& place) {
    const platform::GeocodeAnswer answer = geocoder.lookUp(place);
    if (const auto* error = std::get_if<GeocodeError>(&answer)) return error->description;
    if (std::holds_alternative<OpenSea>(answer)) return "sea";
    const auto& address = std::get<CivicAddress>(answer);
    return address.countryCode.value_or("-") + '/' + address.state.value_or("-") + '/' +
           address.city.value_or("-") + '/' + address.postCode.value_or("-");
  }
  /// What comes of a body of status 200.
  std::string read(const std::string& body, int status = 200) {
    web.put(UrlFor("1.0000", "2.0000"), status, {body.begin(), body.end()}, {});
    return lookUp({1, 2});
  }
  std::string readAddress(const std::string& members) {
    return read("{\"place_id\":1,\"address\":{" + members + "}}");
  }

  fakes::FakeHttpTransport web;
  platform::ScopedReplacement<vlu::Http::HttpTransport> replacement{web};
  platform::NominatimGeocoder geocoder{"https://geocoder.example/base", std::chrono::seconds(20)};
};

TEST_F(NominatimGeocoder, AsksForThePlaceToFourDecimalsUnderItsOwnName) {
  (void)lookUp({-33.856789, 151.215296});
  ASSERT_EQ(web.transfers().size(), 1U);
  EXPECT_EQ(web.transfers()[0].url, UrlFor("-33.8568", "151.2153"));
  EXPECT_EQ(web.transfers()[0].headers,
            (vlu::Http::HeaderMap{{"User-Agent", "HalvecMobileHelper/" HALVEC_VERSION}}));
  EXPECT_TRUE(web.transfers()[0].allowsCellular);
  EXPECT_EQ(web.transfers()[0].limit, std::chrono::seconds(20))
      << "no longer than it is waited for";
}

TEST_F(NominatimGeocoder, AsksAtTheEdgesOfTheWorld) {
  (void)lookUp({90, 180});
  (void)lookUp({-90, -180});
  (void)lookUp({1e-300, 179.99999});
  EXPECT_EQ(web.transfers().at(0).url, UrlFor("90.0000", "180.0000"));
  EXPECT_EQ(web.transfers().at(1).url, UrlFor("-90.0000", "-180.0000"));
  EXPECT_EQ(web.transfers().at(2).url, UrlFor("0.0000", "180.0000"));
}

TEST_F(NominatimGeocoder, SendsNothingForWhatIsNoCoordinate) {
  for (const Coordinate& place :
       {Coordinate{kNan, 0}, Coordinate{0, kNan}, Coordinate{kInfinity, 0},
        Coordinate{0, -kInfinity}, Coordinate{90.00001, 0}, Coordinate{0, 180.00001},
        Coordinate{-91, 0}, Coordinate{0, 1e308}}) {
    EXPECT_EQ(lookUp(place), "that is no coordinate");
  }
  EXPECT_TRUE(web.transfers().empty());
}

TEST_F(NominatimGeocoder, ReadsCountryStateCityAndPostCode) {
  EXPECT_EQ(readAddress(R"("city":"Cupertino","county":"Santa Clara County","state":"California",
                        "ISO3166-2-lvl4":"US-CA","postcode":"95014","country":"United States",
                        "country_code":"us")"),
            "US/California/Cupertino/95014");
  EXPECT_EQ(readAddress(R"("country_code":"mc")"), "MC/-/-/-");
}

TEST_F(NominatimGeocoder, TakesTheFirstKindOfStateAndOfCityThatIsThere) {
  EXPECT_EQ(readAddress(R"("country_code":"x1","state":"a")"),
            "the geocoder's answer names no country");
  EXPECT_EQ(readAddress(R"("country_code":"FR","region":"b","province":"c")"), "FR/b/-/-");
  EXPECT_EQ(readAddress(R"("country_code":"fr","province":"c","state_district":"d")"), "FR/c/-/-");
  EXPECT_EQ(readAddress(R"("country_code":"fr","state_district":"d")"), "FR/d/-/-");
  std::string members = R"("country_code":"fr")";
  for (const char* kind : {"county", "hamlet", "municipality", "village", "town", "city"}) {
    members += std::string(",\"") + kind + "\":\"" + kind + "\"";
    EXPECT_EQ(readAddress(members), std::string("FR/-/") + kind + "/-");
  }
}

TEST_F(NominatimGeocoder, PassesOverPartsThatAreEmptyOrNoText) {
  EXPECT_EQ(readAddress(R"("country_code":"fr","city":"","town":7,"village":null,"hamlet":"h",
                        "postcode":75001,"state":["x"])"),
            "FR/-/h/-");
}

TEST_F(NominatimGeocoder, GivesTerritoriesTheirOwnCountryCode) {
  EXPECT_EQ(readAddress(R"("country_code":"cn","ISO3166-2-lvl3":"CN-HK","state":"Hong Kong")"),
            "HK/Hong Kong/-/-");
  EXPECT_EQ(readAddress(R"("country_code":"cn","ISO3166-2-lvl4":"CN-MO","city":"Macao")"),
            "MO/-/Macao/-");
  EXPECT_EQ(readAddress(R"("country_code":"us","ISO3166-2-lvl4":"US-PR","city":"San Juan")"),
            "PR/-/San Juan/-");
  EXPECT_EQ(readAddress(R"("country_code":"fr","ISO3166-2-lvl3":"FR-RE","ISO3166-2-lvl4":"x")"),
            "RE/-/-/-");
}

TEST_F(NominatimGeocoder, LeavesOrdinarySubdivisionsWithTheirCountry) {
  EXPECT_EQ(readAddress(R"("country_code":"cn","ISO3166-2-lvl4":"CN-GD")"), "CN/-/-/-");
  EXPECT_EQ(readAddress(R"("country_code":"us","ISO3166-2-lvl4":"US-CA")"), "US/-/-/-");
  EXPECT_EQ(readAddress(R"("country_code":"de","ISO3166-2-lvl4":"US-PR")"), "DE/-/-/-");
}

TEST_F(NominatimGeocoder, TakesAnAnswerWithAnErrorForTheOpenSea) {
  EXPECT_EQ(read(R"({"error":"Unable to geocode"})"), "sea");
}

TEST_F(NominatimGeocoder, RefusesAnAnswerThatIsNotWhatWasAskedFor) {
  for (const char* body : {"", "<html>", "[]", "\"x\"", "{", "{\"address\":", "\xff"}) {
    EXPECT_EQ(read(body), "the geocoder's answer is garbled") << body;
  }
  for (const char* body :
       {"{}", "{\"address\":[]}", "{\"address\":\"x\"}", "{\"address\":{}}",
        "{\"address\":{\"country_code\":\"\"}}", "{\"address\":{\"country_code\":\"deu\"}}",
        "{\"address\":{\"country_code\":1}}", "{\"country_code\":\"de\"}"}) {
    EXPECT_EQ(read(body), "the geocoder's answer names no country") << body;
  }
  EXPECT_EQ(read("\"" + std::string(256 * 1024, 'x') + "\""), "the geocoder's answer is too long");
}

TEST_F(NominatimGeocoder, SaysWhichStatusItWasGiven) {
  EXPECT_EQ(read("{}", 429), "the geocoder answered with status 429");
  EXPECT_EQ(read(R"({"address":{"country_code":"de"}})", 301),
            "the geocoder answered with status 301");
}

TEST_F(NominatimGeocoder, SaysWhyItCouldNotAsk) {
  web.fail(UrlFor("1.0000", "2.0000"), ErrorType::kHostNotFound);
  EXPECT_EQ(lookUp({1, 2}), std::string("the geocoder cannot be asked: ") +
                                vlu::Http::asString(ErrorType::kHostNotFound));
  web.answer(UrlFor("1.0000", "2.0000"), [](const vlu::Http::Transfer&) { return nullptr; });
  EXPECT_EQ(lookUp({1, 2}), "the system has no means left to ask the geocoder");
}

TEST_F(NominatimGeocoder, CallsATransferThatTookTooLongLate) {
  web.fail(UrlFor("1.0000", "2.0000"), ErrorType::kTimedOut);
  EXPECT_EQ(lookUp({1, 2}), "the geocoder did not answer in time");
}

TEST_F(NominatimGeocoder, GivesALateAnswerUp) {
  std::binary_semaphore release(0);
  std::binary_semaphore answered(0);
  web.answer(UrlFor("1.0000", "2.0000"), [&](const vlu::Http::Transfer&) {
    release.acquire();
    answered.release();
    return nullptr;
  });
  platform::NominatimGeocoder hasty("https://geocoder.example/base", std::chrono::milliseconds(1));
  const platform::GeocodeAnswer answer = hasty.lookUp({1, 2});
  ASSERT_TRUE(std::holds_alternative<GeocodeError>(answer));
  EXPECT_EQ(std::get<GeocodeError>(answer).description, "the geocoder did not answer in time");
  release.release();
  answered.acquire();
}

TEST_F(NominatimGeocoder, CannotAskWhereTheSystemHasNoHttp) {
  platform::NominatimGeocoder other("ftp://geocoder.example", std::chrono::seconds(20));
  const platform::GeocodeAnswer answer = other.lookUp({1, 2});
  ASSERT_TRUE(std::holds_alternative<GeocodeError>(answer));
  EXPECT_EQ(std::get<GeocodeError>(answer).description,
            "the geocoder cannot be asked on this system");
}

}  // namespace
