// SPDX-License-Identifier: Apache-2.0
//
// The predicates: the shared rules about the mobile user's home, and what they write to the log.
#include "Helper/Files/PathAllowList.h"

#include <string>

#include "Helper/Files/MobileUser.h"
#include "Helper/Platform/DirectoryEntries.h"
#include "Helper/Platform/PathRules.h"
#include "Helper/Platform/SystemLog.h"

using platform::Log;
using platform::LogPriority;
using platform::PathRule;
using platform::PathRules;
using platform::PathVerdict;

namespace {

std::string CopyHome() {
  const char* home = GetMobileUserDirectory();
  return home ? home : "";
}

/// The home directory as it was when the program started.
const std::string mobileHome = CopyHome();  // NOLINT: what it throws without memory ends the start

const PathRules& Rules() {
  static const PathRules rules(mobileHome);
  return rules;
}

std::optional<mode_t> ModeOf(const char* path) {
  return platform::Shared<platform::DirectoryEntries>().mode(path);
}

void LogMatch(const char* path, const PathVerdict& verdict) {
  if (verdict.rule == PathRule::kFixedEntry) {
    Log(LogPriority::kInfo, "%s is within allowed path %s", path, verdict.place);
  } else {
    Log(LogPriority::kInfo, "Allowing path %s within %s", path, verdict.place);
  }
}

}  // namespace

bool IsAllowedLinkPath(const char* path) {
  const PathVerdict verdict = Rules().judgeLink(path, ModeOf);
  if (verdict.allowed) LogMatch(path, verdict);
  return verdict.allowed;
}

bool IsAllowedPath(const char* path) {
  const PathVerdict verdict = Rules().judge(path, ModeOf);
  if (verdict.reachedPackageRule) {
    Log(LogPriority::kError,
        "NOT Allowing path %s as it isn't within the wild card directories:", path);
    Log(LogPriority::kError, "%s", Rules().userBundles());
    Log(LogPriority::kError, "%s", PathRules::systemBundles());
  } else {
    LogMatch(path, verdict);
  }
  return verdict.allowed;
}
