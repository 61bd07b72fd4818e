// SPDX-License-Identifier: Apache-2.0
//
// The layout of what travels is in Shared/Interface/TelephonyConnection.h.
#include "Helper/Platform/Linux/TelephonySockets.h"

#include <poll.h>
#include <sys/socket.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <variant>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/ForeignDescriptor.h"
#include "Helper/Platform/HandsetError.h"
#include "Helper/Platform/Linux/MessagePortSocket.h"
#include "Helper/Platform/PollTimeout.h"
#include "Helper/Platform/PropertyList.h"
#include "Helper/Shared/Interface/TelephonyConnection.h"

namespace platform {
namespace {

constexpr Duration kAnswerLimit = std::chrono::seconds(1);

using Datagram = std::vector<std::byte>;

TelephonyResult Failure(HandsetError errorCode) {
  return {.domain = kTelephonySystemDomain, .errorCode = errorCode};
}

PropertyList::Dictionary CivicInfo(const CivicInfoTexts& texts) {
  PropertyList::Dictionary info;
  for (std::size_t index = 0; index < texts.size(); ++index) {
    if (texts[index]) info.set(wire::kCivicInfoKeys[index], texts[index]->utf8());
  }
  return info;
}

class Connection final : public TelephonyConnection {
 public:
  Connection(FileDescriptor socket, Duration answerLimit, TelephonyNotificationCallback callback,
             void* context)
      : socket_(std::move(socket)),
        answerLimit_(answerLimit),
        callback_(callback),
        context_(context) {}
  ~Connection() override { ClosePairEnd(std::move(socket_)); }
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;

  TelephonyResult setCivicInfo(const CivicInfoTexts& texts) override {
    const std::optional<Datagram> payload = SerializeBinary(CivicInfo(texts));
    if (!payload || payload->size() > wire::kOneWayPayloadLimit)
      return Failure(handset::kMessageTooLong);
    const Datagram message =
        wire::EncodeOneWay({.id = wire::kTelephonySetCivicInfo, .payload = *payload});
    if (::send(socket_.get(), message.data(), message.size(), MSG_DONTWAIT | MSG_NOSIGNAL) < 0) {
      return Failure(errno == EAGAIN ? handset::kWouldBlock : handset::kNotConnected);
    }
    return awaitAnswer();
  }

 private:
  TelephonyResult awaitAnswer() {
    const TimePoint deadline = std::chrono::steady_clock::now() + answerLimit_;
    for (;;) {
      const std::variant<Datagram, TelephonyResult> arrival = receive(deadline);
      if (const auto* failure = std::get_if<TelephonyResult>(&arrival)) return *failure;
      const auto message = wire::DecodeOneWay(std::get<Datagram>(arrival));
      if (!message) return Failure(handset::kInvalidArgument);
      if (message->id == wire::kTelephonyNotification) {
        callback_(this, context_);
        continue;
      }
      if (message->id != wire::kTelephonyCivicInfoAnswer ||
          message->payload.size() != wire::kTelephonyAnswerSize) {
        return Failure(handset::kInvalidArgument);
      }
      const auto answer = wire::Load<wire::TelephonyAnswer>(message->payload.data());
      return {.domain = answer.domain, .errorCode = answer.errorCode};
    }
  }

  /// The next packet that is not empty, or why there is none.
  std::variant<Datagram, TelephonyResult> receive(TimePoint deadline) {
    for (;;) {
      // Asked here too, because a daemon that never stops sending keeps the wait from timing out.
      if (std::chrono::steady_clock::now() >= deadline) return Failure(handset::kTimedOut);
      pollfd entry{.fd = socket_.get(), .events = POLLIN | POLLRDHUP, .revents = 0};
      if (::poll(&entry, 1, MillisecondsUntil(deadline)) <= 0) continue;
      const ssize_t length = ::recv(socket_.get(), nullptr, 0, MSG_PEEK | MSG_TRUNC | MSG_DONTWAIT);
      // An empty packet looks like the end of the stream; only the hang-up tells them apart.
      const bool ended = length == 0 && (entry.revents & (POLLHUP | POLLRDHUP)) != 0;
      if (ended || (length < 0 && errno != EAGAIN && errno != EINTR)) {
        return Failure(handset::kNotConnected);
      }
      if (length < 0) continue;
      if (static_cast<std::size_t>(length) > wire::OneWaySize(wire::kOneWayPayloadLimit)) {
        return Failure(handset::kInvalidArgument);
      }
      Datagram packet(static_cast<std::size_t>(length));
      take(packet);
      if (!packet.empty()) return packet;
    }
  }

