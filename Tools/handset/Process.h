// SPDX-License-Identifier: Apache-2.0
//
// Starting a program inside the handset: the helper, the command, and `handset as`. One thread, no
// lock.
#pragma once

#include <sys/types.h>

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "Tools/handset/UserDatabase.h"

namespace handset {

/// NAME=VALUE texts.
using Environment = std::vector<std::string>;

/// The caller's own environment.
[[nodiscard]] Environment InheritedEnvironment();

/// Sets `name` in `environment`, replacing what it had.
void SetVariable(Environment& environment, const std::string& name, const std::string& value);

/// `base` with HOME, USER, LOGNAME and SHELL of `user`.
[[nodiscard]] Environment EnvironmentOf(const User& user, Environment base);

/// Lets the executables that were installed for entitlement be called by their names.
void AddInstalledToPath(Environment& environment);

/// What a service of the system is given: a PATH, and of the caller's environment only the
/// settings of the sanitizer runtimes, which no production build reads.
[[nodiscard]] Environment ServiceEnvironment();

/// Forks; the child has no blocked signals, runs `prepare` (which may throw Failure) and becomes
/// the program `arguments[0]` with the environment that `prepare` answers. Returns the child's
/// process id; throws Failure where there can be none. The child reports its own failures on
/// standard error and ends with kStatusNotFound or kStatusNotExecutable.
[[nodiscard]] pid_t StartProgram(const std::vector<std::string>& arguments,
                                 const std::function<Environment()>& prepare);

/// Runs a program of the system to its end, in the environment of a service. Throws Failure, with
/// what the program said, unless it ends with status 0.
void RunTool(const std::vector<std::string>& arguments);

/// Becomes the program, which is searched in the PATH of `environment` unless its name has a
/// slash. Throws Failure, with kStatusNotFound or kStatusNotExecutable, where it cannot.
[[noreturn]] void BecomeProgram(const std::vector<std::string>& arguments,
                                const Environment& environment);

/// Restores the default action of every signal that the tool handles and unblocks all.
void RestoreSignals();

}  // namespace handset
