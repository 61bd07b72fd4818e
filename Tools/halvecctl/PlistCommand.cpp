// SPDX-License-Identifier: Apache-2.0
//
// halvecctl plist: shows a property-list file that only the helper may read.
#include <cstdio>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/PropertyList.h"
#include "Helper/Shared/Interface/Requests.h"
#include "Tools/halvecctl/Command.h"
#include "Tools/halvecctl/Json.h"

namespace halvecctl {
namespace {

void Print(std::string_view text) { std::fwrite(text.data(), 1, text.size(), stdout); }

ExitCode RunShow(const GlobalOptions& options, Words words) {
  const std::vector<std::string> texts = words.takeAll(1, "PATH");
  halvec::HelperClient client = Connect(options);
  const halvec::Result<halvec::Data> content =
      client.call<requests::CopyPropertyListFile>(texts[0]);
  if (!content) throw RequestFailure(content.error());
  std::string reason;
  const auto list = platform::ParsePropertyList((*content).bytes(), &reason);
  if (!list) throw Failure(ExitCode::kLost, "the helper's answer is no property list: " + reason);
  Print(options.json ? JsonPropertyList(*list) + "\n" : std::string((*content).text()));
  return ExitCode::kDone;
}

ExitCode RunPlist(const GlobalOptions& options, Words words) {
  const std::optional<std::string> action = words.takeFirst();
  if (!action) throw UsageFailure("expected show; see halvecctl plist --help");
  if (*action == "show") return RunShow(options, std::move(words));
  throw UsageFailure("unknown action '" + *action + "'; see halvecctl plist --help");
}

}  // namespace

constinit const Command kPlistCommand{
    "plist", "show PATH", "show a property-list file as the helper reads it",
    "Has the helper read the file, XML or binary, and prints it as an XML property list; with "
    "--json\n"
    "as JSON, with data as base64 text and a date as ISO 8601 text. PATH is ASCII, and absolute: "
    "it\n"
    "is the helper that opens it. A file that is missing or holds no dictionary is answered with\n"
    "code 9.\n",
    RunPlist};

}  // namespace halvecctl
