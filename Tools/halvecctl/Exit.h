// SPDX-License-Identifier: Apache-2.0
//
// How the program ends. Scripts rely on these numbers; Documentation/client.md lists them.
#pragma once

#include <stdexcept>
#include <string>

#include "Client/Result.h"

namespace halvecctl {

enum class ExitCode {
  kDone = 0,
  kFailed = 1,        // the helper answered with a return code other than 0, or with success false
  kUsage = 2,         // the command line is wrong, or what it gives cannot be sent
  kNotConnected = 3,  // nobody serves the service socket, or it does not admit this user
  kRefused = 4,       // the helper answered 35: this program does not hold the entitlement
  kLost = 5,          // no answer in time, the helper went away, or its answer was ill-formed
  kAbsent = 6,        // the preference has no value, or the country is not known
  kSystem = 7         // this program itself failed: memory, a system call, writing its output
};

/// Ends a command. Caught in main() alone, which prints the text after the program's name.
class Failure : public std::runtime_error {
 public:
  Failure(ExitCode code, const std::string& text) : std::runtime_error(text), code_(code) {}
  [[nodiscard]] ExitCode code() const noexcept { return code_; }

 private:
  ExitCode code_;
};

/// A command line that cannot be carried out.
[[nodiscard]] Failure UsageFailure(const std::string& text);

/// The failure that stands for an error of a request, or of a connect.
[[nodiscard]] Failure RequestFailure(const halvec::Error& error);
[[nodiscard]] Failure ConnectFailure(const halvec::Error& error, const std::string& path);

}  // namespace halvecctl
