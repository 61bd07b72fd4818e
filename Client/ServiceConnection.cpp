// SPDX-License-Identifier: Apache-2.0
//
// One datagram to the service socket, one packet back on a reply port made for it.
#include "Client/ServiceConnection.h"

#include <sys/socket.h>

#include <array>
#include <cerrno>
#include <utility>

#include "Client/Deadline.h"
#include "Client/Packet.h"
#include "Helper/Platform/UnixSocketAddress.h"
#include "Helper/Shared/Interface/Connect.h"
#include "Helper/Shared/Interface/Message.h"

namespace halvec {
namespace {

using platform::FileDescriptor;
using platform::UnixSocketAddress;

/// A helper that leaves this often while somebody connects is not about to stay.
constexpr int kMaxAttempts = 10;
/// Longest wait for room in the service port's queue before the next try. The kernel reports room,
/// but to every waiting sender at once, and one of the others may have taken it.
constexpr int kQueueWaitMilliseconds = 100;

struct SocketPair {
  FileDescriptor kept;
  FileDescriptor given;

  Error make() {
    std::array<int, 2> ends{};
    if (::socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends.data()) != 0) {
      return Error::FromSystem(errno);
    }
    kept.reset(ends[0]);
    given.reset(ends[1]);
    return {};
  }
};

using ConnectRequest = std::array<std::byte, wire::kConnectRequestSize>;

ConnectRequest MakeConnectRequest() {
  ConnectRequest message{};
  wire::MessageHeader header;
  header.bits = wire::kComplexBit | wire::kMoveSendOnce;
  header.size = wire::kConnectRequestSize;
  header.id = wire::kConnectId;
  wire::Store(message.data(), header);
  wire::Store(message.data() + wire::kDescriptorCountOffset, std::uint32_t{1});
  std::byte* port = message.data() + wire::kConnectPortOffset;
  wire::Store(port + wire::kPortDispositionOffset, wire::kMoveSend);
  wire::Store(port + wire::kDescriptorTypeOffset, wire::kPortDescriptorType);
  return message;
}

Error ErrorOfSend(int code) {
  switch (code) {
    case ENOENT:
    case ENOTDIR:
    case ECONNREFUSED:
      return {HVMH_NOT_RUNNING, KERN_SUCCESS, code};
    case EACCES:
    case EPERM:
      return {HVMH_ACCESS_DENIED, KERN_SUCCESS, code};
    default:
      return Error::FromSystem(code);
  }
}

/// Sends `packet`; while the queue is full, waits for room until the deadline.
Error SendToService(const UnixSocketAddress& address, OutgoingPacket packet,
                    const Deadline& deadline) {
  const FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  if (!socket) return Error::FromSystem(errno);
  // The kernel attests who sends only if one side asked for it before the message is queued.
  const int on = 1;
  if (::setsockopt(socket.get(), SOL_SOCKET, SO_PASSCRED, &on, sizeof on) != 0) {
    return Error::FromSystem(errno);
  }
  packet.destination = &address;
  for (;;) {
    const int code = SendPacket(socket.get(), packet, MSG_DONTWAIT);
    if (code == 0) return {};
    if (code == EINTR) continue;
    if (packet.destination == nullptr && (code == ECONNREFUSED || code == ECONNRESET)) {
      // The socket that was connected is closed; another may be bound at the path by now.
      packet.destination = &address;
      continue;
    }
    if (code != EAGAIN) return ErrorOfSend(code);
    // Only a connected socket can wait for room in the queue of another.
    if (packet.destination != nullptr) {
      if (::connect(socket.get(), address.get(), address.size()) != 0) {
        return ErrorOfSend(errno);
      }
      packet.destination = nullptr;
    }
    if (deadline.remaining() == 0) return {HVMH_TIMED_OUT};
    (void)deadline.wait(socket.get(), POLLOUT, kQueueWaitMilliseconds);  // the next try tells
  }
}

bool IsSequencedUnixSocket(int descriptor) {
  int domain = 0;
  int type = 0;
  socklen_t size = sizeof domain;
  if (::getsockopt(descriptor, SOL_SOCKET, SO_DOMAIN, &domain, &size) != 0) return false;
  size = sizeof type;
  if (::getsockopt(descriptor, SOL_SOCKET, SO_TYPE, &type, &size) != 0) return false;
  return domain == AF_UNIX && type == SOCK_SEQPACKET;
}

/// Judges the answer to a connect and takes the private port out of it.
Error ReadConnectReply(const std::byte* reply, IncomingPacket& packet, FileDescriptor& port) {
  constexpr Error kIllFormed{HVMH_PROTOCOL_VIOLATION};
  if (packet.length < wire::kErrorReplySize) return kIllFormed;
  const auto header = wire::Load<wire::MessageHeader>(reply);
  if (header.id != wire::ReplyId(wire::kConnectId)) return kIllFormed;
  if (header.size != packet.length) return kIllFormed;
  if ((header.bits & wire::kComplexBit) == 0) {
    if (header.size != wire::kErrorReplySize) return kIllFormed;
    const auto code = wire::Load<KernReturn>(reply + wire::kReplyCodeOffset);
    // A connect that succeeded has a port in it, so a plain 0 means nothing.
    return code == KERN_SUCCESS ? kIllFormed : Error::FromReturnCode(code);
  }
  if (header.size != wire::kConnectReplySize) return kIllFormed;
  if (wire::Load<std::uint32_t>(reply + wire::kDescriptorCountOffset) != 1) return kIllFormed;
  const std::byte* descriptor = reply + wire::kConnectPortOffset;
  if (wire::Load<std::uint8_t>(descriptor + wire::kPortDispositionOffset) != wire::kCopySend ||
      wire::Load<std::uint8_t>(descriptor + wire::kDescriptorTypeOffset) !=
          wire::kPortDescriptorType) {
    return kIllFormed;
  }
  if (packet.lostDescriptors) return Error::FromSystem(EMFILE);
  if (!packet.descriptor || !IsSequencedUnixSocket(packet.descriptor.get())) return kIllFormed;
  port = std::move(packet.descriptor);
  return {};
}

/// One exchange. HVMH_HELPER_GONE when the helper left without an answer.
Error ConnectOnce(const UnixSocketAddress& address, const Deadline& deadline,
                  ServiceConnection& connection) {
  SocketPair own;
  SocketPair reply;
  if (const Error error = own.make(); error.failed()) return error;
  if (const Error error = reply.make(); error.failed()) return error;

  const ConnectRequest request = MakeConnectRequest();
  OutgoingPacket outgoing{.message = request, .behind = {}};
  outgoing.descriptors = {reply.given.get(), own.given.get()};
  outgoing.descriptorCount = 2;
  if (const Error error = SendToService(address, outgoing, deadline); error.failed()) return error;
  // While this process holds the other ends itself it would never see them hang up.
  reply.given.reset();
  own.given.reset();

  if (deadline.wait(reply.kept.get(), POLLIN) == 0) return {HVMH_TIMED_OUT};
  std::array<std::byte, wire::kConnectReplySize> answer{};
  IncomingPacket incoming;
  switch (ReceivePacket(reply.kept.get(), answer, {}, true, MSG_DONTWAIT, deadline, incoming)) {
    case Arrival::kPacket:
      break;
    case Arrival::kHangUp:
    case Arrival::kNeverRead:
      return {HVMH_HELPER_GONE};
    case Arrival::kTimedOut:
      return {HVMH_TIMED_OUT};
    case Arrival::kFailed:
      return Error::FromSystem(incoming.error);
  }
  connection.ownPort = std::move(own.kept);
  return ReadConnectReply(answer.data(), incoming, connection.privatePort);
}

}  // namespace

const std::string& DefaultServicePath() {
  static const std::string path = std::string(HALVEC_PORTS_DIRECTORY) + "/" + wire::kServiceName;
  return path;
}

Result<ServiceConnection> ConnectToService(const std::string& path,
                                           std::chrono::milliseconds limit) {
  const UnixSocketAddress address(path);
  if (!address) return Error{HVMH_INVALID_ARGUMENT};

  const Deadline deadline(limit);
  Error error;
  for (int attempt = 0; attempt < kMaxAttempts; ++attempt) {
    ServiceConnection connection;
    error = ConnectOnce(address, deadline, connection);
    if (!error.failed()) return connection;
    if (error.status != HVMH_HELPER_GONE) break;
  }
  return error;
}

}  // namespace halvec
