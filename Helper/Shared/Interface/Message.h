// SPDX-License-Identifier: Apache-2.0
//
// The layout of a message: header, descriptors, NDR record, trailer. Little endian throughout.
// Offsets count from the start of the message. Plain data; no thread, no state.
#pragma once

#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>

#include "Helper/Shared/Interface/ReturnCodes.h"

/// A 32-bit name of a port in this process's name space.
using PortName = std::uint32_t;
inline constexpr PortName kPortNull = 0;
inline constexpr PortName kPortDead = ~PortName{0};

namespace wire {

static_assert(std::endian::native == std::endian::little, "messages travel in host byte order");

/// The 24 bytes that open every message.
struct MessageHeader {
  std::uint32_t bits = 0;    // complex bit, and the disposition of the reply right in bits 0-4
  std::uint32_t size = 0;    // bytes of the message: header to last field, no trailer
  PortName remotePort = 0;   // where the reply goes
  PortName localPort = 0;    // the port on which the message was received
  PortName voucherPort = 0;  // always 0
  std::int32_t id = 0;
};
static_assert(sizeof(MessageHeader) == 24);

inline constexpr std::uint32_t kComplexBit = 0x80000000;
inline constexpr std::uint32_t kRemoteDispositionMask = 0x1f;

/// Dispositions of a port descriptor and of the header's reply right.
inline constexpr std::uint8_t kMoveSend = 17;
inline constexpr std::uint8_t kMoveSendOnce = 18;
inline constexpr std::uint8_t kCopySend = 19;
inline constexpr std::uint8_t kMakeSend = 20;

inline constexpr std::uint8_t kPortDescriptorType = 0;
inline constexpr std::uint8_t kOutOfLineDescriptorType = 1;

/// Offsets of a complex message's body.
inline constexpr std::size_t kDescriptorCountOffset = 24;
inline constexpr std::size_t kFirstDescriptorOffset = 28;
/// A port descriptor: name 4, pad 4, pad 2, disposition 1, type 1.
inline constexpr std::size_t kPortDescriptorSize = 12;
/// An out-of-line descriptor: address 8, deallocate 1, copy 1, pad 1, type 1, size 4.
inline constexpr std::size_t kOutOfLineDescriptorSize = 16;
/// Where the type byte stands in a descriptor of either kind.
inline constexpr std::size_t kDescriptorTypeOffset = 11;
inline constexpr std::size_t kPortDispositionOffset = 10;
inline constexpr std::size_t kOutOfLineCountOffset = 12;

/// The native data representation record that stands before the fields of a message.
inline constexpr std::size_t kNdrSize = 8;
inline constexpr std::array<std::uint8_t, kNdrSize> kNdrRecord{0, 0, 0, 0, 1, 0, 0, 0};

/// A reply without results: header, NDR record, return code.
inline constexpr std::size_t kReplyNdrOffset = 24;
inline constexpr std::size_t kReplyCodeOffset = 32;
inline constexpr std::uint32_t kErrorReplySize = 36;
inline constexpr std::int32_t kReplyIdDistance = 100;
/// The id of the reply to request `id`. Any sender chooses ids, so the largest wrap around.
[[nodiscard]] constexpr std::int32_t ReplyId(std::int32_t id) {
  return static_cast<std::int32_t>(static_cast<std::uint32_t>(id) + kReplyIdDistance);
}

/// What identifies the sender, as the kernel attested it: eight 32-bit words.
struct AuditToken {
  std::array<std::uint32_t, 8> words{};  // auid, euid, egid, ruid, rgid, pid, asid, pidversion
  friend bool operator==(const AuditToken&, const AuditToken&) = default;
};
static_assert(sizeof(AuditToken) == 32);
/// Words of the audit token: the user and the process that sent.
inline constexpr std::size_t kAuditUser = 1;
inline constexpr std::size_t kAuditProcess = 5;

/// Stands behind a received message, written by the receiving side. Format 0.
struct Trailer {
  std::uint32_t type = 0;
  std::uint32_t size = 0;  // bytes of the trailer: 52, or 12 when the sender is not known
  std::uint32_t sequence = 0;
  std::uint32_t securityUid = 0;
  std::uint32_t securityGid = 0;
  AuditToken auditToken;
};
static_assert(sizeof(Trailer) == 52);
/// Size of a trailer that carries no identity of the sender.
inline constexpr std::uint32_t kAnonymousTrailerSize = 12;

/// Reads a field at any alignment.
template <class T>
[[nodiscard]] T Load(const std::byte* at) {
  T value;
  std::memcpy(&value, at, sizeof value);
  return value;
}

/// Writes a field at any alignment.
template <class T>
void Store(std::byte* at, const T& value) {
  std::memcpy(at, &value, sizeof value);
}

/// Writes the NDR record and the return code of a reply. The size is left alone.
inline void StoreReturnCode(std::byte* reply, KernReturn code) {
  Store(reply + kReplyNdrOffset, kNdrRecord);
  Store(reply + kReplyCodeOffset, code);
}

}  // namespace wire
