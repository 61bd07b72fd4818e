// SPDX-License-Identifier: Apache-2.0
#include "Tests/Support/WireClient.h"

#include "Helper/Platform/ForeignDescriptor.h"
#include "Helper/Platform/UnixSocketAddress.h"

#include <dirent.h>
#include <poll.h>
#include <sys/socket.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <stdexcept>

namespace support {
namespace {

using platform::UnixSocketAddress;

int SendTo(int socket, const UnixSocketAddress* address, const Bytes& bytes,
           const std::vector<int>& descriptors) {
  iovec part{.iov_base = const_cast<std::uint8_t*>(bytes.data()), .iov_len = bytes.size()};
  std::vector<std::byte> control(CMSG_SPACE(sizeof(int) * descriptors.size()));
  msghdr message{};
  if (address) {
    message.msg_name = const_cast<sockaddr*>(address->get());
    message.msg_namelen = address->size();
  }
  message.msg_iov = &part;
  message.msg_iovlen = 1;
  if (!descriptors.empty()) {
    message.msg_control = control.data();
    message.msg_controllen = control.size();
    cmsghdr* entry = CMSG_FIRSTHDR(&message);
    entry->cmsg_level = SOL_SOCKET;
    entry->cmsg_type = SCM_RIGHTS;
    entry->cmsg_len = CMSG_LEN(sizeof(int) * descriptors.size());
    std::memcpy(CMSG_DATA(entry), descriptors.data(), sizeof(int) * descriptors.size());
  }
  return ::sendmsg(socket, &message, MSG_NOSIGNAL | MSG_DONTWAIT) < 0 ? errno : 0;
}

}  // namespace

void PutText(Bytes& bytes, std::size_t offset, const std::string& text) {
  std::memcpy(bytes.data() + offset, text.data(), text.size());
}

PortPair MakePort() {
  int ends[2];
  if (::socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends) != 0) {
    throw std::runtime_error("socketpair failed");
  }
  return {FileDescriptor(ends[0]), FileDescriptor(ends[1])};
}

int SendPacket(int socket, const Bytes& bytes, const std::vector<int>& descriptors) {
  return SendTo(socket, nullptr, bytes, descriptors);
}

