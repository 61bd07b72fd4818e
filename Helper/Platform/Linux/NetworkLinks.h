// SPDX-License-Identifier: Apache-2.0
//
// Which network interface traffic that must not use cellular goes through. Any thread; no state:
// every call sees the interfaces and routes of that moment.
#pragma once

#include <sys/socket.h>

#include <optional>
#include <string>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {

/// Whether `name` is that of a cellular data interface: called like one, or of the device type
/// "wwan" in the kernel's own words (/sys/class/net/NAME/uevent).
[[nodiscard]] bool IsCellularInterface(const std::string& name);

/// The index of the interface for traffic to `destination` that must not use cellular: of the
/// eligible interfaces the one that the kernel's own rules prefer, longest prefix before lowest
/// metric. Eligible is what is up, frames Ethernet as Wi-Fi does, is neither a tunnel nor made of
/// other interfaces (what carries those is unknown), is not cellular and has a route there; for a
/// loopback address the loopback interface and nothing else. None when there is no such interface,
/// and for the handset's own addresses and those that IPv6 maps from IPv4.
[[nodiscard]] std::optional<int> EligibleInterface(const sockaddr& destination);

/// A new socket that can reach the network through the interface of EligibleInterface() alone
/// (SO_BINDTOIFINDEX, socket(7)); empty when there is none. `type` may carry SOCK_NONBLOCK.
[[nodiscard]] FileDescriptor EligibleSocket(const sockaddr& destination, int type, int protocol);

}  // namespace platform
