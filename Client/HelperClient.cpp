// SPDX-License-Identifier: Apache-2.0
//
// One request at a time on the private port: send, wait for the reply, judge it.
#include "Client/HelperClient.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/time.h>

#include <cerrno>
#include <new>
#include <utility>

#include "Client/Packet.h"
#include "Client/SealedMemory.h"

namespace halvec {
namespace {

constexpr Error kIllFormed{HVMH_PROTOCOL_VIOLATION};

/// Where the bytes of an out-of-line descriptor are: its address field on the wire.
constexpr std::uint64_t kBehindMessage = 0;
constexpr std::uint64_t kInMemory = 1;

/// Lets the kernel end a send or receive at the limit, so that a request needs no poll(2).
Error PreparePrivatePort(int port, std::chrono::milliseconds limit) {
  // The file flags belong to both holders of this end. Nobody depends on them, and a blocking
  // receive saves a system call per request.
  const int flags = ::fcntl(port, F_GETFL);
  if (flags < 0) return Error::FromSystem(errno);
  if ((flags & O_NONBLOCK) != 0 && ::fcntl(port, F_SETFL, flags & ~O_NONBLOCK) != 0) {
    return Error::FromSystem(errno);
  }
  timeval time{};
  time.tv_sec = limit.count() / 1000;
  time.tv_usec = limit.count() % 1000 * 1000;
  for (const int option : {SO_RCVTIMEO, SO_SNDTIMEO}) {
    if (::setsockopt(port, SOL_SOCKET, option, &time, sizeof time) != 0) {
      return Error::FromSystem(errno);
    }
  }
  return {};
}

/// Judges a reply without out-of-line data, and every reply that only carries a return code.
Error ReadPlainReply(std::span<const std::byte> reply, std::uint32_t expectedSize) {
  if (reply.size() < wire::kErrorReplySize) return kIllFormed;
  const auto code = wire::Load<KernReturn>(reply.data() + wire::kReplyCodeOffset);
  // Results stand in a reply exactly when the code is 0.
  if (reply.size() != (code == KERN_SUCCESS ? expectedSize : wire::kErrorReplySize)) {
    return kIllFormed;
  }
  return Error::FromReturnCode(code);
}

/// Judges a reply with data, `head` being its fixed part, and copies the data out.
Error ReadDataReply(std::span<const std::byte> head, std::span<const std::byte> behind,
                    std::size_t packetLength, const IncomingPacket& packet, Data& data) {
  const std::byte* descriptor = head.data() + wire::kFirstDescriptorOffset;
  if (wire::Load<std::uint32_t>(head.data() + wire::kDescriptorCountOffset) != 1 ||
      wire::Load<std::uint8_t>(descriptor + wire::kDescriptorTypeOffset) !=
          wire::kOutOfLineDescriptorType) {
    return kIllFormed;
  }
  const auto address = wire::Load<std::uint64_t>(descriptor);
  const auto size = wire::Load<std::uint32_t>(descriptor + wire::kOutOfLineCountOffset);
  constexpr std::size_t kCountOffset = wire::detail::FieldStart(true);
  if (wire::Load<std::uint32_t>(head.data() + kCountOffset) != size) return kIllFormed;

  if (address == kBehindMessage) {
    if (size > kMaxBytesInPacket || packetLength != head.size() + size) return kIllFormed;
    if (!data.allocate(size)) return {HVMH_NO_MEMORY};
    if (size != 0) std::memcpy(data.bytes().data(), behind.data(), size);
    return {};
  }
  if (address != kInMemory || packetLength != head.size()) return kIllFormed;
  if (packet.lostDescriptors) return Error::FromSystem(EMFILE);
  if (!packet.descriptor) return kIllFormed;
  return ReadSealedBytes(packet.descriptor.get(), size, data);
}

bool IsHungUpError(int code) {
  return code == EPIPE || code == ECONNRESET || code == ECONNREFUSED || code == ENOTCONN;
}

}  // namespace

/// How an attempt at a request ended.
struct HelperClient::Outcome {
  Error error;
  bool neverRead = false;  // with HVMH_HELPER_GONE: the helper cannot have begun the request
};

Result<HelperClient> HelperClient::Connect(ClientOptions options) {
  HelperClient client(std::move(options));
  if (const Error error = client.reconnect(); error.failed()) return error;
  return client;
}

Error HelperClient::reconnect() {
  disconnect();
  if (options_.connectLimit.count() < 0 || options_.requestLimit.count() < 0) {
    return {HVMH_INVALID_ARGUMENT};
  }
  Result<ServiceConnection> made = ConnectToService(options_.servicePath, options_.connectLimit);
  if (!made) return made.error();
  const Error error = PreparePrivatePort(made->privatePort.get(), options_.requestLimit);
  if (!error.failed()) connection_ = std::move(*made);
  return error;
}

void HelperClient::disconnect() { connection_ = {}; }

bool HelperClient::isConnected() const {
  if (!connection_.privatePort) return false;
  std::array<pollfd, 2> ports{
      {{connection_.privatePort.get(), 0, 0}, {connection_.ownPort.get(), 0, 0}}};
  return ::poll(ports.data(), ports.size(), 0) == 0;
}

Error HelperClient::exchange(std::span<std::byte> message, std::span<const std::byte> outOfLine,
                             const ReplyShape& shape, std::span<std::byte> reply, Data& data) {
  if (outOfLine.size() > kMaxOutOfLineBytes) return {HVMH_TOO_LARGE};
  bool mayReconnect = options_.reconnect;
  if (!connection_.privatePort) {
    if (!mayReconnect) return {HVMH_NOT_CONNECTED};
    if (const Error error = reconnect(); error.failed()) return error;
    mayReconnect = false;
  }
  Outcome outcome = attempt(message, outOfLine, shape, reply, data);
  if (outcome.neverRead && mayReconnect) {
    if (const Error error = reconnect(); error.failed()) return error;
    outcome = attempt(message, outOfLine, shape, reply, data);
  }
  return outcome.error;
}

HelperClient::Outcome HelperClient::attempt(std::span<std::byte> message,
                                            std::span<const std::byte> outOfLine,
                                            const ReplyShape& shape, std::span<std::byte> reply,
                                            Data& data) {
  const Deadline deadline(options_.requestLimit);
  Outcome outcome = sendRequest(message, outOfLine, deadline);
  if (!outcome.error.failed()) outcome = receiveReply(shape, reply, deadline, data);
  switch (outcome.error.status) {
    case HVMH_TIMED_OUT:
    case HVMH_HELPER_GONE:
    case HVMH_PROTOCOL_VIOLATION:
      disconnect();
      break;
    default:
      break;
  }
  return outcome;
}

HelperClient::Outcome HelperClient::sendRequest(std::span<std::byte> message,
                                                std::span<const std::byte> outOfLine,
                                                const Deadline& deadline) {
  OutgoingPacket packet{.message = message, .behind = outOfLine};
  platform::FileDescriptor memory;
  const auto moveToMemory = [&]() -> Error {
    if (const Error error = SealBytes(outOfLine, memory); error.failed()) return error;
    wire::Store(message.data() + wire::kFirstDescriptorOffset, kInMemory);
    packet.behind = {};
    packet.descriptors[0] = memory.get();
    packet.descriptorCount = 1;
    return {};
  };
  if (outOfLine.size() > kMaxBytesInPacket) {
    if (const Error error = moveToMemory(); error.failed()) return {error};
  } else if (!outOfLine.empty()) {
    wire::Store(message.data() + wire::kFirstDescriptorOffset, kBehindMessage);
  }
  for (;;) {
    const int code = SendPacket(connection_.privatePort.get(), packet, 0);
    if (code == 0) return {};
    if (IsHungUpError(code)) return {{HVMH_HELPER_GONE}, true};
    if (code == EINTR || code == EAGAIN) {
      if (deadline.wait(connection_.privatePort.get(), POLLOUT) == 0) return {{HVMH_TIMED_OUT}};
    } else if (code == EMSGSIZE && !packet.behind.empty()) {
      // A system with small socket buffers: what does not fit into a packet fits into memory.
      if (const Error error = moveToMemory(); error.failed()) return {error};
    } else {
      return {Error::FromSystem(code)};
    }
  }
}

HelperClient::Outcome HelperClient::receiveReply(const ReplyShape& shape,
                                                 std::span<std::byte> reply,
                                                 const Deadline& deadline, Data& data) {
  std::span<std::byte> behind;
  if (shape.complex) {
    if (!arrivals_) arrivals_.reset(new (std::nothrow) std::byte[kMaxBytesInPacket]);
    if (!arrivals_) return {{HVMH_NO_MEMORY}};
    behind = {arrivals_.get(), kMaxBytesInPacket};
  }
  IncomingPacket packet;
  switch (ReceivePacket(connection_.privatePort.get(), reply, behind, shape.complex, 0, deadline,
                        packet)) {
    case Arrival::kPacket:
      return {ReadReply(shape, reply, behind, packet, data)};
    case Arrival::kHangUp:
      return {{HVMH_HELPER_GONE}};
    case Arrival::kNeverRead:
      return {{HVMH_HELPER_GONE}, true};
    case Arrival::kTimedOut:
      return {{HVMH_TIMED_OUT}};
    case Arrival::kFailed:
      break;
  }
  disconnect();
  return {Error::FromSystem(packet.error)};
}

Error HelperClient::ReadReply(const ReplyShape& shape, std::span<const std::byte> reply,
                              std::span<const std::byte> behind, const IncomingPacket& packet,
                              Data& data) {
  if (packet.length < wire::kErrorReplySize) return kIllFormed;
  const auto header = wire::Load<wire::MessageHeader>(reply.data());
  if (header.id != shape.id) return kIllFormed;
  const bool complex = (header.bits & wire::kComplexBit) != 0;
  if (complex) {
    if (!shape.complex || header.size != shape.size || packet.length < shape.size) {
      return kIllFormed;
    }
    return ReadDataReply(reply, behind, packet.length, packet, data);
  }
  // Data travels only in the complex form, so a plain reply can only tell of a failure then.
  if (header.size != packet.length || packet.length > reply.size()) return kIllFormed;
  const Error error = ReadPlainReply(reply.first(packet.length), shape.size);
  return shape.complex && !error.failed() ? kIllFormed : error;
}

}  // namespace halvec
