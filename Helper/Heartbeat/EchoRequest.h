// SPDX-License-Identifier: Apache-2.0
//
// The bytes of the heartbeat's echo request (RFC 792), and how a received packet is told to answer
// it. Pure; any thread.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>

#include "Helper/Platform/EchoService.h"

inline constexpr std::size_t kEchoRequestLength = 48;
inline constexpr std::size_t kEchoReceiveLength = 2048;

using EchoRequest = std::array<std::byte, kEchoRequestLength>;
using EchoBuffer = std::array<std::byte, kEchoReceiveLength>;

/// An echo request of sequence 0 that carries `identifier`, which is in host byte order, and the
/// time of its sending, with its checksum (RFC 1071).
[[nodiscard]] EchoRequest MakeEchoRequest(std::uint16_t identifier, platform::EchoTime sendTime);

/// Whether the packet at the start of `buffer`, `length` bytes with its IPv4 header, is an echo
/// reply with `identifier`. Nothing else of it is looked at.
[[nodiscard]] bool IsEchoReply(const EchoBuffer& buffer, std::int64_t length,
                               std::uint16_t identifier);
