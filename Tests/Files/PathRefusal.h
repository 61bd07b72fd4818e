// SPDX-License-Identifier: Apache-2.0
//
// What the allow-list says about a path that it does not know. No state.
#pragma once

#include <string>
#include <vector>

#include "Helper/Files/MobileUser.h"
#include "Tests/Fakes/FakeSystemLog.h"

namespace files_test {

inline constexpr char kSystemBundles[] = "/private/var/mobile/Library/Carrier Bundles";

inline std::string UserBundles() {
  const char* home = GetMobileUserDirectory();
  return std::string(home ? home : "") + "/Library/Carrier Bundles/";
}

inline std::vector<fakes::FakeSystemLog::Line> RefusalOf(const std::string& path) {
  using platform::LogPriority;
  return {{LogPriority::kError,
           "NOT Allowing path " + path + " as it isn't within the wild card directories:"},
          {LogPriority::kError, UserBundles()},
          {LogPriority::kError, kSystemBundles}};
}

}  // namespace files_test
