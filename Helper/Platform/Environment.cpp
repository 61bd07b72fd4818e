// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Environment.h"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <string_view>

namespace platform {

void ForgetEnvironment() {
  constexpr std::array<std::string_view, 4> kHandedOver{
      "LISTEN_PID=", "LISTEN_FDS=", "LISTEN_FDNAMES=", "NOTIFY_SOCKET="};
  if (!environ) return;
  char** kept = environ;
  for (char** each = environ; *each; ++each) {
    const std::string_view entry = *each;
    if (std::any_of(kHandedOver.begin(), kHandedOver.end(),
                    [&](std::string_view name) { return entry.starts_with(name); })) {
      *kept++ = *each;
    }
  }
  *kept = nullptr;
}

}  // namespace platform
