// SPDX-License-Identifier: Apache-2.0
//
// Stands in for the telephony daemon while there is none: publishes its connection port and takes
// one civic info. One thread.
#pragma once

#include <array>
#include <chrono>
#include <optional>
#include <string>

#include "Helper/Platform/PortMessage.h"
#include "Tools/halvecctl/PublishedPort.h"

namespace halvecctl {

/// Country, state, city, postal code; none where the helper sent null.
using CivicInfo = std::array<std::optional<std::string>, 4>;

class CivicInfoListener {
 public:
  /// Publishes the port beside the service socket at `servicePath`. Throws Failure when another
  /// program holds it, or this one may not.
  explicit CivicInfoListener(const std::string& servicePath);

  /// Waits for the next civic info and answers it with success. Throws Failure when none has come
  /// by `deadline`, when `helper`, a descriptor that shows when the helper goes away, hangs up, or
  /// when what comes is none.
  [[nodiscard]] CivicInfo take(int helper, std::chrono::steady_clock::time_point deadline);

 private:
  PublishedPort port_;
  platform::ReceiveBuffer buffer_;
};

}  // namespace halvecctl
