// SPDX-License-Identifier: Apache-2.0
//
// What a map service keeps to, run on the one that the test answers for and on the one over
// geocoders; and what the latter does with its geocoders.
#include <gtest/gtest.h>

#include <future>
#include <optional>
#include <semaphore>
#include <string>
#include <thread>
#include <vector>

#include "Helper/Platform/Linux/GeocodingMapService.h"
#include "Helper/Platform/MainQueue.h"
#include "Tests/Fakes/FakeGeocoder.h"
#include "Tests/Fakes/FakeMapService.h"
#include "Tests/Fakes/ManualClock.h"

namespace {

using platform::CivicAddress;
using platform::GeocodeAnswer;
using platform::GeocodeError;
using platform::MapError;
using platform::MapItems;
using platform::OpenSea;

/// What a completion was given, as text.
std::string Describe(const MapItems* items, const MapError* error) {
  std::string text = error ? "error " + error->description : "";
  for (std::size_t index = 0; items && index < items->size(); ++index) {
    const platform::MapItem& item = *items->at(index);
    EXPECT_TRUE(item.isValid());
    const auto& parts = *item.address()->structured;
    text += parts.countryCode.value_or("-") + '/' + parts.administrativeArea.value_or("-") + '/' +
            parts.locality.value_or("-") + '/' + parts.postCode.value_or("-");
  }
  return text.empty() ? "nothing" : text;
}

class MainThread : public ::testing::Test {
 protected:
  /// Serves the main queue until `count` completions have run.
  void serveUntil(std::size_t count) {
    while (completions.size() < count) (void)loop.run(0.01);
  }
  platform::MapCompletion note() {
    return [this](const MapItems* items, const MapError* error) {
      EXPECT_EQ(std::this_thread::get_id(), mainThread);
      completions.push_back(Describe(items, error));
    };
  }
  const std::thread::id mainThread = std::this_thread::get_id();
  platform::RunLoop loop{platform::SystemClock()};
  platform::ScopedMainQueue mainQueue{loop};
  std::vector<std::string> completions;
};

/// A service together with what it shall answer.
class Answered {
 public:
  platform::MapService& service() { return service_; }
  void willAnswer(GeocodeAnswer answer) { answer_ = std::move(answer); }
  /// Answers what was submitted last, as a service that knows would.
  void answer() {
    auto handler = service_.submissions.back().handler;
    platform::PostToMainQueue([handler, answer = answer_] {
      if (const auto* failure = std::get_if<GeocodeError>(&answer)) {
        const MapError error{failure->description};
        return handler(nullptr, &error);
      }
      MapItems items;
      if (const auto* address = std::get_if<CivicAddress>(&answer)) {
        items.push_back(std::make_shared<const fakes::FakeMapItem>(platform::StructuredAddress{
            address->countryCode, address->state, address->city, address->postCode}));
      }
      handler(&items, nullptr);
    });
  }

 private:
  fakes::FakeMapService service_;
  GeocodeAnswer answer_;
};

class OverGeocoder {
 public:
  platform::MapService& service() { return service_; }
  void willAnswer(GeocodeAnswer answer) { geocoder_.answer = std::move(answer); }
  void answer() {}

