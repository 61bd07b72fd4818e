// SPDX-License-Identifier: Apache-2.0
//
// An IP packet as people and tests read it. Pure functions, any thread.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace handset {

/// A packet seen on the far side of a link.
struct Packet {
  std::int64_t nanoseconds = 0;  ///< CLOCK_MONOTONIC when it was read.
  std::string link;              ///< The handset's interface.
  bool isFromHandset = false;
  std::string bytes;  ///< From the IP header on; long ones are cut off.
};

/// The packet's protocol: "icmp", "tcp", "udp", or the number in its IPv4 header; "?" where the
/// bytes are no IPv4 packet.
[[nodiscard]] std::string ProtocolOf(const Packet& packet);

/// One line for people: link, "out" or "in" as the handset sees it, protocol, source, ">",
/// destination, bytes in hexadecimal; ports follow the addresses of TCP and UDP after a colon.
[[nodiscard]] std::string PacketLine(const Packet& packet);

/// The same as one line of JSON: monotonic_ns, interface, direction, protocol, source, destination,
/// hex.
[[nodiscard]] std::string PacketJson(const Packet& packet);

/// The bytes that an even number of hexadecimal digits stands for; throws Failure with
/// kStatusUsage.
[[nodiscard]] std::string BytesOfHex(std::string_view digits);

}  // namespace handset
