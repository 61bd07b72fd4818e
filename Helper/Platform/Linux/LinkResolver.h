// SPDX-License-Identifier: Apache-2.0
//
// Name resolution that never uses cellular: the system's own resolver asks over any network, and a
// local one passes the question on to any. Any thread; no state.
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "Helper/Platform/Clock.h"

namespace platform {

struct ResolverProfile {
  std::string hostsFile = "/etc/hosts";
  /// The first file that names a server beyond the handset which can be reached without cellular
  /// counts.
  std::vector<std::string> serverFiles{"/etc/resolv.conf", "/run/systemd/resolve/resolv.conf",
                                       "/run/NetworkManager/no-stub-resolv.conf"};
  std::uint16_t port = 53;
  /// How long one server may take; each is asked twice.
  std::chrono::milliseconds patience{2500};
};

/// The addresses of `host` as numeric text: itself when it is an address, those in the hosts file
/// (hosts(5)), else what the name servers (resolv.conf(5), three at most) tell over the interface
/// of EligibleInterface(), by UDP and for long replies by TCP. Empty when there are none, or no
/// server answered in time or before `deadline`; no value when no server can be reached without
/// cellular.
[[nodiscard]] std::optional<std::vector<std::string>> ResolveWithoutCellular(
    const std::string& host, const ResolverProfile& profile, TimePoint deadline);

/// Whether `address`, numeric text, can be reached without cellular.
[[nodiscard]] bool IsReachableWithoutCellular(const std::string& address);

}  // namespace platform
