// SPDX-License-Identifier: Apache-2.0
//
// Work on files beside programs that do the same. One thread.
#pragma once

#include <functional>
#include <string>
#include <vector>

namespace bench {

/// Runs a program to its end; a failure ends the benchmark.
void Run(std::vector<std::string> words);

/// The milliseconds that each of `contestants` takes in each of `turns`, after `prepare` and with
/// everything written out. Who goes first changes, so that none always finds another's leavings.
[[nodiscard]] std::vector<std::vector<double>> TakeTurns(
    int turns, const std::function<void()>& prepare,
    const std::vector<std::function<void()>>& contestants);

}  // namespace bench
