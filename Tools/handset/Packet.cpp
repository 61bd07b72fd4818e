// SPDX-License-Identifier: Apache-2.0
//
// RFC 791 as far as a line of text needs it. Pure functions.
#include "Tools/handset/Packet.h"

#include <charconv>
#include <cstddef>

#include "Tools/handset/Json.h"
#include "Tools/handset/Options.h"

namespace handset {
namespace {

constexpr std::size_t kHeader = 20;
constexpr std::size_t kSource = 12;
constexpr std::size_t kDestination = 16;

std::uint8_t ByteAt(const Packet& packet, std::size_t offset) {
  return static_cast<std::uint8_t>(packet.bytes[offset]);
}

bool IsIpv4(const Packet& packet) {
  return packet.bytes.size() >= kHeader && ByteAt(packet, 0) >> 4U == 4;
}

std::size_t HeaderLength(const Packet& packet) {
  return (ByteAt(packet, 0) & 15U) * std::size_t{4};
}

std::string Address(const Packet& packet, std::size_t offset) {
  std::string text;
  for (std::size_t i = 0; i < 4; ++i) {
    text += (i == 0 ? "" : ".") + std::to_string(ByteAt(packet, offset + i));
  }
  return text;
}

/// ":PORT" of the `index`th port of a TCP or UDP packet; empty for any other.
std::string Port(const Packet& packet, std::size_t index) {
  const std::string protocol = ProtocolOf(packet);
  const std::size_t offset = HeaderLength(packet) + index * 2;
  if ((protocol != "tcp" && protocol != "udp") || packet.bytes.size() < offset + 2) return {};
  return ":" + std::to_string(ByteAt(packet, offset) * 256 + ByteAt(packet, offset + 1));
}

std::string Source(const Packet& packet) {
  return IsIpv4(packet) ? Address(packet, kSource) + Port(packet, 0) : "?";
}

std::string Destination(const Packet& packet) {
  return IsIpv4(packet) ? Address(packet, kDestination) + Port(packet, 1) : "?";
}

const char* Direction(const Packet& packet) { return packet.isFromHandset ? "out" : "in"; }

}  // namespace

std::string ProtocolOf(const Packet& packet) {
  constexpr std::size_t kProtocol = 9;
  if (!IsIpv4(packet)) return "?";
  switch (ByteAt(packet, kProtocol)) {
    case 1:
      return "icmp";
    case 6:
      return "tcp";
    case 17:
      return "udp";
    default:
      return std::to_string(ByteAt(packet, kProtocol));
  }
}

std::string PacketLine(const Packet& packet) {
  return packet.link + " " + Direction(packet) + " " + ProtocolOf(packet) + " " + Source(packet) +
         " > " + Destination(packet) + " " + HexOf(packet.bytes) + "\n";
}

std::string PacketJson(const Packet& packet) {
  return "{\"monotonic_ns\":" + std::to_string(packet.nanoseconds) +
         ",\"interface\":" + JsonString(packet.link) + ",\"direction\":\"" + Direction(packet) +
         "\",\"protocol\":\"" + ProtocolOf(packet) + "\",\"source\":\"" + Source(packet) +
         "\",\"destination\":\"" + Destination(packet) + "\",\"hex\":\"" + HexOf(packet.bytes) +
         "\"}\n";
}

std::string BytesOfHex(std::string_view digits) {
  constexpr int kBase = 16;
  if (digits.size() % 2 != 0) RefuseUsage("an odd number of hexadecimal digits");
  std::string bytes;
  for (; !digits.empty(); digits.remove_prefix(2)) {
    std::uint8_t byte = 0;
    const auto [end, error] = std::from_chars(digits.data(), digits.data() + 2, byte, kBase);
    if (error != std::errc{} || end != digits.data() + 2) RefuseUsage("not hexadecimal");
    bytes += static_cast<char>(byte);
  }
  return bytes;
}

}  // namespace handset
