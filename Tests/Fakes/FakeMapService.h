// SPDX-License-Identifier: Apache-2.0
//
// A map service whose answers the test gives, when it wants and as often as it wants, and a country
// configuration that says what the test says. One thread.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/MapService.h"

namespace fakes {

/// A map item as the test describes it.
class FakeMapItem final : public platform::MapItem {
 public:
  explicit FakeMapItem(platform::StructuredAddress address)
      : address_(platform::MapAddress{
            std::make_shared<const platform::StructuredAddress>(std::move(address))}) {}
  FakeMapItem(bool valid, std::optional<platform::MapAddress> address)
      : valid_(valid), address_(std::move(address)) {}

  bool isValid() const override { return valid_; }
  const platform::MapAddress* address() const override { return address_ ? &*address_ : nullptr; }

 private:
  bool valid_ = true;
  std::optional<platform::MapAddress> address_;
};

class FakeMapService final : public platform::MapService {
 public:
  struct Submission {
    platform::Coordinate coordinate;
    platform::ReverseGeocodeOptions options;
    platform::MapCompletion handler;
    platform::NetworkActivity* activity;
  };
  /// Everything that was submitted, in that order. Nothing is answered by itself.
  std::vector<Submission> submissions;

  std::unique_ptr<platform::MapTicket> reverseGeocodeTicket(
      const platform::Coordinate& coordinate,
      const platform::ReverseGeocodeOptions& options) override {
    return std::make_unique<Ticket>(*this, coordinate, options);
  }

 private:
  class Ticket final : public platform::MapTicket {
   public:
    Ticket(FakeMapService& service, const platform::Coordinate& coordinate,
           const platform::ReverseGeocodeOptions& options)
        : service_(service), coordinate_(coordinate), options_(options) {}
    void submit(platform::MapCompletion handler, platform::NetworkActivity* activity) override {
      service_.submissions.push_back({coordinate_, options_, std::move(handler), activity});
    }

   private:
    FakeMapService& service_;
    const platform::Coordinate coordinate_;
    const platform::ReverseGeocodeOptions options_;
  };
};

class FakeCountryConfiguration final : public platform::CountryConfiguration {
 public:
  std::optional<std::string> code;
  std::optional<std::string> countryCode() override { return code; }
};

}  // namespace fakes
