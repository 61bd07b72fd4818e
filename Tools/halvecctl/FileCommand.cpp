// SPDX-License-Identifier: Apache-2.0
//
// halvecctl file and crash-logs: what the helper copies to where the telephony daemon cannot write.
#include <cstdio>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Shared/Interface/Requests.h"
#include "Tools/halvecctl/Command.h"

namespace halvecctl {
namespace {

ExitCode RunFile(const GlobalOptions& options, Words words) {
  const std::optional<std::string> action = words.takeFirst();
  if (!action) throw UsageFailure("expected copy; see halvecctl file --help");
  if (*action != "copy") {
    throw UsageFailure("unknown action '" + *action + "'; see halvecctl file --help");
  }
  const std::vector<std::string> texts =
      words.takeAll(3, "SOURCE-DIRECTORY DESTINATION-DIRECTORY FILE-NAME");
  halvec::HelperClient client = Connect(options);
  return FinishWithFlag(client.call<requests::CopyFile>(texts[0], texts[1], texts[2]), options);
}

ExitCode RunCrashLogs(const GlobalOptions& options, Words words) {
  const std::optional<std::string> action = words.takeFirst();
  if (!action) throw UsageFailure("expected copy; see halvecctl crash-logs --help");
  if (*action != "copy") {
    throw UsageFailure("unknown action '" + *action + "'; see halvecctl crash-logs --help");
  }
  const std::vector<std::string> texts = words.takeAll(1, "SOURCE");
  halvec::HelperClient client = Connect(options);
  return FinishWithFlag(client.call<requests::CopyCrashLogs>(texts[0]), options);
}

}  // namespace

ExitCode FinishWithFlag(const halvec::Result<bool>& success, const GlobalOptions& options) {
  if (!success) throw RequestFailure(success.error());
  if (options.json) std::printf("{\"success\":%s}\n", *success ? "true" : "false");
  if (!*success) {
    throw Failure(ExitCode::kFailed, "the helper could not do it; the system log says why");
  }
  return ExitCode::kDone;
}

constinit const Command kFileCommand{
    "file", "copy SOURCE-DIRECTORY DESTINATION-DIRECTORY FILE-NAME",
    "have one file copied for the mobile user",
    "copy     copies SOURCE-DIRECTORY/FILE-NAME to DESTINATION-DIRECTORY, which is made where it\n"
    "         is missing, and gives the copy to the mobile user. The source becomes the helper's\n"
    "         own. Where the file may go, halvecctl path explain tells.\n",
    RunFile};

constinit const Command kCrashLogsCommand{
    "crash-logs", "copy SOURCE", "have crash logs copied to the mobile user's own",
    "copy     copies the directory SOURCE into Library/Logs/CrashReporter of the mobile user's\n"
    "         home, merged with a directory of its name there. SOURCE itself becomes the\n"
    "         helper's own.\n",
    RunCrashLogs};

}  // namespace halvecctl
