// SPDX-License-Identifier: Apache-2.0
//
// halvecctl voicemail: tokens, records and the subscription.
#include <cstddef>
#include <cstdio>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Shared/Interface/Requests.h"
#include "Tools/halvecctl/Command.h"
#include "Tools/halvecctl/Input.h"
#include "Tools/halvecctl/Json.h"

namespace halvecctl {
namespace {

/// The word itself, or for "-" the first line of standard input: what stands on a command line can
/// be seen by everybody on the system.
std::string TokenFrom(const std::string& word) {
  if (word != "-") return word;
  const std::vector<std::byte> input = ReadInput(word);
  const std::string text(reinterpret_cast<const char*>(input.data()), input.size());
  return text.substr(0, text.find('\n'));
}

ExitCode RunSet(const GlobalOptions& options, const std::optional<std::string>& key, Words words) {
  const std::string token = TokenFrom(words.takeAll(1, "TOKEN").front());
  halvec::HelperClient client = Connect(options);
  const halvec::Error error =
      key ? client.call<requests::SetVoicemailTokenForKey>(*key, token).error()
          : client.call<requests::SetVoicemailToken>(token).error();
  return FinishWithCode(error, options);
}

ExitCode RunGet(const GlobalOptions& options, const std::optional<std::string>& key, Words words) {
  (void)words.takeAll(0, "");
  halvec::HelperClient client = Connect(options);
  const halvec::Result<std::string> token =
      key ? client.call<requests::CopyVoicemailTokenForKey>(*key)
          : client.call<requests::CopyVoicemailToken>();
  if (!token) throw RequestFailure(token.error());
  const bool absent = (*token).empty();
  if (options.json) {
    std::printf("%s\n", absent ? "null" : JsonString(*token).c_str());
  } else if (!absent) {
    std::printf("%s\n", Shown(*token).c_str());
  }
  return absent ? ExitCode::kAbsent : ExitCode::kDone;
}

ExitCode RunClear(const GlobalOptions& options, const std::optional<std::string>& key,
                  Words words) {
  (void)words.takeAll(0, "");
  halvec::HelperClient client = Connect(options);
  // No request removes the token of a key; an empty one reads the same.
  const halvec::Error error =
      key ? client.call<requests::SetVoicemailTokenForKey>(*key, std::string()).error()
          : client.call<requests::ClearVoicemailToken>().error();
  return FinishWithCode(error, options);
}

ExitCode RunToken(const GlobalOptions& options, Words words) {
  const std::optional<std::string> action = words.takeFirst();
  if (!action) {
    throw UsageFailure("expected get, set or clear; see halvecctl voicemail --help");
  }
  const std::optional<std::string> key = words.takeOptionWithValue("--key");
  if (*action == "get") return RunGet(options, key, std::move(words));
  if (*action == "set") return RunSet(options, key, std::move(words));
  if (*action == "clear") return RunClear(options, key, std::move(words));
  throw UsageFailure("unknown action 'token " + *action + "'; see halvecctl voicemail --help");
}

ExitCode RunSubscribed(const GlobalOptions& options, Words words) {
  (void)words.takeAll(0, "");
  halvec::HelperClient client = Connect(options);
  const halvec::Result<bool> subscribed = client.call<requests::IsVoicemailSubscribed>();
  if (!subscribed) throw RequestFailure(subscribed.error());
  const char* word = *subscribed ? "true" : "false";
  if (options.json) {
    std::printf("{\"subscribed\":%s}\n", word);
  } else {
    std::printf("%s\n", word);
  }
  return ExitCode::kDone;
}

ExitCode RunReset(const GlobalOptions& options, Words words) {
  (void)words.takeAll(0, "");
  halvec::HelperClient client = Connect(options);
  return FinishWithCode(client.call<requests::ResetVoicemailRecords>().error(), options);
}

ExitCode RunVoicemail(const GlobalOptions& options, Words words) {
  const std::optional<std::string> action = words.takeFirst();
  if (!action) {
    throw UsageFailure("expected token, subscribed or reset; see halvecctl voicemail --help");
  }
  if (*action == "token") return RunToken(options, std::move(words));
  if (*action == "subscribed") return RunSubscribed(options, std::move(words));
  if (*action == "reset") return RunReset(options, std::move(words));
  throw UsageFailure("unknown action '" + *action + "'; see halvecctl voicemail --help");
}

}  // namespace

constinit const Command kVoicemailCommand{
    "voicemail", "token get|set TOKEN|clear [--key KEY] | subscribed | reset",
    "voicemail tokens, records and subscription",
    "token get    prints the current token, or with --key that of KEY. Without one it prints\n"
    "             nothing (null with --json) and exits with 6.\n"
    "token set    stores it durably; - as TOKEN reads a line of standard input.\n"
    "token clear  removes the current token, or makes that of KEY empty.\n"
    "subscribed   prints true or false.\n"
    "reset        removes the current token and every voicemail record; tokens of keys stay.\n",
    RunVoicemail};

}  // namespace halvecctl
