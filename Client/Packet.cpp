// SPDX-License-Identifier: Apache-2.0
//
// sendmsg(2), recvmsg(2) and unix(7) control messages.
#include "Client/Packet.h"

#include <poll.h>
#include <sys/ioctl.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstring>

namespace halvec {
namespace {

/// Room for two: the kernel rounds a buffer for one up to two anyway, and installs both.
union DescriptorBuffer {
  std::array<char, CMSG_SPACE(2 * sizeof(int))> bytes;
  cmsghdr alignment;
};

/// Takes the first descriptor of a received message and closes every other one.
void TakeDescriptors(msghdr& message, IncomingPacket& packet) {
  for (cmsghdr* control = CMSG_FIRSTHDR(&message); control != nullptr;
       control = CMSG_NXTHDR(&message, control)) {
    if (control->cmsg_level != SOL_SOCKET || control->cmsg_type != SCM_RIGHTS) continue;
    const std::size_t count = (control->cmsg_len - CMSG_LEN(0)) / sizeof(int);
    for (std::size_t index = 0; index < count; ++index) {
      int number = -1;
      std::memcpy(&number, CMSG_DATA(control) + index * sizeof number, sizeof number);
      platform::FileDescriptor received(number);
      if (!packet.descriptor) packet.descriptor = std::move(received);
    }
  }
  packet.lostDescriptors = (message.msg_flags & MSG_CTRUNC) != 0 && !packet.descriptor;
}

ssize_t ReceiveOnce(int socket, std::span<std::byte> message, std::span<std::byte> behind,
                    bool takeDescriptor, int flags, IncomingPacket& packet) {
  // Without a control buffer the kernel discards descriptors instead of installing them.
  if (!takeDescriptor && behind.empty()) {
    return ::recv(socket, message.data(), message.size(), flags | MSG_TRUNC);
  }
  std::array<iovec, 2> parts{{{message.data(), message.size()}, {behind.data(), behind.size()}}};
  DescriptorBuffer control;
  msghdr header{};
  header.msg_iov = parts.data();
  header.msg_iovlen = parts.size();
  header.msg_control = control.bytes.data();
  header.msg_controllen = control.bytes.size();
  const ssize_t length = ::recvmsg(socket, &header, flags | MSG_TRUNC | MSG_CMSG_CLOEXEC);
  if (length >= 0) TakeDescriptors(header, packet);
  return length;
}

bool IsHungUp(int socket) {
  pollfd entry{socket, 0, 0};
  return ::poll(&entry, 1, 0) == 1 && (entry.revents & POLLHUP) != 0;
}

int QueuedBytes(int socket) {
  int bytes = 0;
  return ::ioctl(socket, FIONREAD, &bytes) == 0 ? bytes : 0;
}

}  // namespace

int SendPacket(int socket, const OutgoingPacket& packet, int flags) {
  if (packet.behind.empty() && packet.descriptorCount == 0 && packet.destination == nullptr) {
    const ssize_t sent =
        ::send(socket, packet.message.data(), packet.message.size(), flags | MSG_NOSIGNAL);
    return sent < 0 ? errno : 0;
  }
  // sendmsg(2) takes pointers to non-const and writes through none of them.
  std::array<iovec, 2> parts{
      {{const_cast<std::byte*>(packet.message.data()), packet.message.size()},
       {const_cast<std::byte*>(packet.behind.data()), packet.behind.size()}}};
  DescriptorBuffer control{};
  msghdr header{};
  if (packet.destination != nullptr) {
    header.msg_name = const_cast<sockaddr*>(packet.destination->get());
    header.msg_namelen = packet.destination->size();
  }
  header.msg_iov = parts.data();
  header.msg_iovlen = packet.behind.empty() ? 1 : 2;
  if (packet.descriptorCount != 0) {
    const std::size_t size = packet.descriptorCount * sizeof(int);
    header.msg_control = control.bytes.data();
    header.msg_controllen = CMSG_SPACE(size);
    cmsghdr* rights = CMSG_FIRSTHDR(&header);
    rights->cmsg_level = SOL_SOCKET;
    rights->cmsg_type = SCM_RIGHTS;
    rights->cmsg_len = CMSG_LEN(size);
    std::memcpy(CMSG_DATA(rights), packet.descriptors.data(), size);
  }
  return ::sendmsg(socket, &header, flags | MSG_NOSIGNAL) < 0 ? errno : 0;
}

Arrival ReceivePacket(int socket, std::span<std::byte> message, std::span<std::byte> behind,
                      bool takeDescriptor, int flags, const Deadline& deadline,
                      IncomingPacket& packet) {
  for (;;) {
    const ssize_t length = ReceiveOnce(socket, message, behind, takeDescriptor, flags, packet);
    if (length > 0) {
      packet.length = static_cast<std::size_t>(length);
      return Arrival::kPacket;
    }
    if (length < 0 && errno == ECONNRESET) return Arrival::kNeverRead;
    if (length < 0 && errno != EAGAIN && errno != EINTR) {
      packet.error = errno;
      return Arrival::kFailed;
    }
    packet.descriptor.reset();
    if (length == 0) {
      // An empty packet looks like the end of file; only a hang-up with nothing queued is the end.
      if (IsHungUp(socket) && QueuedBytes(socket) == 0) return Arrival::kHangUp;
      if (deadline.remaining() == 0) return Arrival::kTimedOut;
    } else if (deadline.wait(socket, POLLIN) == 0) {
      return Arrival::kTimedOut;
    }
  }
}

}  // namespace halvec
