// SPDX-License-Identifier: Apache-2.0
//
// Runs the built halvecctl and keeps what it printed. The calling thread waits for its end.
#pragma once

#include <string>
#include <vector>

namespace program {

struct Outcome {
  int exitCode = -1;  // -1 when it ended otherwise
  std::string output;
  std::string errors;
};

/// Runs it with `arguments` and with `input` on standard input.
[[nodiscard]] Outcome RunProgram(const std::vector<std::string>& arguments,
                                 const std::string& input = "");

/// Runs it with standard output that cannot be written.
[[nodiscard]] Outcome RunOnFullOutput(const std::vector<std::string>& arguments);

}  // namespace program
