// SPDX-License-Identifier: Apache-2.0
//
// What travels between a client and the telephony daemon: the connection request to its named port,
// then one-way messages (OneWayMessage.h) in both directions over the connection. Plain data; no
// thread, no state.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <span>
#include <vector>

#include "Helper/Shared/Interface/Message.h"
#include "Helper/Shared/Interface/OneWayMessage.h"

namespace wire {

/// Where the telephony daemon takes connection requests.
inline constexpr const char* kTelephonyConnectionPort = "com.zarvo.Halvec.connection";

/// To the named port: a new connection. Payload: binary property list, array of identifier strings.
inline constexpr std::int32_t kTelephonyConnect = 5501000;
/// Over the connection: the civic info. Payload: binary property list, dictionary of strings.
inline constexpr std::int32_t kTelephonySetCivicInfo = 5501001;
/// Its answer. Payload: kTelephonyAnswerSize bytes.
inline constexpr std::int32_t kTelephonyCivicInfoAnswer = 5501101;
/// From the daemon at any time: a notification. The payload is not looked at.
inline constexpr std::int32_t kTelephonyNotification = 5501002;

/// The civic info's keys, in the order country, state, city, postal code. One is left out where
/// there is no such text.
inline constexpr std::array<const char*, 4> kCivicInfoKeys{"country", "state", "city",
                                                           "postalCode"};

/// The payload of an answer: domain, then error code, 0 for success.
struct TelephonyAnswer {
  std::int32_t domain = 0;
  std::int32_t errorCode = 0;
};
inline constexpr std::size_t kTelephonyAnswerSize = 8;
static_assert(sizeof(TelephonyAnswer) == kTelephonyAnswerSize);

/// Offsets in a connection request: a complex message with one port descriptor, whose right is the
/// daemon's end of the connection.
inline constexpr std::size_t kTelephonyConnectLengthOffset =
    kFirstDescriptorOffset + kPortDescriptorSize;
inline constexpr std::size_t kTelephonyConnectPayloadOffset =
    kTelephonyConnectLengthOffset + sizeof(std::uint32_t);

/// The connection request that carries `payload`, at most kOneWayPayloadLimit bytes.
[[nodiscard]] inline std::vector<std::byte> EncodeTelephonyConnect(
    std::span<const std::byte> payload) {
  const std::size_t padded = (payload.size() + 3) / 4 * 4;
  std::vector<std::byte> message(kTelephonyConnectPayloadOffset + padded);
  Store(message.data(), MessageHeader{.bits = kComplexBit,
                                      .size = static_cast<std::uint32_t>(message.size()),
                                      .id = kTelephonyConnect});
  Store(message.data() + kDescriptorCountOffset, std::uint32_t{1});
  std::byte* descriptor = message.data() + kFirstDescriptorOffset;
  Store(descriptor + kPortDispositionOffset, kMoveSend);
  Store(descriptor + kDescriptorTypeOffset, kPortDescriptorType);
  Store(message.data() + kTelephonyConnectLengthOffset, static_cast<std::uint32_t>(payload.size()));
  if (!payload.empty()) {
    std::memcpy(message.data() + kTelephonyConnectPayloadOffset, payload.data(), payload.size());
  }
  return message;
}

/// The payload of a connection request; none when `message` is not exactly one. Port names and the
/// bytes that fill up are not looked at.
[[nodiscard]] inline std::optional<std::span<const std::byte>> DecodeTelephonyConnect(
    std::span<const std::byte> message) {
  if (message.size() < kTelephonyConnectPayloadOffset) return std::nullopt;
  const auto header = Load<MessageHeader>(message.data());
  const auto length = Load<std::uint32_t>(message.data() + kTelephonyConnectLengthOffset);
  const std::byte* descriptor = message.data() + kFirstDescriptorOffset;
  const bool shaped =
      (header.bits & kComplexBit) != 0 && header.size == message.size() &&
      header.id == kTelephonyConnect &&
      Load<std::uint32_t>(message.data() + kDescriptorCountOffset) == 1 &&
      Load<std::uint8_t>(descriptor + kDescriptorTypeOffset) == kPortDescriptorType &&
      length <= kOneWayPayloadLimit &&
      kTelephonyConnectPayloadOffset + (std::size_t{length} + 3) / 4 * 4 == message.size();
  if (!shaped) return std::nullopt;
  return message.subspan(kTelephonyConnectPayloadOffset, length);
}

}  // namespace wire