  /// Takes the packet that is there; descriptors that came along are given up.
  void take(Datagram& packet) {
    iovec part{.iov_base = packet.data(), .iov_len = packet.size()};
    alignas(cmsghdr) ControlStorage control;
    msghdr header{};
    header.msg_iov = &part;
    header.msg_iovlen = 1;
    header.msg_control = control.data();
    header.msg_controllen = control.size();
    if (::recvmsg(socket_.get(), &header, MSG_DONTWAIT | MSG_CMSG_CLOEXEC) < 0) return;
    ForeignDescriptors surplus;
    for (cmsghdr* entry = CMSG_FIRSTHDR(&header); entry; entry = CMSG_NXTHDR(&header, entry)) {
      surplus.add(*entry);
    }
  }

  FileDescriptor socket_;
  const Duration answerLimit_;
  const TelephonyNotificationCallback callback_;
  void* const context_;
};

/// Sends `message` with one descriptor. False when the daemon does not take it at once.
bool SendWithRight(int socket, Datagram message, int right) {
  iovec part{.iov_base = message.data(), .iov_len = message.size()};
  alignas(cmsghdr) std::array<std::byte, CMSG_SPACE(sizeof right)> control{};
  msghdr header{};
  header.msg_iov = &part;
  header.msg_iovlen = 1;
  header.msg_control = control.data();
  header.msg_controllen = control.size();
  cmsghdr* entry = CMSG_FIRSTHDR(&header);
  entry->cmsg_level = SOL_SOCKET;
  entry->cmsg_type = SCM_RIGHTS;
  entry->cmsg_len = CMSG_LEN(sizeof right);
  std::memcpy(CMSG_DATA(entry), &right, sizeof right);
  return ::sendmsg(socket, &header, MSG_DONTWAIT | MSG_NOSIGNAL) >= 0;
}

}  // namespace

void TelephonySockets::addIdentifierException(const String& identifier) {
  const std::string_view text = identifier.utf8();
  if (std::find(identifiers_.begin(), identifiers_.end(), text) == identifiers_.end()) {
    identifiers_.emplace_back(text);
  }
}

std::unique_ptr<TelephonyConnection> TelephonySockets::createConnection(
    TelephonyNotificationCallback callback, void* context) {
  const FileDescriptor port = ConnectToNamedPort(portsDirectory_, wire::kTelephonyConnectionPort);
  int ends[2];
  if (!port || ::socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends) != 0) return nullptr;
  FileDescriptor own(ends[0]);
  const FileDescriptor daemons(ends[1]);
  const std::optional<Datagram> payload =
      SerializeBinary(PropertyList::Array(identifiers_.begin(), identifiers_.end()));
  if (!payload || payload->size() > wire::kOneWayPayloadLimit) return nullptr;
  if (!SendWithRight(port.get(), wire::EncodeTelephonyConnect(*payload), daemons.get())) {
    return nullptr;
  }
  return std::make_unique<Connection>(std::move(own), answerLimit_, callback, context);
}

template <>
TelephonyFramework& DefaultProvider<TelephonyFramework>() {
  static TelephonyFramework& framework =
      *new TelephonySockets(HALVEC_PORTS_DIRECTORY, kAnswerLimit);
  return framework;
}

}  // namespace platform
