// SPDX-License-Identifier: Apache-2.0
//
// halvecctl heartbeat and radio-log: what the helper switches on and off.
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "Helper/Shared/Interface/Requests.h"
#include "Tools/halvecctl/Command.h"

namespace halvecctl {
namespace {

/// Takes the one word, which must be `on` or `off` as they are called here; whether it is `on`.
bool TakeSwitch(Words words, std::string_view command, std::string_view on, std::string_view off) {
  const std::optional<std::string> word = words.takeFirst();
  const std::string help = "; see halvecctl " + std::string(command) + " --help";
  if (!word) throw UsageFailure("expected " + std::string(on) + " or " + std::string(off) + help);
  (void)words.takeAll(0, "");
  if (*word != on && *word != off) throw UsageFailure("unknown action '" + *word + "'" + help);
  return *word == on;
}

ExitCode RunHeartbeat(const GlobalOptions& options, Words words) {
  const bool on = TakeSwitch(std::move(words), "heartbeat", "start", "stop");
  halvec::HelperClient client = Connect(options);
  return FinishWithCode(client.call<requests::TriggerHeartbeat>(on ? 1 : 0).error(), options);
}

ExitCode RunRadioLog(const GlobalOptions& options, Words words) {
  const bool on = TakeSwitch(std::move(words), "radio-log", "on", "off");
  halvec::HelperClient client = Connect(options);
  return FinishWithCode(client.call<requests::SetRadioManagerLogging>(on ? 1 : 0).error(), options);
}

}  // namespace

constinit const Command kHeartbeatCommand{
    "heartbeat", "start | stop", "echo requests over the cellular data path",
    "start    has the helper send an echo request every two seconds, also after halvecctl has "
    "gone.\n"
    "         The helper stays for as long. A second start keeps it from ever leaving by itself.\n"
    "stop     ends that.\n",
    RunHeartbeat};

constinit const Command kRadioLogCommand{
    "radio-log", "on | off", "the radio manager's log file",
    "on       tells the radio manager to log to its file.\n"
    "off      tells it to stop.\n"
    "Whether a radio manager runs, and what it does, is not told.\n",
    RunRadioLog};

}  // namespace halvecctl