 private:
  fakes::FakeGeocoder geocoder_{OpenSea{}};
  platform::GeocodingMapService service_{geocoder_, geocoder_};
};

template <class Side>
class MapServiceContract : public MainThread {
 protected:
  std::string lookUp(GeocodeAnswer answer) {
    side.willAnswer(std::move(answer));
    const std::size_t before = completions.size();
    side.service().reverseGeocodeTicket({1, 2}, {})->submit(note(), nullptr);
    EXPECT_EQ(completions.size(), before) << "ran inside submit";
    side.answer();
    serveUntil(before + 1);
    EXPECT_EQ(loop.run(0), platform::RunResult::kTimedOut);
    EXPECT_EQ(completions.size(), before + 1) << "ran more than once";
    return completions.back();
  }
  Side side;
};

using Sides = ::testing::Types<Answered, OverGeocoder>;
TYPED_TEST_SUITE(MapServiceContract, Sides);

TYPED_TEST(MapServiceContract, CompletesOnceOnTheMainQueueWithTheAddress) {
  EXPECT_EQ(this->lookUp(CivicAddress{"JP", "Tokyo", "Chiyoda", "100-0001"}),
            "JP/Tokyo/Chiyoda/100-0001");
}

TYPED_TEST(MapServiceContract, LeavesAbsentPartsAbsent) {
  EXPECT_EQ(this->lookUp(CivicAddress{"AQ", {}, {}, {}}), "AQ/-/-/-");
}

TYPED_TEST(MapServiceContract, HasNothingAndNoErrorForTheOpenSea) {
  EXPECT_EQ(this->lookUp(OpenSea{}), "nothing");
}

TYPED_TEST(MapServiceContract, HandsAnErrorOverWithItsDescription) {
  EXPECT_EQ(this->lookUp(GeocodeError{"no atlas"}), "error no atlas");
}

class GeocodingMapService : public MainThread {
 protected:
  void submit() { service->reverseGeocodeTicket({1, 2}, {})->submit(note(), nullptr); }
  fakes::ManualClock clock;
  fakes::FakeGeocoder geocoder{CivicAddress{"FR", {}, {}, {}}};
  fakes::FakeGeocoder quick{CivicAddress{"XQ", {}, {}, {}}};
  std::optional<platform::GeocodingMapService> service{std::in_place, geocoder, quick, clock};
};

TEST_F(GeocodingMapService, AsksForTheTicketsCoordinateAwayFromTheMainThread) {
  geocoder.whenAsked = [this] { EXPECT_NE(std::this_thread::get_id(), mainThread); };
  submit();
  serveUntil(1);
  ASSERT_EQ(geocoder.asked().size(), 1U);
  EXPECT_EQ(geocoder.asked()[0].latitude, 1);
  EXPECT_EQ(geocoder.asked()[0].longitude, 2);
}

TEST_F(GeocodingMapService, KeepsTheMainQueueGoingWhileAGeocoderTakesItsTime) {
  std::binary_semaphore release(0);
  geocoder.whenAsked = [&] { release.acquire(); };
  submit();
  bool served = false;
  platform::PostToMainQueue([&] { served = true; });
  while (!served) (void)loop.run(0.01);
  EXPECT_TRUE(completions.empty());
  release.release();
  serveUntil(1);
}

TEST_F(GeocodingMapService, AsksTheQuickGeocoderForWhatHadToWaitTooLong) {
  std::binary_semaphore asked(0);
  std::binary_semaphore release(0);
  geocoder.whenAsked = [&] {
    asked.release();
    release.acquire();
  };
  submit();
  asked.acquire();
  submit();
  clock.advance(std::chrono::milliseconds(501));
  release.release();
  serveUntil(2);
  EXPECT_EQ(completions, (std::vector<std::string>{"FR/-/-/-", "XQ/-/-/-"}));
}

TEST_F(GeocodingMapService, AsksTheGeocoderForWhatWaitedABit) {
  std::counting_semaphore<2> asked(0);
  std::counting_semaphore<2> release(0);
  geocoder.whenAsked = [&] {
    asked.release();
    release.acquire();
  };
  submit();
  asked.acquire();
  submit();
  clock.advance(std::chrono::milliseconds(500));
  release.release(2);
  serveUntil(2);
  EXPECT_EQ(completions, (std::vector<std::string>{"FR/-/-/-", "FR/-/-/-"}));
}

TEST_F(GeocodingMapService, AnswersATicketThatOutlivesIt) {
  const auto ticket = service->reverseGeocodeTicket({1, 2}, {});
  service.reset();
  ticket->submit(note(), nullptr);
  serveUntil(1);
  EXPECT_EQ(completions, std::vector<std::string>{"FR/-/-/-"});
}

}  // namespace
