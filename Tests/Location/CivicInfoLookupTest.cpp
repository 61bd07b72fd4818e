// SPDX-License-Identifier: Apache-2.0
//
// The look-up from the coordinate to the delivery, every branch and every line.
#include "Helper/Location/CivicInfoLookup.h"

#include <limits>

#include "Helper/Shared/Server/RequestRoutines.h"
#include "Tests/Location/LocationFixture.h"

namespace {

using namespace location_test;
using Delivered = std::vector<std::string>;
using platform::MapAddress;
using platform::MapError;
using platform::MapItems;

const auto kSent = Notice("sendCivicInfoToVL sent civic info to Halvec successfully");
const auto kNoItems = Error("_RequestCivicInfoFromLatitudeLongitude didn't get any mapItems\n");
const auto kNotWaiting =
    Error("_RequestCivicInfoFromLatitudeLongitude wasn't waiting for response from GEO");
const auto kNoCountry = Error("Didn't get valid country code from Mapsvc.\n");
const auto kOneItem = Notice("_RequestCivicInfoFromLatitudeLongitude mapItems: (1)");

class CivicInfoLookup : public LocationFixture {
 protected:
  CivicInfoLookup() { country.code = "XK"; }

  /// Starts a look-up of some place and gives the handler that awaits its answer.
  platform::MapCompletion request() {
    RequestCivicInfoFromLatitudeLongitude(37.3, -122.0);
    return maps.submissions.back().handler;
  }
  void answer(const MapItems& items) { request()(&items, nullptr); }

