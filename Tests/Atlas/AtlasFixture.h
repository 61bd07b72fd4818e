// SPDX-License-Identifier: Apache-2.0
//
// An atlas on disk for one test, and its geocoder. One thread.
#pragma once

#include <gtest/gtest.h>

#include <string>

#include "Helper/Platform/Linux/AtlasGeocoder.h"
#include "Tests/Files/FolderForTest.h"

namespace atlas_test {

class AtlasFixture : public ::testing::Test {
 protected:
  /// Writes the atlas; before this there is none.
  void write(const std::string& bytes) const { folder_.file("atlas.bin", bytes); }

  /// COUNTRY|STATE|CITY, "open sea", or the error's text behind "error: ".
  [[nodiscard]] std::string at(double latitude, double longitude) {
    const platform::GeocodeAnswer answer = geocoder_.lookUp({latitude, longitude});
    if (std::holds_alternative<platform::OpenSea>(answer)) return "open sea";
    if (const auto* error = std::get_if<platform::GeocodeError>(&answer)) {
      return "error: " + error->description;
    }
    const auto& address = std::get<platform::CivicAddress>(answer);
    EXPECT_EQ(address.postCode, std::nullopt);
    return address.countryCode.value_or("") + '|' + address.state.value_or("") + '|' +
           address.city.value_or("");
  }

  files_test::FolderForTest folder_;
  const std::string path_ = folder_.at("atlas.bin");
  platform::AtlasGeocoder geocoder_{path_};
};

}  // namespace atlas_test