Packet ReceivePacket(int socket) {
  Packet packet;
  packet.bytes.resize(300 * 1024);
  iovec part{.iov_base = packet.bytes.data(), .iov_len = packet.bytes.size()};
  alignas(cmsghdr) std::array<std::byte, 512> control{};
  msghdr message{};
  message.msg_iov = &part;
  message.msg_iovlen = 1;
  message.msg_control = control.data();
  message.msg_controllen = control.size();
  const ssize_t length = ::recvmsg(socket, &message, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
  packet.bytes.resize(length > 0 ? static_cast<std::size_t>(length) : 0);
  if (length < 0) return packet;
  for (cmsghdr* entry = CMSG_FIRSTHDR(&message); entry; entry = CMSG_NXTHDR(&message, entry)) {
    if (entry->cmsg_level != SOL_SOCKET || entry->cmsg_type != SCM_RIGHTS) continue;
    for (std::size_t at = CMSG_LEN(0); at < entry->cmsg_len; at += sizeof(int)) {
      int descriptor = -1;
      std::memcpy(&descriptor, reinterpret_cast<std::byte*>(entry) + at, sizeof descriptor);
      packet.descriptors.emplace_back(descriptor);
    }
  }
  return packet;
}

Packet AwaitPacket(int socket) {
  pollfd entry{.fd = socket, .events = POLLIN, .revents = 0};
  (void)::poll(&entry, 1, 20'000);
  return ReceivePacket(socket);
}

bool IsHungUp(int socket) {
  pollfd entry{.fd = socket, .events = 0, .revents = 0};
  return ::poll(&entry, 1, 0) > 0 && (entry.revents & POLLHUP) != 0;
}

LauncherSocket::LauncherSocket(const std::string& serviceName, bool passCredentials) {
  std::array<char, 64> directory{"/tmp/launcher-XXXXXX"};
  directory_ = ::mkdtemp(directory.data());
  path_ = directory_ + "/" + serviceName;
  socket_.reset(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const int on = passCredentials ? 1 : 0;
  ::setsockopt(socket_.get(), SOL_SOCKET, SO_PASSCRED, &on, sizeof on);
  const UnixSocketAddress address(path_);
  if (::bind(socket_.get(), address.get(), address.size()) != 0) {
    throw std::runtime_error("bind failed");
  }
  // The helper takes the handed-over descriptor for itself; the launcher keeps another.
  const int handedOver = ::dup(socket_.get());
  std::string names;
  for (int index = 3; index < handedOver; ++index) names += "other:";
  ::setenv("LISTEN_PID", std::to_string(::getpid()).c_str(), 1);
  ::setenv("LISTEN_FDS", std::to_string(handedOver - 2).c_str(), 1);
  ::setenv("LISTEN_FDNAMES", (names + serviceName).c_str(), 1);
}

LauncherSocket::~LauncherSocket() {
  ::unlink(path_.c_str());
  ::rmdir(directory_.c_str());
  ::unsetenv("LISTEN_PID");
  ::unsetenv("LISTEN_FDS");
  ::unsetenv("LISTEN_FDNAMES");
}

Bytes Message(std::int32_t id, std::uint32_t size) {
  Bytes bytes(size);
  Put(bytes, 4, size);
  Put(bytes, 20, id);
  return bytes;
}

Bytes ConnectRequest() {
  return {0x12, 0x00, 0x00, 0x80, 0x28, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00,
          0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x6e, 0x1f, 0x49, 0x00, 0x01, 0x00, 0x00, 0x00,
          0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x11, 0x00};
}

Bytes SetPreferenceRequest(const std::string& domain, const std::string& key,
                           const std::string& value) {
  const auto size = static_cast<std::uint32_t>(value.size());
  Bytes bytes(568 + value.size());
  Put(bytes, 0, 0x80000000U);
  Put(bytes, 4, 568U);
  Put(bytes, 20, 8683555);
  Put(bytes, 24, 1U);
  bytes[39] = 1;
  Put(bytes, 40, size);
  PutText(bytes, 52, domain);
  PutText(bytes, 308, key);
  Put(bytes, 564, size);
  PutText(bytes, 568, value);
  return bytes;
}

Bytes OutOfLineReply(std::int32_t id, const std::string& content) {
  const auto size = static_cast<std::uint32_t>(content.size());
  Bytes reply(56 + content.size());
  Put(reply, 0, 0x80000000U);
  Put(reply, 4, 56U);
  Put(reply, 20, id + 100);
  Put(reply, 24, 1U);
  reply[36] = 1;
  reply[37] = 1;
  reply[39] = 1;
  Put(reply, 40, size);
  reply[48] = 1;
  Put(reply, 52, size);
  PutText(reply, 56, content);
  return reply;
}

void WireClient::sendConnect(const Bytes& request, bool askForCredentials) {
  PortPair own = MakePort();
  PortPair reply = MakePort();
  ownPort = std::move(own.receive);
  replyPort = std::move(reply.receive);
  FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const int on = askForCredentials ? 1 : 0;
  ::setsockopt(socket.get(), SOL_SOCKET, SO_PASSCRED, &on, sizeof on);
  const UnixSocketAddress address(servicePath_);
  if (const int error =
          SendTo(socket.get(), &address, request, {reply.send.get(), own.send.get()})) {
    throw std::runtime_error(std::string("connect could not be sent: ") + std::strerror(error));
  }
}

Bytes WireClient::takeConnectReply(bool wait) {
  Packet packet = wait ? AwaitPacket(replyPort.get()) : ReceivePacket(replyPort.get());
  if (!packet.descriptors.empty()) privatePort = std::move(packet.descriptors.front());
  return std::move(packet.bytes);
}

std::size_t OpenDescriptors() {
  platform::ForeignCloseQueue().sync([] {});
  DIR* folder = ::opendir("/proc/self/fd");
  std::size_t count = 0;
  while (folder && ::readdir(folder)) ++count;
  if (folder) ::closedir(folder);
  return count;
}

}  // namespace support
