// SPDX-License-Identifier: Apache-2.0
//
// The configured country out of the system's own settings, each read anew at every question. Any
// thread; no state.
#pragma once

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/MapService.h"

namespace platform {

/// Where a country that somebody chose is kept: a text, in any scope an application sees.
inline constexpr const char* kCountryPreferenceDomain = "com.zarvo.halvec.mobile-helper";
inline constexpr const char* kCountryPreferenceKey = "CountryCode";

/// The files that are asked, in this order.
struct CountryFiles {
  std::string localTime = "/etc/localtime";  // a link to the zone's file (localtime(5))
  std::string zoneTable = "/usr/share/zoneinfo/zone.tab";
  std::vector<std::string> locales{"/etc/locale.conf", "/etc/default/locale"};  // locale.conf(5)
  std::string regulatoryDomain = "/sys/module/cfg80211/parameters/ieee80211_regdom";
};

class SystemCountry final : public CountryConfiguration {
 public:
  explicit SystemCountry(CountryFiles files = {}) : files_(std::move(files)) {}

  /// The chosen country, as it was written; else the first country that exists of: the time zone's,
  /// the locale's, the wireless regulatory domain. A country exists if the zone table has it.
  [[nodiscard]] std::optional<std::string> countryCode() override;

 private:
  const CountryFiles files_;
};

}  // namespace platform
