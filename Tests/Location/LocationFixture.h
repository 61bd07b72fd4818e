// SPDX-License-Identifier: Apache-2.0
//
// The location subsystem on fakes: a map service that the test answers for, a telephony daemon in
// memory, and a main queue whose clock the test moves.
#pragma once

#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Location/CivicInfoLookup.h"
#include "Helper/Platform/MainQueue.h"
#include "Tests/Fakes/FakeMapService.h"
#include "Tests/Fakes/FakeSystemLog.h"
#include "Tests/Fakes/FakeTelephonyFramework.h"
#include "Tests/Fakes/ManualClock.h"

namespace location_test {

using Lines = std::vector<fakes::FakeSystemLog::Line>;
using platform::LogPriority;

inline fakes::FakeSystemLog::Line Error(std::string text) {
  return {LogPriority::kError, std::move(text)};
}
inline fakes::FakeSystemLog::Line Notice(std::string text) {
  return {LogPriority::kNotice, std::move(text)};
}

class LocationFixture : public ::testing::Test {
 protected:
  ~LocationFixture() override { waitingForGeocode = 0; }

  /// Serves everything that is ready on the main queue, `seconds` from now.
  void pass(double seconds) {
    clock.advance(std::chrono::duration<double>(seconds));
    EXPECT_EQ(loop.run(0), platform::RunResult::kTimedOut);
  }

  /// What was delivered since the last call, as country/state/city/postal code, "null" for null.
  std::vector<std::string> takeDelivered() {
    std::vector<std::string> texts;
    for (const platform::CivicInfoTexts& info : std::exchange(telephony.delivered, {})) {
      std::string text;
      for (const std::optional<platform::String>& part : info) {
        text += (&part == info.data() ? "" : "/") + std::string(part ? part->utf8() : "null");
      }
      texts.push_back(text);
    }
    return texts;
  }

  static platform::MapItems oneItem(platform::StructuredAddress address) {
    return {std::make_shared<const fakes::FakeMapItem>(std::move(address))};
  }

  fakes::ManualClock clock;
  platform::RunLoop loop{clock};
  platform::ScopedMainQueue mainQueue{loop};
  fakes::FakeSystemLog log;
  platform::ScopedReplacement<platform::SystemLog> logReplacement{log};
  fakes::FakeMapService maps;
  platform::ScopedReplacement<platform::MapService> mapsReplacement{maps};
  fakes::FakeCountryConfiguration country;
  platform::ScopedReplacement<platform::CountryConfiguration> countryReplacement{country};
  fakes::FakeTelephonyFramework telephony;
  platform::ScopedReplacement<platform::TelephonyFramework> telephonyReplacement{telephony};
};

}  // namespace location_test
