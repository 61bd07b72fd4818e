// SPDX-License-Identifier: Apache-2.0
//
// Signals as people write them: "9", "KILL", "SIGKILL". Pure function, any thread.
#pragma once

#include <optional>
#include <string>

namespace handset {

/// The number of the signal called `text` (signal(7)); nothing where there is none.
[[nodiscard]] std::optional<int> SignalNumber(const std::string& text);

}  // namespace handset
