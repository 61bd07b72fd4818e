// SPDX-License-Identifier: Apache-2.0
//
// Starts a message bus of one's own, open to everybody, for the length of a measurement.
#pragma once

#include <optional>
#include <string>

#include "Benchmarks/Support/Measure.h"
#include "Benchmarks/Support/WireClient.h"

namespace bench {

struct BusDaemon {
  Child process;
  std::string address;  // as D-Bus clients write it: transport:key=value
};

/// A listening stream socket at `path`, non-blocking: brokers accept until nobody is left.
[[nodiscard]] FileDescriptor ListenAt(const std::string& path);

/// dbus-daemon, and dbus-broker with this process as its controller. None, with a `reason`, where
/// the program is not installed or does not come up.
[[nodiscard]] std::optional<BusDaemon> StartDaemon(int processor, std::string& reason);
[[nodiscard]] std::optional<BusDaemon> StartBroker(int processor, std::string& reason);

}  // namespace bench
