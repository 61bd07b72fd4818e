// SPDX-License-Identifier: Apache-2.0
//
// Runs halvecctl against the helper's side of the wire for one request. The calling thread waits
// for the program's end.
#pragma once

#include <string>
#include <vector>

#include "Tests/Client/FakeHelper.h"
#include "Tests/Halvecctl/Program.h"

namespace program {

/// What the program printed, and the request that it made.
struct Exchange {
  Outcome outcome;
  fake::Bytes request;
};

/// Runs the program with `arguments` against a helper that answers its one request with `reply`.
[[nodiscard]] Exchange RunAnswered(std::vector<std::string> arguments, const fake::Bytes& reply,
                                   const std::string& input = "");

}  // namespace program
