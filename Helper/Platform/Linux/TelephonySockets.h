// SPDX-License-Identifier: Apache-2.0
//
// The telephony framework over named ports: a connection is a socket pair, whose other end goes to
// the daemon's port. Main thread.
#pragma once

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/Clock.h"
#include "Helper/Platform/TelephonyConnection.h"

namespace platform {

class TelephonySockets final : public TelephonyFramework {
 public:
  /// `portsDirectory` holds the sockets of named ports; a call waits for `answerLimit` at most.
  TelephonySockets(std::string portsDirectory, Duration answerLimit)
      : portsDirectory_(std::move(portsDirectory)), answerLimit_(answerLimit) {}

  void addIdentifierException(const String& identifier) override;
  [[nodiscard]] std::unique_ptr<TelephonyConnection> createConnection(
      TelephonyNotificationCallback callback, void* context) override;

 private:
  const std::string portsDirectory_;
  const Duration answerLimit_;
  std::vector<std::string> identifiers_;
};

}  // namespace platform
