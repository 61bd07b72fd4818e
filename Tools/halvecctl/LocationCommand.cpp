// SPDX-License-Identifier: Apache-2.0
//
// halvecctl location: where a coordinate is, where the handset is set up for, and what the offline
// geocoder answers from.
#include <cstdio>
#include <optional>
#include <string>
#include <utility>
#include <variant>

#include "Helper/Platform/MapAttributions.h"
#include "Tools/halvecctl/Command.h"
#include "Tools/halvecctl/Json.h"
#include "Tools/halvecctl/LocationRequests.h"

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
  if (!action) {
    throw UsageFailure("expected resolve, country or about; see halvecctl location --help");
  }
  if (*action == "resolve") return RunResolve(options, std::move(words));
  if (*action == "country") return RunCountry(options, std::move(words));
  if (*action == "about") return RunAbout(options, std::move(words));
  throw UsageFailure("unknown action '" + *action + "'; see halvecctl location --help");
}

}  // namespace

constinit const Command kLocationCommand{
    "location", "resolve LATITUDE LONGITUDE [--wait] | country | about [--atlas PATH]",
    "have a coordinate turned into country, state and city",
    "resolve  has the civic info of a place, in degrees, delivered to the telephony daemon. With\n"
    "         --wait it stands in for that daemon, where there is none, and prints what comes.\n"
    "country  prints the country that the handset is set up for; 6 is the exit code without one\n"
    "about    prints the date, sources and licences of the atlas at PATH, or of the installed\n"
    "         one. Needs no helper.\n",
    RunLocation};

}  // namespace halvecctl
