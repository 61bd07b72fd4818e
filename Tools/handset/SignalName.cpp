// SPDX-License-Identifier: Apache-2.0
//
// The C library knows each signal's short name; it only has no look-up the other way round.
#include "Tools/handset/SignalName.h"

#include <signal.h>

#include <cstring>

namespace handset {

std::optional<int> SignalNumber(const std::string& text) {
  const std::string name = text.starts_with("SIG") ? text.substr(3) : text;
  for (int signal = 1; signal < NSIG; ++signal) {
    const char* known = sigabbrev_np(signal);
    if (name == std::to_string(signal) || (known != nullptr && name == known)) return signal;
  }
  return std::nullopt;
}

}  // namespace handset
