// SPDX-License-Identifier: Apache-2.0
//
// halvecctl bundle: the links by which the mobile user's library points at carrier bundles, and the
// bundles themselves.
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Shared/Interface/Requests.h"
#include "Tools/halvecctl/Command.h"

namespace halvecctl {
namespace {

ExitCode RunLink(const GlobalOptions& options, Words words) {
  const bool unchecked = words.takeOption("--unchecked");
  const std::optional<std::string> domain = words.takeOptionWithValue("--domain");
  if (unchecked && domain) throw UsageFailure("--unchecked and --domain exclude one another");
  const std::vector<std::string> texts = words.takeAll(2, "TARGET LINK-PATH");
  halvec::HelperClient client = Connect(options);
  if (unchecked) {
    return FinishWithCode(client.call<requests::CreateSymlink>(texts[0], texts[1]).error(),
                          options);
  }
  return FinishWithCode(
      client
          .call<requests::SetCarrierBundleLink>(texts[0], texts[1], domain.value_or(std::string()))
          .error(),
      options);
}

ExitCode RunUnlink(const GlobalOptions& options, Words words) {
  const std::optional<std::string> domain = words.takeOptionWithValue("--domain");
  const std::vector<std::string> texts = words.takeAll(1, "PATH");
  halvec::HelperClient client = Connect(options);
  return FinishWithCode(
      client.call<requests::RemoveCarrierBundleLink>(texts[0], domain.value_or(std::string()))
          .error(),
      options);
}

ExitCode RunMove(const GlobalOptions& options, Words words) {
  const std::vector<std::string> texts = words.takeAll(3, "SOURCE DESTINATION-DIRECTORY NAME");
  halvec::HelperClient client = Connect(options);
  return FinishWithFlag(client.call<requests::MoveCarrierBundles>(texts[0], texts[1], texts[2]),
                        options);
}

ExitCode RunExtract(const GlobalOptions& options, Words words) {
  const std::vector<std::string> texts = words.takeAll(2, "ARCHIVE DESTINATION");
  halvec::HelperClient client = Connect(options);
  return FinishWithFlag(client.call<requests::ExtractArchive>(texts[0], texts[1]), options);
}

ExitCode RunBundle(const GlobalOptions& options, Words words) {
  const std::optional<std::string> action = words.takeFirst();
  if (!action)
    throw UsageFailure("expected link, unlink, move or extract; see halvecctl bundle --help");
  if (*action == "link") return RunLink(options, std::move(words));
  if (*action == "unlink") return RunUnlink(options, std::move(words));
  if (*action == "move") return RunMove(options, std::move(words));
  if (*action == "extract") return RunExtract(options, std::move(words));
  throw UsageFailure("unknown action '" + *action + "'; see halvecctl bundle --help");
}

}  // namespace

constinit const Command kBundleCommand{
    "bundle",
    "link TARGET LINK-PATH [OPTION...] | unlink PATH [--domain DOMAIN] | "
    "move SOURCE DESTINATION-DIRECTORY NAME | extract ARCHIVE DESTINATION",
    "point a carrier-bundle link at a target, remove it, move or unpack a bundle",
    "link     replaces what stands at LINK-PATH by a symbolic link to TARGET. LINK-PATH must be "
    "on\n"
    "         the helper's list; halvecctl path explain tells.\n"
    "           --domain DOMAIN  then forget the cached copy of this preference domain\n"
    "           --unchecked      any LINK-PATH, and nothing in the log\n"
    "unlink   removes a file, a link or an empty directory at an allowed path.\n"
    "           --domain DOMAIN  before, forget the cached copy of this preference domain; this\n"
    "                            happens also when the path is then refused\n"
    "move     moves the bundle SOURCE to DESTINATION-DIRECTORY/NAME, where nothing may stand, and\n"
    "         gives all of it to the helper's own user. The directory is made where it is "
    "missing,\n"
    "         also when the place is then refused.\n"
    "extract  unpacks the zip file ARCHIVE into the folder DESTINATION, which is made where it is\n"
    "         missing. An item that cannot be extracted is left out, which is no failure.\n"
    "A path of a link that is not allowed is answered with code 8.\n",
    RunBundle};

}  // namespace halvecctl
