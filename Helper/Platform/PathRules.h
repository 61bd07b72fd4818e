// SPDX-License-Identifier: Apache-2.0
//
// Which paths a client of the helper may have links made at, entries removed and items placed. The
// judgement is textual: nothing resolves "..", repeated slashes or links inside a path. Pure but
// for one question about what stands at the path; no state after construction, any thread.
#pragma once

#include <sys/types.h>

#include <array>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace platform {

/// What decided about a path, in the order in which the rules are asked.
enum class PathRule {
  kUserBundles,    // allowed: begins with the user carrier-bundles directory
  kSystemBundles,  // allowed: begins with the system carrier-bundles directory
  kOccupied,       // not on the list: what stands there has no bit of a link's type
  kFixedEntry,     // allowed: is exactly an entry of the list
  kUnlisted,       // not on the list: equals no entry
  kPackage  // allowed: begins with the wildcard directory and ends with the package extension
};

struct PathVerdict {
  bool allowed = false;
  PathRule rule = PathRule::kUnlisted;
  /// The entry or directory that the path matched; null where it is refused. Valid while the rules
  /// live.
  const char* place = nullptr;
  /// Where no directory matched and the list did not allow the path: then it was the package rule
  /// that decided, for or against.
  bool reachedPackageRule = false;
};

/// The mode of the entry at a path, a link not followed; none without an entry.
using ModeOfEntry = std::function<std::optional<mode_t>(const char* path)>;

class PathRules {
 public:
  static constexpr std::size_t kEntryCount = 20;

  /// Builds every text from `home`, by plain concatenation. An empty home is one.
  explicit PathRules(std::string home);
  PathRules(const PathRules&) = delete;
  PathRules& operator=(const PathRules&) = delete;
  ~PathRules() = default;

  /// Whether a link may be made at `path`, a C string: kOccupied, kFixedEntry or kUnlisted.
  /// Kept: the type of what stands there is masked with 0xA000, not compared with a link's type, so
  /// directories and FIFOs are refused, while regular files, links, sockets, devices and nothing at
  /// all are compared with the list.
  [[nodiscard]] PathVerdict judgeLink(const char* path, const ModeOfEntry& modeOf) const;

  /// Whether an entry may be removed or an item placed at `path`.
  [[nodiscard]] PathVerdict judge(const char* path, const ModeOfEntry& modeOf) const;

  [[nodiscard]] const std::array<const char*, kEntryCount>& entries() const { return entries_; }
  /// With a last slash.
  [[nodiscard]] const char* userBundles() const { return userBundles_.c_str(); }
  /// Kept: without a last slash, so that a longer name of the same beginning is inside, too.
  [[nodiscard]] static const char* systemBundles();

 private:
  std::array<std::string, 10> homeEntries_;
  std::array<const char*, kEntryCount> entries_{};
  std::string userBundles_;
};

/// Where `needle` first occurs within the first `limit` bytes of `text`, a C string; npos when it
/// does not lie there entirely.
[[nodiscard]] std::size_t FindWithin(const char* text, std::string_view needle, std::size_t limit);

}  // namespace platform
