// SPDX-License-Identifier: Apache-2.0
//
// halvecctl: the mobile helper's requests from the command line. Single-threaded. Finds the
// command, runs it, prints what went wrong in one sentence.
#include <array>
#include <cstdio>
#include <exception>
#include <string>

#include "Tools/halvecctl/Command.h"

namespace halvecctl {
namespace {

constexpr std::string_view kExitCodes =
    "Exit codes:\n"
    "  0  done\n"
    "  1  the helper answered with a return code other than 0, or with success false\n"
    "  2  the command line is wrong, or what it gives cannot be sent\n"
    "  3  not connected: the service is not running or does not admit this user\n"
    "  4  refused: this program does not hold the entitlement\n"
    "  5  no answer in time, the helper went away, or its answer was ill-formed\n"
    "  6  there is none: no value, no token, or the country is not known\n"
    "  7  this program itself failed\n";

constexpr std::string_view kGlobalOptions =
    "Options for every command:\n"
    "  --json          print JSON\n"
    "  --timeout S     limit of the connect and of the request in seconds, 0 for none\n"
    "  --service PATH  the service socket\n"
    "  --help          this text, or that of the command\n"
    "  --version       the version\n"
    "  --              no options behind this word\n";

void Print(std::string_view text) { std::fwrite(text.data(), 1, text.size(), stdout); }

void PrintHelp() {
  Print("Usage: halvecctl [OPTION...] COMMAND [ARGUMENT...]\n\nCommands:\n");
  for (const Command* command : Commands()) {
    std::string line = "  " + std::string(command->name);
    line.resize(14, ' ');
    Print(line + std::string(command->summary) + "\n");
  }
  Print("\n");
  Print(kGlobalOptions);
  Print("\n");
  Print(kExitCodes);
}

void PrintHelp(const Command& command) {
  Print("Usage: halvecctl " + std::string(command.name) + (command.arguments.empty() ? "" : " ") +
        std::string(command.arguments) + "\n\n");
  Print(command.help);
  Print("\n");
  Print(kGlobalOptions);
}

ExitCode Run(int count, char** arguments) {
  GlobalOptions options;
  Words words = ParseCommandLine(count, arguments, options);
  if (options.version) {
    Print("halvecctl " HALVEC_VERSION "\n");
    return ExitCode::kDone;
  }
  const std::optional<std::string> name = words.takeFirst();
  if (!name && options.help) {
    PrintHelp();
    return ExitCode::kDone;
  }
  if (!name) throw UsageFailure("no command; see halvecctl --help");
  for (const Command* command : Commands()) {
    if (command->name != *name) continue;
    if (!options.help) return command->run(options, std::move(words));
    PrintHelp(*command);
    return ExitCode::kDone;
  }
  throw UsageFailure("unknown command '" + *name + "'; see halvecctl --help");
}

/// Output that could not be written is a failure, whatever the command achieved.
void FlushOutput() {
  if (std::fflush(stdout) != 0 || std::ferror(stdout) != 0) {
    throw Failure(ExitCode::kSystem, "cannot write to standard output");
  }
}

}  // namespace

std::span<const Command* const> Commands() {
  static constexpr std::array kCommands{&kListCommand,      &kPreferenceCommand, &kBundleCommand,
                                        &kPathCommand,      &kPlistCommand,      &kFileCommand,
                                        &kCrashLogsCommand, &kLasdCommand,       &kLocationCommand,
                                        &kVoicemailCommand, &kHeartbeatCommand,  &kRadioLogCommand,
                                        &kCallCommand,      &kStatusCommand,     &kMonitorCommand};
  return kCommands;
}

ExitCode FinishWithCode(const halvec::Error& error, const GlobalOptions& options) {
  if (error.failed()) throw RequestFailure(error);
  if (options.json) Print("{\"code\":0,\"codeName\":\"KERN_SUCCESS\"}\n");
  return ExitCode::kDone;
}

halvec::HelperClient Connect(const GlobalOptions& options) {
  halvec::Result<halvec::HelperClient> client = halvec::HelperClient::Connect(options.client);
  if (!client) throw ConnectFailure(client.error(), options.client.servicePath);
  return std::move(*client);
}

}  // namespace halvecctl

int main(int count, char** arguments) {
  using halvecctl::ExitCode;
  try {
    const ExitCode code = halvecctl::Run(count, arguments);
    halvecctl::FlushOutput();
    return static_cast<int>(code);
  } catch (const halvecctl::Failure& failure) {
    std::fflush(stdout);
    std::fprintf(stderr, "halvecctl: %s\n", failure.what());
    return static_cast<int>(failure.code());
  } catch (const std::exception& exception) {
    std::fprintf(stderr, "halvecctl: %s\n", exception.what());
    return static_cast<int>(ExitCode::kSystem);
  }
}
