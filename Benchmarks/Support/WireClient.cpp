// SPDX-License-Identifier: Apache-2.0
#include "Benchmarks/Support/WireClient.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>

#include "Benchmarks/Support/Measure.h"
#include "Helper/Platform/UnixSocketAddress.h"

namespace bench {
namespace {

using platform::UnixSocketAddress;

constexpr std::uint32_t kComplex = 0x80000000;
constexpr std::uint32_t kReplyRight = 18;
constexpr std::int32_t kConnect = 4792174;
constexpr std::int32_t kSetPreference = 8683555;
constexpr std::size_t kHeader = 24;
constexpr std::size_t kNdr = 8;
constexpr std::size_t kSlot = 256;
constexpr std::size_t kMostBehindTheMessage = 131072;
constexpr std::size_t kDescriptorsPerMessage = 2;

template <class T>
void Put(std::vector<std::byte>& message, std::size_t offset, T value) {
  std::memcpy(message.data() + offset, &value, sizeof value);
}

std::vector<std::byte> Message(std::int32_t id, std::uint32_t bits, std::size_t size) {
  std::vector<std::byte> message(size);
  Put(message, 0, bits);
  Put(message, 4, static_cast<std::uint32_t>(size));
  Put(message, 20, id);
  return message;
}

void PutText(std::vector<std::byte>& message, std::size_t offset, const std::string& text) {
  std::memcpy(message.data() + offset, text.data(), std::min(text.size(), kSlot - 1));
}

void AttestSender(int socket) {
  const int on = 1;
  Check(::setsockopt(socket, SOL_SOCKET, SO_PASSCRED, &on, sizeof on), "SO_PASSCRED");
}

}  // namespace

SocketPair MakePair(int type) {
  std::array<int, 2> ends{};
  Check(::socketpair(AF_UNIX, type | SOCK_CLOEXEC, 0, ends.data()), "socketpair");
  return {FileDescriptor(ends[0]), FileDescriptor(ends[1])};
}

FileDescriptor BindService(const std::string& path) {
  FileDescriptor socket(Check(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0), "socket"));
  AttestSender(socket.get());
  (void)::unlink(path.c_str());
  const UnixSocketAddress address(path);
  Check(::bind(socket.get(), address.get(), address.size()), "bind");
  return socket;
}

bool SendWithDescriptors(int socket, std::span<const std::span<const std::byte>> parts,
                         std::span<const int> descriptors, const std::string& path) {
  std::array<iovec, 2> vectors{};
  msghdr message{};
  const UnixSocketAddress address(path);
  if (address) {
    message.msg_name = const_cast<sockaddr*>(address.get());
    message.msg_namelen = address.size();
  }
  message.msg_iov = vectors.data();
  for (const auto part : parts) {
    vectors[message.msg_iovlen++] = {.iov_base = const_cast<std::byte*>(part.data()),
                                     .iov_len = part.size()};
  }
  alignas(cmsghdr) std::array<std::byte, CMSG_SPACE(sizeof(int) * kDescriptorsPerMessage)>
      control{};
  if (!descriptors.empty()) {
    message.msg_control = control.data();
    message.msg_controllen = CMSG_SPACE(descriptors.size_bytes());
    cmsghdr* rights = CMSG_FIRSTHDR(&message);
    rights->cmsg_level = SOL_SOCKET;
    rights->cmsg_type = SCM_RIGHTS;
    rights->cmsg_len = CMSG_LEN(descriptors.size_bytes());
    std::memcpy(CMSG_DATA(rights), descriptors.data(), descriptors.size_bytes());
  }
  return ::sendmsg(socket, &message, MSG_NOSIGNAL) >= 0;
}

std::size_t ReceiveWithDescriptor(int socket, std::span<std::byte> bytes,
                                  FileDescriptor& received) {
  iovec vector{.iov_base = bytes.data(), .iov_len = bytes.size()};
  alignas(cmsghdr) std::array<std::byte, CMSG_SPACE(sizeof(int)) + CMSG_SPACE(sizeof(ucred))>
      control{};
  msghdr message{};
  message.msg_iov = &vector;
  message.msg_iovlen = 1;
  message.msg_control = control.data();
  message.msg_controllen = control.size();
  const ssize_t length = ::recvmsg(socket, &message, MSG_CMSG_CLOEXEC);
  if (length <= 0) Fail("recvmsg");
  for (cmsghdr* entry = CMSG_FIRSTHDR(&message); entry; entry = CMSG_NXTHDR(&message, entry)) {
    if (entry->cmsg_level != SOL_SOCKET || entry->cmsg_type != SCM_RIGHTS) continue;
    int descriptor = -1;
    std::memcpy(&descriptor, CMSG_DATA(entry), sizeof descriptor);
    received.reset(descriptor);
  }
  return static_cast<std::size_t>(length);
}

