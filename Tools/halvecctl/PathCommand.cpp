// SPDX-License-Identifier: Apache-2.0
//
// halvecctl path: what the helper's rules say about a path, by the same code that it runs. Needs no
// helper.
#include <cstdio>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/DirectoryEntries.h"
#include "Helper/Platform/MobileUserRecord.h"
#include "Helper/Platform/PathRules.h"
#include "Tools/halvecctl/Command.h"
#include "Tools/halvecctl/Json.h"

namespace halvecctl {
namespace {

using platform::PathRule;
using platform::PathVerdict;

/// The longest path that a request carries, its zero not counted.
constexpr std::size_t kLongestPath = 1023;

struct RuleText {
  std::string_view name;
  std::string_view text;  // what stands before the place, if there is one
};

RuleText TextOf(PathRule rule) {
  switch (rule) {
    case PathRule::kUserBundles:
      return {"user-bundles", "begins with the user's carrier-bundles directory "};
    case PathRule::kSystemBundles:
      return {"system-bundles", "begins with the system's carrier-bundles directory "};
    case PathRule::kOccupied:
      return {"occupied", "a directory or FIFO stands there"};
    case PathRule::kFixedEntry:
      return {"fixed-entry", "is on the list as "};
    case PathRule::kUnlisted:
      return {"unlisted", "is not on the list"};
    case PathRule::kPackage:
      return {"package", "ends with .tcbk and begins with "};
  }
  return {"unknown", ""};
}

std::string Json(const PathVerdict& verdict) {
  std::string text = "{\"allowed\":" + std::string(verdict.allowed ? "true" : "false") +
                     ",\"rule\":" + JsonString(TextOf(verdict.rule).name);
  if (verdict.place) text += ",\"place\":" + JsonString(verdict.place);
  return text + "}";
}

std::string Sentence(const PathVerdict& verdict) {
  std::string text = verdict.allowed ? "allowed: " : "refused: ";
  text += TextOf(verdict.rule).text;
  if (verdict.place) text += verdict.place;
  if (verdict.reachedPackageRule && !verdict.allowed) {
    text += ", in no carrier-bundles directory, and no package (/tmp... .tcbk)";
  }
  return text + "\n";
}

void Print(const std::string& text) { std::fwrite(text.data(), 1, text.size(), stdout); }

ExitCode RunExplain(const GlobalOptions& options, Words words) {
  const std::string path = words.takeAll(1, "PATH")[0];
  if (path.size() > kLongestPath) throw UsageFailure("the path is longer than a request carries");
  const char* home = platform::MobileUser().directory();
  const platform::PathRules rules(home ? home : "");
  const auto modeOf = [](const char* at) {
    return platform::Shared<platform::DirectoryEntries>().mode(at);
  };
  const PathVerdict link = rules.judgeLink(path.c_str(), modeOf);
  const PathVerdict place = rules.judge(path.c_str(), modeOf);
  if (options.json) {
    Print("{\"path\":" + JsonString(path) + ",\"home\":" + (home ? JsonString(home) : "null") +
          ",\"link\":" + Json(link) + ",\"place\":" + Json(place) + "}\n");
  } else {
    Print("link there:             " + Sentence(link));
    Print("remove or place there:  " + Sentence(place));
  }
  return ExitCode::kDone;
}

ExitCode RunPath(const GlobalOptions& options, Words words) {
  const std::optional<std::string> action = words.takeFirst();
  if (!action) throw UsageFailure("expected explain; see halvecctl path --help");
  if (*action == "explain") return RunExplain(options, std::move(words));
  throw UsageFailure("unknown action '" + *action + "'; see halvecctl path --help");
}

}  // namespace

constinit const Command kPathCommand{
    "path", "explain PATH", "explain whether the helper allows a path",
    "Prints two verdicts with the rule that decided: whether a carrier-bundle link may be made at\n"
    "PATH, and whether an entry may be removed or an item placed there. Needs no helper: it runs\n"
    "the helper's own rules for the mobile user's home on this system. The path is judged as "
    "text,\n"
    "and by what stands there as far as this user can see it.\n",
    RunPath};

}  // namespace halvecctl
