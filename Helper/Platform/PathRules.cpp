// SPDX-License-Identifier: Apache-2.0
//
// The rules in the order in which they are asked, and their texts.
#include "Helper/Platform/PathRules.h"

#include <algorithm>
#include <cstring>

#include "Helper/Platform/BundleIdentifiers.h"

namespace platform {
namespace {

/// How much of a path is looked at.
constexpr std::size_t kLimit = 1024;
/// The file type bits of a symbolic link, asked for one by one.
constexpr mode_t kLinkTypeMask = 0xA000;

constexpr char kSystemBundles[] = "/private/var/mobile/Library/Carrier Bundles";
constexpr char kWildcardDirectory[] = "/tmp";
constexpr std::string_view kPackageExtension = ".tcbk";

constexpr std::array kSystemEntries{
    "/private/var/mobile/Library/Preferences/com.zarvo.carrier.plist",
    "/private/var/mobile/Library/Preferences/com.zarvo.carrier_2.plist",
    "/private/var/mobile/Library/Preferences/com.zarvo.operator.plist",
    "/private/var/mobile/Library/Preferences/com.zarvo.carrier.default.plist",
    "/private/var/mobile/Library/Preferences/com.zarvo.carrier.bootstrap.plist",
    "/private/var/mobile/Library/Carrier Bundle.bundle",
    "/private/var/mobile/Library/Carrier2Bundle.bundle",
    "/private/var/mobile/Library/Operator Bundle.bundle",
    "/private/var/mobile/Library/CarrierDefault.bundle",
    "/private/var/mobile/Library/CarrierBootstrap.bundle"};

std::string PreferenceFile(const std::string& home, const String& identifier) {
  return home + "/Library/Preferences/" + std::string(identifier.utf8()) + kPlistExtension;
}

bool BeginsWith(const char* path, std::string_view place) {
  return FindWithin(path, place, kLimit) == 0;
}

bool IsPackage(const char* path) {
  if (!BeginsWith(path, kWildcardDirectory)) return false;
  const std::size_t at = FindWithin(path, kPackageExtension, kLimit);
  return at != std::string_view::npos && at + kPackageExtension.size() == std::strlen(path);
}

}  // namespace

std::size_t FindWithin(const char* text, std::string_view needle, std::size_t limit) {
  return std::string_view(text, ::strnlen(text, limit)).find(needle);
}

PathRules::PathRules(std::string home)
    : homeEntries_{PreferenceFile(home, kCarrierBundleId),
                   // Kept: the same once more. Under the home directory the second carrier's
                   // preference file is not on the list.
                   PreferenceFile(home, kCarrierBundleId), PreferenceFile(home, kOperatorBundleId),
                   PreferenceFile(home, kDefaultBundleId), PreferenceFile(home, kBootstrapBundleId),
                   home + "/Library/Carrier Bundle.bundle", home + "/Library/Carrier2Bundle.bundle",
                   home + "/Library/Operator Bundle.bundle",
                   home + "/Library/CarrierDefault.bundle",
                   home + "/Library/CarrierBootstrap.bundle"},
      userBundles_(std::move(home) + kUserCBDir) {
  static_assert(kSystemEntries.size() + std::tuple_size_v<decltype(homeEntries_)> == kEntryCount);
  const auto next = std::transform(homeEntries_.begin(), homeEntries_.end(), entries_.begin(),
                                   [](const std::string& entry) { return entry.c_str(); });
  std::copy(kSystemEntries.begin(), kSystemEntries.end(), next);
}

const char* PathRules::systemBundles() { return kSystemBundles; }

PathVerdict PathRules::judgeLink(const char* path, const ModeOfEntry& modeOf) const {
  const std::optional<mode_t> mode = modeOf(path);
  if (mode && (*mode & kLinkTypeMask) == 0) return {.rule = PathRule::kOccupied};
  const auto entry = std::find_if(entries_.begin(), entries_.end(), [path](const char* candidate) {
    return std::strncmp(path, candidate, kLimit) == 0;
  });
  if (entry == entries_.end()) return {.rule = PathRule::kUnlisted};
  return {.allowed = true, .rule = PathRule::kFixedEntry, .place = *entry};
}

PathVerdict PathRules::judge(const char* path, const ModeOfEntry& modeOf) const {
  if (BeginsWith(path, userBundles_)) {
    return {.allowed = true, .rule = PathRule::kUserBundles, .place = userBundles()};
  }
  if (BeginsWith(path, kSystemBundles)) {
    return {.allowed = true, .rule = PathRule::kSystemBundles, .place = kSystemBundles};
  }
  PathVerdict verdict = judgeLink(path, modeOf);
  if (verdict.allowed) return verdict;
  verdict.reachedPackageRule = true;
  if (IsPackage(path)) {
    verdict.allowed = true;
    verdict.rule = PathRule::kPackage;
    verdict.place = kWildcardDirectory;
  }
  return verdict;
}

}  // namespace platform
