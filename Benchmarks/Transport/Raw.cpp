// SPDX-License-Identifier: Apache-2.0
//
// Servers that do nothing but receive a packet and send one back.
#include <sys/epoll.h>
#include <sys/socket.h>

#include <array>

#include "Benchmarks/Transport/Peer.h"

namespace bench {
namespace {

void ServeBlocking(int socket) {
  std::array<std::byte, 4096> request;
  const std::array<std::byte, kReplySize> reply{};
  while (::recv(socket, request.data(), request.size(), 0) > 0) {
    if (::send(socket, reply.data(), reply.size(), MSG_NOSIGNAL) < 0) return;
  }
}

bool ServeOnce(int socket) {
  std::array<std::byte, 4096> request;
  const std::array<std::byte, kReplySize> reply{};
  alignas(cmsghdr) std::array<std::byte, CMSG_SPACE(sizeof(ucred))> control;
  iovec part{.iov_base = request.data(), .iov_len = request.size()};
  msghdr message{};
  message.msg_iov = &part;
  message.msg_iovlen = 1;
  message.msg_control = control.data();
  message.msg_controllen = control.size();
  if (::recvmsg(socket, &message, MSG_DONTWAIT | MSG_CMSG_CLOEXEC) <= 0) return false;
  return ::send(socket, reply.data(), reply.size(), MSG_DONTWAIT | MSG_NOSIGNAL) >= 0;
}

void ServeEpoll(const std::vector<FileDescriptor>& sockets, bool credentials) {
  const FileDescriptor epoll(Check(::epoll_create1(EPOLL_CLOEXEC), "epoll_create1"));
  for (const FileDescriptor& socket : sockets) {
    const int on = 1;
    if (credentials) {
      Check(::setsockopt(socket.get(), SOL_SOCKET, SO_PASSCRED, &on, sizeof on), "SO_PASSCRED");
    }
    epoll_event event{.events = EPOLLIN, .data = {.fd = socket.get()}};
    Check(::epoll_ctl(epoll.get(), EPOLL_CTL_ADD, socket.get(), &event), "epoll_ctl");
  }
  std::array<epoll_event, 64> events;
  for (;;) {
    const int ready = ::epoll_wait(epoll.get(), events.data(), static_cast<int>(events.size()), -1);
    for (std::size_t index = 0; ready > 0 && index < static_cast<std::size_t>(ready); ++index) {
      if (!ServeOnce(events[index].data.fd)) return;
    }
  }
}

}  // namespace

std::unique_ptr<Driver> StartRaw(const Placement& placement, std::size_t connections,
                                 RawServer kind) {
  std::vector<FileDescriptor> clients, servers;
  for (std::size_t index = 0; index < connections; ++index) {
    SocketPair pair = MakePair(SOCK_SEQPACKET);
    clients.push_back(std::move(pair.first));
    servers.push_back(std::move(pair.second));
  }
  Child server(placement.server, [&] {
    if (kind == RawServer::kBlocking) return ServeBlocking(servers.front().get());
    ServeEpoll(servers, kind == RawServer::kEpollCredentials);
  });
  return std::make_unique<SocketDriver>(std::move(server), std::move(clients));
}

}  // namespace bench
