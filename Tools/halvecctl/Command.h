// SPDX-License-Identifier: Apache-2.0
//
// The commands: one row each, one file each.
#pragma once

#include <span>
#include <string_view>

#include "Client/HelperClient.h"
#include "Tools/halvecctl/CommandLine.h"
#include "Tools/halvecctl/Exit.h"

namespace halvecctl {

/// A command of the program. `run` prints to standard output, and throws Failure for what main()
/// shall print to standard error.
struct Command {
  std::string_view name;
  std::string_view arguments;
  std::string_view summary;
  std::string_view help;
  ExitCode (*run)(const GlobalOptions& options, Words words);
};

extern const Command kListCommand;
extern const Command kPreferenceCommand;
extern const Command kBundleCommand;
extern const Command kPathCommand;
extern const Command kPlistCommand;
extern const Command kFileCommand;
extern const Command kCrashLogsCommand;
extern const Command kLasdCommand;
extern const Command kLocationCommand;
extern const Command kVoicemailCommand;
extern const Command kHeartbeatCommand;
extern const Command kRadioLogCommand;
extern const Command kCallCommand;
extern const Command kStatusCommand;
extern const Command kMonitorCommand;

/// Every command, in the order of --help.
[[nodiscard]] std::span<const Command* const> Commands();

/// Ends a command whose request answers with a return code alone: throws Failure for one that is
/// not 0.
[[nodiscard]] ExitCode FinishWithCode(const halvec::Error& error, const GlobalOptions& options);

/// Ends a command whose request answers with a success flag: throws Failure where it is false.
[[nodiscard]] ExitCode FinishWithFlag(const halvec::Result<bool>& success,
                                      const GlobalOptions& options);

/// A connection as the options ask for it. Throws Failure without one.
[[nodiscard]] halvec::HelperClient Connect(const GlobalOptions& options);

}  // namespace halvecctl