PendingConnect SendConnect(const std::string& servicePath) {
  SocketPair client = MakePair(SOCK_SEQPACKET);
  SocketPair reply = MakePair(SOCK_SEQPACKET);
  std::vector<std::byte> message = Message(kConnect, kComplex | kReplyRight, 40);
  Put(message, 24, std::uint32_t{1});
  Put(message, 38, std::uint16_t{0x0011});
  const FileDescriptor sender(Check(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0), "socket"));
  AttestSender(sender.get());
  const std::array<std::span<const std::byte>, 1> parts{message};
  const std::array<int, 2> rights{reply.second.get(), client.second.get()};
  if (!SendWithDescriptors(sender.get(), parts, rights, servicePath)) Fail("sending the connect");
  return {std::move(client.first), std::move(reply.first)};
}

WireClient FinishConnect(PendingConnect pending) {
  std::array<std::byte, 64> reply{};
  FileDescriptor privatePort;
  const std::size_t length = ReceiveWithDescriptor(pending.replyPort.get(), reply, privatePort);
  if (length != 40 || !privatePort) {
    errno = EACCES;
    Fail("connect refused");
  }
  return {std::move(pending.clientPort), std::move(privatePort)};
}

WireClient Connect(const std::string& servicePath) {
  return FinishConnect(SendConnect(servicePath));
}

void AwaitService(const std::string& servicePath) { (void)Connect(servicePath); }

std::vector<std::byte> TextRequest(std::int32_t id, std::span<const std::string> texts) {
  std::vector<std::byte> message = Message(id, 0, kHeader + kNdr + texts.size() * kSlot);
  Put(message, 28, std::uint32_t{1});
  for (std::size_t index = 0; index < texts.size(); ++index) {
    PutText(message, kHeader + kNdr + index * kSlot, texts[index]);
  }
  return message;
}

std::size_t Call(const FileDescriptor& port, std::span<const std::byte> request,
                 std::span<std::byte> reply) {
  if (::send(port.get(), request.data(), request.size(), MSG_NOSIGNAL) < 0) Fail("send");
  const ssize_t length = ::recv(port.get(), reply.data(), reply.size(), 0);
  if (length <= 0) Fail("recv");
  return static_cast<std::size_t>(length);
}

FileDescriptor SealedMemory(std::span<const std::byte> bytes) {
  FileDescriptor file(
      Check(::memfd_create("benchmark", MFD_CLOEXEC | MFD_ALLOW_SEALING), "memfd_create"));
  for (std::size_t done = 0; done < bytes.size();) {
    const ssize_t count = ::write(file.get(), bytes.data() + done, bytes.size() - done);
    if (count <= 0) Fail("write");
    done += static_cast<std::size_t>(count);
  }
  Check(::fcntl(file.get(), F_ADD_SEALS, F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE), "seals");
  return file;
}

std::int32_t SetPreference(const FileDescriptor& port, const std::string& domain,
                           const std::string& key, std::span<const std::byte> value) {
  constexpr std::size_t kDescriptor = 28;
  constexpr std::size_t kFields = kDescriptor + 16 + kNdr;
  const bool behind = value.size() <= kMostBehindTheMessage;
  std::vector<std::byte> message =
      Message(kSetPreference, kComplex, kFields + 2 * kSlot + sizeof(std::uint32_t));
  const auto size = static_cast<std::uint32_t>(value.size());
  Put(message, 24, std::uint32_t{1});
  Put(message, kDescriptor, std::uint64_t{behind ? 0U : 1U});
  Put(message, kDescriptor + 8, std::uint32_t{0x01000000});
  Put(message, kDescriptor + 12, size);
  Put(message, kFields - 4, std::uint32_t{1});
  PutText(message, kFields, domain);
  PutText(message, kFields + kSlot, key);
  Put(message, kFields + 2 * kSlot, size);

  bool sent = false;
  if (behind) {
    const std::array<std::span<const std::byte>, 2> parts{message, value};
    sent = SendWithDescriptors(port.get(), parts, {});
  } else {
    const FileDescriptor memory = SealedMemory(value);
    const std::array<std::span<const std::byte>, 1> parts{message};
    const std::array<int, 1> rights{memory.get()};
    sent = SendWithDescriptors(port.get(), parts, rights);
  }
  if (!sent) Fail("sending a preference");
  std::array<std::byte, 64> reply{};
  if (::recv(port.get(), reply.data(), reply.size(), 0) < 36) Fail("recv");
  std::int32_t code = 0;
  std::memcpy(&code, reply.data() + 32, sizeof code);
  return code;
}

}  // namespace bench
