// SPDX-License-Identifier: Apache-2.0
//
// What an exchange of ICMP echo packets needs from the system: sockets that send them and receive
// every ICMP packet of the host with its IPv4 header in front (RFC 791, RFC 792), names, clocks.
// The service may be used from any thread; a socket belongs to one thread at a time. Sending never
// waits; receiving and resolving may.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>

#include "Helper/Platform/HandsetError.h"
#include "Helper/Platform/SharedService.h"

namespace platform {

/// A point in time, or a length of it, in seconds and microseconds.
struct EchoTime {
  std::int64_t seconds = 0;
  std::int32_t microseconds = 0;
};

/// Where an echo request goes, laid out as the handset's socket address of IPv4.
struct EchoDestination {
  static constexpr std::uint8_t kIpv4 = 2;

  std::uint8_t length = 0;
  std::uint8_t family = 0;
  std::uint16_t port = 0;
  std::array<std::uint8_t, 4> address{};  // in network byte order
  std::array<std::uint8_t, 8> padding{};
};
static_assert(sizeof(EchoDestination) == 16);

/// What became of a send or a receive: the number of bytes, or a negative one and why (0 where the
/// system gave no reason).
struct EchoTransfer {
  std::int64_t length = -1;
  HandsetError error = handset::kNoError;
};

class EchoSocket {
 public:
  /// Closes the socket, where that has not been done.
  virtual ~EchoSocket() = default;

  /// Asks for a receive buffer of this many bytes; the system may give another.
  virtual void setReceiveBuffer(std::int32_t bytes) = 0;
  /// Sends and receives over the interface with this index alone from now on, where it exists.
  virtual void bindToInterface(std::uint32_t index) = 0;
  /// Limits each receive() to `limit`. True; or false, with the reason in `error`.
  [[nodiscard]] virtual bool setReceiveTimeout(EchoTime limit, HandsetError& error) = 0;
  /// Sends one packet. Fails with 9 when the socket is closed, and with 47 for a destination that
  /// is not IPv4.
  [[nodiscard]] virtual EchoTransfer send(const EchoDestination& destination,
                                          std::span<const std::byte> packet) = 0;
  /// Takes one packet, IPv4 header included, cut to the size of `buffer`. Fails with 35 when none
  /// came in time.
  [[nodiscard]] virtual EchoTransfer receive(std::span<std::byte> buffer) = 0;
  /// Closes the socket. Harmless when repeated.
  virtual void close() = 0;
};

class EchoService {
 public:
  virtual ~EchoService() = default;

  /// The first address that the system's name service knows for `host`; none when it knows none.
  [[nodiscard]] virtual std::optional<EchoDestination> resolve(const char* host) = 0;
  /// The number of the protocol `name` in the protocol database; none when it is not there.
  [[nodiscard]] virtual std::optional<std::int32_t> protocolNumber(const char* name) = 0;
  /// A socket for packets of `protocol` over IPv4; null when it cannot be had.
  [[nodiscard]] virtual std::unique_ptr<EchoSocket> open(std::int32_t protocol) = 0;
  /// The index of the network interface `name`; 0 when there is none.
  [[nodiscard]] virtual std::uint32_t interfaceIndex(const char* name) = 0;

  /// The time since 1970-01-01 UTC. True; or false, with the reason in `error`.
  [[nodiscard]] virtual bool timeOfDay(EchoTime& now, HandsetError& error) = 0;
  /// A time that only ever advances, by itself. True; or false, with the reason in `error`.
  [[nodiscard]] virtual bool uptime(EchoTime& now, HandsetError& error) = 0;
};

template <>
EchoService& DefaultProvider<EchoService>();

}  // namespace platform
