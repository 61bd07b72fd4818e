// SPDX-License-Identifier: Apache-2.0
//
// The layout of a one-way message to a named port, one datagram: the message header with no bits
// and no ports, the payload's length in 32 bits, the payload, zero bytes up to a multiple of 4. The
// header's size counts all of it. Plain data; no thread, no state.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <span>
#include <vector>

#include "Helper/Shared/Interface/Message.h"

namespace wire {

inline constexpr std::size_t kOneWayLengthOffset = 24;
inline constexpr std::size_t kOneWayPayloadOffset = 28;

/// The longest payload of a one-way message, in bytes. What one datagram takes on a stock kernel.
inline constexpr std::size_t kOneWayPayloadLimit = std::size_t{128} << 10;

/// What a one-way message says. The payload points into the datagram.
struct OneWayMessage {
  std::int32_t id = 0;
  std::span<const std::byte> payload;
};

/// Length of the datagram that carries a payload of `payloadSize` bytes.
[[nodiscard]] constexpr std::size_t OneWaySize(std::size_t payloadSize) {
  return kOneWayPayloadOffset + (payloadSize + 3) / 4 * 4;
}

/// The datagram. `message.payload` is at most kOneWayPayloadLimit long.
[[nodiscard]] inline std::vector<std::byte> EncodeOneWay(const OneWayMessage& message) {
  const std::size_t length = message.payload.size();
  const std::size_t size = OneWaySize(length);
  std::vector<std::byte> datagram(kOneWayPayloadOffset);
  datagram.reserve(size);
  Store(datagram.data(), MessageHeader{.size = static_cast<std::uint32_t>(size), .id = message.id});
  Store(datagram.data() + kOneWayLengthOffset, static_cast<std::uint32_t>(length));
  datagram.insert(datagram.end(), message.payload.begin(), message.payload.end());
  datagram.resize(size);
  return datagram;
}

/// What the datagram says; none when it is not exactly one such message. Ports and the bytes that
/// fill up are not looked at.
[[nodiscard]] inline std::optional<OneWayMessage> DecodeOneWay(
    std::span<const std::byte> datagram) {
  if (datagram.size() < kOneWayPayloadOffset) return std::nullopt;
  const auto header = Load<MessageHeader>(datagram.data());
  const auto length = Load<std::uint32_t>(datagram.data() + kOneWayLengthOffset);
  if (header.bits != 0 || header.size != datagram.size() || OneWaySize(length) != datagram.size()) {
    return std::nullopt;
  }
  return OneWayMessage{.id = header.id, .payload = datagram.subspan(kOneWayPayloadOffset, length)};
}

}  // namespace wire
