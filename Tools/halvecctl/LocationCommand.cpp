// SPDX-License-Identifier: Apache-2.0
//
// halvecctl location: what the offline geocoder answers from. Needs no helper.
#include <cstdio>
#include <optional>
#include <string>
#include <utility>
#include <variant>

#include "Helper/Platform/MapAttributions.h"
#include "Tools/halvecctl/Command.h"
#include "Tools/halvecctl/Json.h"

namespace halvecctl {
namespace {

ExitCode RunAbout(const GlobalOptions& options, Words words) {
  const std::string path = words.takeOptionWithValue("--atlas").value_or(HALVEC_ATLAS_FILE);
  (void)words.takeAll(0, "");
  const auto attributions = platform::ReadMapAttributions(path);
  if (const auto* failure = std::get_if<platform::GeocodeError>(&attributions)) {
    throw Failure(ExitCode::kSystem, failure->description);
  }
  const std::string& text = std::get<std::string>(attributions);
  const std::string output = options.json ? "{\"atlas\":" + JsonString(path) +
                                                ",\"attributions\":" + JsonString(text) + "}\n"
                                          : text;
  std::fwrite(output.data(), 1, output.size(), stdout);
  return ExitCode::kDone;
}

ExitCode RunLocation(const GlobalOptions& options, Words words) {
  const std::optional<std::string> action = words.takeFirst();
  if (!action) throw UsageFailure("expected about; see halvecctl location --help");
  if (*action == "about") return RunAbout(options, std::move(words));
  throw UsageFailure("unknown action '" + *action + "'; see halvecctl location --help");
}

}  // namespace

constinit const Command kLocationCommand{"location", "about [--atlas PATH]",
                                         "tell whose data the offline geocoder answers from",
                                         "Prints the date, sources and licences of the atlas at "
                                         "PATH, or of the installed one. Needs no\n"
                                         "helper.\n",
                                         RunLocation};

}  // namespace halvecctl