  const MapItems complete = oneItem({.countryCode = "US",
                                     .administrativeArea = "California",
                                     .locality = "Cupertino",
                                     .postCode = "95014"});
};

TEST_F(CivicInfoLookup, AsksForTheCoordinateWithShiftsWithoutArrivalTimesOrTraits) {
  RequestCivicInfoFromLatitudeLongitude(-12.5, 130.25);
  ASSERT_EQ(maps.submissions.size(), 1U);
  const auto& submission = maps.submissions.front();
  EXPECT_EQ(submission.coordinate.latitude, -12.5);
  EXPECT_EQ(submission.coordinate.longitude, 130.25);
  EXPECT_FALSE(submission.options.includesEstimatedTimeOfArrival);
  EXPECT_TRUE(submission.options.allowsLocationShift);
  EXPECT_EQ(submission.options.traits, nullptr);
  EXPECT_EQ(submission.activity, nullptr);
  EXPECT_EQ(waitingForGeocode, 1);
  EXPECT_EQ(log.takeLines(), Lines{});
}

TEST_F(CivicInfoLookup, DeliversTheFourPartsOfTheFirstItem) {
  answer({complete.front(), oneItem({.countryCode = "FR"}).front()});
  EXPECT_EQ(takeDelivered(), Delivered{"US/California/Cupertino/95014"});
  EXPECT_EQ(waitingForGeocode, 0);
  EXPECT_EQ(log.takeLines(),
            (Lines{Notice("_RequestCivicInfoFromLatitudeLongitude mapItems: (2)"),
                   Notice("_RequestCivicInfoFromLatitudeLongitude country code: US"),
                   Notice("_RequestCivicInfoFromLatitudeLongitude state: California"),
                   Notice("_RequestCivicInfoFromLatitudeLongitude city: Cupertino"),
                   Notice("_RequestCivicInfoFromLatitudeLongitude postal code: 95014"), kSent}));
}

TEST_F(CivicInfoLookup, LeavesAbsentPartsEmptyAndLogsOnlyThoseThatAreThere) {
  answer(oneItem({.countryCode = "MC", .locality = "Monaco"}));
  EXPECT_EQ(takeDelivered(), Delivered{"MC//Monaco/"});
  EXPECT_EQ(log.takeLines(),
            (Lines{kOneItem, Notice("_RequestCivicInfoFromLatitudeLongitude country code: MC"),
                   Notice("_RequestCivicInfoFromLatitudeLongitude city: Monaco"), kSent}));
}

TEST_F(CivicInfoLookup, TakesTheCountryFromTheConfigurationAndThePostCodeFromTheAnswer) {
  answer(oneItem({.postCode = "10000"}));
  EXPECT_EQ(takeDelivered(), Delivered{"XK///10000"});
  EXPECT_EQ(log.takeLines(),
            (Lines{kOneItem, Notice("_RequestCivicInfoFromLatitudeLongitude postal code: 10000"),
                   kSent}));
}

TEST_F(CivicInfoLookup, TakesAPartThatIsThereAndEmptyForWhatItIs) {
  answer(oneItem({.countryCode = "", .administrativeArea = ""}));
  EXPECT_EQ(takeDelivered(), Delivered{"XK///"});
  EXPECT_EQ(log.takeLines(),
            (Lines{kOneItem, Notice("_RequestCivicInfoFromLatitudeLongitude country code: "),
                   Notice("_RequestCivicInfoFromLatitudeLongitude state: "), kSent}));
}

TEST_F(CivicInfoLookup, WithAnErrorLogsItAndDeliversTheConfiguredCountry) {
  const MapError error{"100% gone"};
  request()(nullptr, &error);
  EXPECT_EQ(takeDelivered(), Delivered{"XK///"});
  EXPECT_EQ(
      log.takeLines(),
      (Lines{Error("_RequestCivicInfoFromLatitudeLongitude error: (100% gone)"), kNoItems, kSent}));
}

TEST_F(CivicInfoLookup, WithAnErrorDoesNotLookAtTheItems) {
  const MapError error{"e"};
  request()(&complete, &error);
  EXPECT_EQ(takeDelivered(), Delivered{"XK///"});
}

TEST_F(CivicInfoLookup, WithoutItemsDeliversTheConfiguredCountry) {
  request()(nullptr, nullptr);
  EXPECT_EQ(log.takeLines(), (Lines{kNoItems, kSent}));
  answer({});
  EXPECT_EQ(log.takeLines(), (Lines{kNoItems, kSent}));
  EXPECT_EQ(takeDelivered(), (Delivered{"XK///", "XK///"}));
}

TEST_F(CivicInfoLookup, WithAnInvalidFirstItemDoesNotLookAtTheSecond) {
  const auto noItem = Error("_RequestCivicInfoLatitudeLongitude NULL mapItem \n");
  const auto items = Notice("_RequestCivicInfoFromLatitudeLongitude mapItems: (2)");
  answer({nullptr, complete.front()});
  EXPECT_EQ(log.takeLines(), (Lines{items, noItem, kSent}));
  answer({std::make_shared<const fakes::FakeMapItem>(false, MapAddress{}), complete.front()});
  EXPECT_EQ(log.takeLines(), (Lines{items, noItem, kSent}));
  EXPECT_EQ(takeDelivered(), (Delivered{"XK///", "XK///"}));
}

TEST_F(CivicInfoLookup, WithoutAStructuredAddressDeliversTheConfiguredCountry) {
  const auto noAddress =
      Error("_RequestCivicInfoLatitudeLongitude mapItem didn't get a structured address");
  answer({std::make_shared<const fakes::FakeMapItem>(true, std::nullopt)});
  EXPECT_EQ(log.takeLines(), (Lines{kOneItem, noAddress, kSent}));
  answer({std::make_shared<const fakes::FakeMapItem>(true, MapAddress{})});
  EXPECT_EQ(log.takeLines(), (Lines{kOneItem, noAddress, kSent}));
  EXPECT_EQ(takeDelivered(), (Delivered{"XK///", "XK///"}));
}

TEST_F(CivicInfoLookup, WithoutAnyCountryDeliversEmptyTexts) {
  country.code.reset();
  answer({});
  EXPECT_EQ(log.takeLines(), (Lines{kNoItems, kNoCountry, kSent}));
  EXPECT_EQ(takeDelivered(), Delivered{"///"});
}

TEST_F(CivicInfoLookup, FallsBackToTheConfiguredCountryAfterFiveSecondsAndNotBefore) {
  const auto late = request();
  pass(4.999);
  EXPECT_EQ(takeDelivered(), Delivered{});
  pass(0.001);
  EXPECT_EQ(takeDelivered(), Delivered{"XK///"});
  EXPECT_EQ(waitingForGeocode, 0);
  EXPECT_EQ(log.takeLines(), Lines{kSent});
}

TEST_F(CivicInfoLookup, DropsACompleteAnswerThatComesAfterTheFallback) {
  const auto late = request();
  pass(5);
  (void)takeDelivered();
  (void)log.takeLines();
  late(&complete, nullptr);
  EXPECT_EQ(takeDelivered(), Delivered{});
  EXPECT_EQ(log.takeLines(), Lines{kNotWaiting});
}

TEST_F(CivicInfoLookup, HasASilentFallbackWhenTheAnswerCameFirst) {
  answer(complete);
  (void)takeDelivered();
  (void)log.takeLines();
  pass(5);
  EXPECT_EQ(takeDelivered(), Delivered{});
  EXPECT_EQ(log.takeLines(), Lines{});
}

TEST_F(CivicInfoLookup, DropsASecondAnswerToTheSameRequest) {
  const auto handler = request();
  handler(&complete, nullptr);
  (void)log.takeLines();
  handler(&complete, nullptr);
  EXPECT_EQ(takeDelivered(), Delivered{"US/California/Cupertino/95014"});
  EXPECT_EQ(log.takeLines(), Lines{kNotWaiting});
}

TEST_F(CivicInfoLookup, DropsALateErrorWithoutItsText) {
  const auto late = request();
  pass(5);
  (void)log.takeLines();
  const MapError error{"late"};
  late(nullptr, &error);
  EXPECT_EQ(log.takeLines(), Lines{kNotWaiting});
}

TEST_F(CivicInfoLookup, DeliversTheFirstAnswerOfTwoOverlappingRequestsOnly) {
  const auto first = request();
  pass(1);
  const auto second = request();
  const MapItems other = oneItem({.countryCode = "FR"});
  second(&other, nullptr);
  (void)log.takeLines();
  first(&complete, nullptr);
  EXPECT_EQ(log.takeLines(), Lines{kNotWaiting});
  pass(10);
  EXPECT_EQ(takeDelivered(), Delivered{"FR///"});
  EXPECT_EQ(log.takeLines(), Lines{});
}

TEST_F(CivicInfoLookup, EndsTwoOverlappingRequestsWithTheFirstFallback) {
  const auto first = request();
  pass(3);
  const auto second = request();
  pass(2);  // five seconds from the first, two from the second
  EXPECT_EQ(takeDelivered(), Delivered{"XK///"});
  second(&complete, nullptr);
  first(&complete, nullptr);
  pass(3);
  EXPECT_EQ(takeDelivered(), Delivered{});
}

TEST_F(CivicInfoLookup, OfANewRequestIsEndedByTheFallbackOfAnOlderOneThatWasAnswered) {
  answer(complete);
  pass(4);
  (void)takeDelivered();
  const auto second = request();
  pass(1);
  EXPECT_EQ(takeDelivered(), Delivered{"XK///"});
}

TEST_F(CivicInfoLookup, KeepsThePartsOfEachRequestApart) {
  answer(complete);
  answer(oneItem({.locality = "Paris"}));
  EXPECT_EQ(takeDelivered(), (Delivered{"US/California/Cupertino/95014", "XK//Paris/"}));
}

TEST_F(CivicInfoLookup, OfZeroZeroDeliversTheConfiguredCountryFromTheMainQueue) {
  for (const auto& [latitude, longitude] :
       {std::pair(0.0, 0.0), std::pair(-0.0, 0.0), std::pair(0.0, -0.0), std::pair(-0.0, -0.0)}) {
    RequestCivicInfoFromLatitudeLongitude(latitude, longitude);
    EXPECT_EQ(takeDelivered(), Delivered{});
    pass(0);
    EXPECT_EQ(takeDelivered(), Delivered{"XK///"});
    EXPECT_EQ(waitingForGeocode, 0);
  }
  EXPECT_TRUE(maps.submissions.empty());
  pass(5);
  EXPECT_EQ(takeDelivered(), Delivered{});
}

TEST_F(CivicInfoLookup, OfZeroZeroLeavesAPendingRequestWaiting) {
  const auto pending = request();
  RequestCivicInfoFromLatitudeLongitude(0, 0);
  pass(0);
  EXPECT_EQ(takeDelivered(), Delivered{"XK///"});
  EXPECT_EQ(waitingForGeocode, 1);
  pending(&complete, nullptr);
  EXPECT_EQ(takeDelivered(), Delivered{"US/California/Cupertino/95014"});
}

TEST_F(CivicInfoLookup, AsksTheMapServiceForEveryOtherCoordinate) {
  constexpr double kNan = std::numeric_limits<double>::quiet_NaN();
  constexpr double kInfinity = std::numeric_limits<double>::infinity();
  const std::vector<std::pair<double, double>> places{
      {0, 1e-300}, {1e-300, 0}, {0, kNan}, {kNan, 0}, {kInfinity, -kInfinity},
      {90, 180},   {-90, -180}, {0, 180},  {91, 0},   {0, 1e308}};
  for (const auto& [latitude, longitude] : places) {
    RequestCivicInfoFromLatitudeLongitude(latitude, longitude);
  }
  EXPECT_EQ(maps.submissions.size(), places.size());
}

TEST_F(CivicInfoLookup, DeliversNothingTwiceWhenTheDaemonIsAbsent) {
  telephony.published = false;
  answer(complete);
  pass(5);
  EXPECT_TRUE(telephony.delivered.empty());
  EXPECT_EQ(waitingForGeocode, 0);
}

class LocationRoutines : public CivicInfoLookup {};

TEST_F(LocationRoutines, RequestLogsAndAnswers0BeforeAnythingIsDelivered) {
  EXPECT_EQ(server_HvMobileHelperRequestCountryCodeFromLocation(1, 10, 20), 0);
  EXPECT_EQ(log.takeLines(),
            Lines{Error("server_HvMobileHelperRequestCountryCodeFromLocation \n")});
  EXPECT_EQ(maps.submissions.front().coordinate.latitude, 10);
  EXPECT_EQ(maps.submissions.front().coordinate.longitude, 20);
  EXPECT_EQ(takeDelivered(), Delivered{});
}

std::string Field(const wire::Text<64>& field) { return {field.bytes.begin(), field.bytes.end()}; }

TEST_F(LocationRoutines, CopyPadsAShortCodeWithZeros) {
  wire::Text<64> field;
  field.bytes.fill('?');
  country.code = "DE";
  EXPECT_EQ(server_HvMobileHelperCopyCountryCode(1, field), 0);
  EXPECT_EQ(Field(field), "DE" + std::string(62, '\0'));
  EXPECT_EQ(log.takeLines(), Lines{});
}

TEST_F(LocationRoutines, CopyFillsTheFieldWithoutAZeroFrom64BytesOn) {
  for (const std::size_t length : {63U, 64U, 65U, 1000U}) {
    wire::Text<64> field;
    field.bytes.fill('?');
    country.code = std::string(length, 'x');
    EXPECT_EQ(server_HvMobileHelperCopyCountryCode(1, field), 0);
    EXPECT_EQ(Field(field), length < 64 ? std::string(63, 'x') + '\0' : std::string(64, 'x'));
  }
}

TEST_F(LocationRoutines, CopyOfAnUnknownCountryIs64ZerosAndALine) {
  wire::Text<64> field;
  field.bytes.fill('?');
  country.code.reset();
  EXPECT_EQ(server_HvMobileHelperCopyCountryCode(1, field), 0);
  EXPECT_EQ(Field(field), std::string(64, '\0'));
  EXPECT_EQ(log.takeLines(), Lines{kNoCountry});
}

}  // namespace
