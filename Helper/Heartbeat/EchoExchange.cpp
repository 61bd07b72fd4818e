// SPDX-License-Identifier: Apache-2.0
#include "Helper/Heartbeat/EchoExchange.h"

#include <arpa/inet.h>
#include <unistd.h>

#include <array>
#include <cstring>
#include <memory>
#include <optional>

#include "Helper/Heartbeat/EchoRequest.h"
#include "Helper/Platform/EchoService.h"

using platform::EchoDestination;
using platform::EchoService;
using platform::EchoSocket;
using platform::EchoTime;
using platform::EchoTransfer;
using platform::HandsetError;
namespace handset = platform::handset;

namespace {

constexpr const char* kInterface = "pdp_ip0";
constexpr const char* kProtocol = "icmp";
constexpr std::size_t kLongestTarget = 256;  // its zero included
constexpr std::int32_t kReceiveBufferSize = 51'200;
constexpr EchoTime kReceiveTimeout{.seconds = 1, .microseconds = 0};
constexpr std::int64_t kWaitSeconds = 1;

std::uint16_t OwnIdentifier() { return static_cast<std::uint16_t>(::getpid() & 0xffff); }

/// A failed call always has an outcome.
HandsetError OutcomeOf(HandsetError error) {
  return error == handset::kNoError ? handset::kNotPermitted : error;
}

std::int64_t WholeSeconds(const EchoTime& from, const EchoTime& to) {
  return to.seconds - from.seconds - (to.microseconds < from.microseconds ? 1 : 0);
}

std::optional<EchoDestination> DestinationOf(EchoService& service, const char* target) {
  // Kept: an address of all ones reads like no address, and is looked up as a name.
  const in_addr_t address = ::inet_addr(target);
  if (address == INADDR_NONE) return service.resolve(target);
  EchoDestination destination{.family = EchoDestination::kIpv4};
  std::memcpy(destination.address.data(), &address, destination.address.size());
  return destination;
}

/// Sends the request. kNoError, or why not.
HandsetError SendRequest(EchoService& service, EchoSocket& socket,
                         const EchoDestination& destination) {
  HandsetError error = handset::kNoError;
  EchoTime now;
  if (!service.timeOfDay(now, error)) return OutcomeOf(error);
  const EchoRequest request = MakeEchoRequest(OwnIdentifier(), now);
  const EchoTransfer sent = socket.send(destination, request);
  if (sent.length == std::int64_t{kEchoRequestLength}) return handset::kNoError;
  return OutcomeOf(sent.error);
}

/// Waits for the reply. kNoError when it came.
HandsetError AwaitReply(EchoService& service, EchoSocket& socket) {
  EchoBuffer buffer{};
  std::optional<EchoTime> start;
  for (;;) {
    const EchoTransfer received = socket.receive(buffer);
    HandsetError status = received.length < 0 ? received.error : handset::kNoError;
    HandsetError clockError = handset::kNoError;
    EchoTime now;
    // Kept: the wait begins once the first receive has returned, so without any packet an exchange
    // takes two receive time-outs.
    if (!start) {
      if (!service.uptime(now, clockError)) return OutcomeOf(clockError);
      start = now;
    }
    if (status != handset::kNoError && status != handset::kWouldBlock) return handset::kTimedOut;
    if (status == handset::kNoError && IsEchoReply(buffer, received.length, OwnIdentifier())) {
      return handset::kNoError;
    }
    if (!service.uptime(now, clockError)) return handset::kTimedOut;
    if (WholeSeconds(*start, now) >= kWaitSeconds) return handset::kTimedOut;
  }
}

}  // namespace

HandsetError ExchangeEcho(const platform::String& target) {
  const std::string_view text = target.utf8();
  std::array<char, kLongestTarget> name{};
  if (text.size() >= name.size()) return handset::kInvalidArgument;
  text.copy(name.data(), text.size());

  auto& service = platform::Shared<EchoService>();
  const std::optional<EchoDestination> destination = DestinationOf(service, name.data());
  if (!destination) return handset::kHostUnreachable;
  const std::optional<std::int32_t> protocol = service.protocolNumber(kProtocol);
  if (!protocol) return handset::kProtocolFamilyUnsupported;
  const std::unique_ptr<EchoSocket> socket = service.open(*protocol);
  if (!socket) return handset::kNotPermitted;

  socket->setReceiveBuffer(kReceiveBufferSize);
  const std::uint32_t index = service.interfaceIndex(kInterface);
  if (index != 0) socket->bindToInterface(index);
  HandsetError error = handset::kNoError;
  if (!socket->setReceiveTimeout(kReceiveTimeout, error)) {
    socket->close();
    // Kept: a failure without a reason goes on, with the closed socket.
    if (error != handset::kNoError) {
      socket->close();
      return error;
    }
  }
  error = SendRequest(service, *socket, *destination);
  if (error == handset::kNoError) error = AwaitReply(service, *socket);
  socket->close();
  return error;
}
