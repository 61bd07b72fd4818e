// SPDX-License-Identifier: Apache-2.0
#include <sys/epoll.h>
#include <sys/socket.h>

#include <array>
#include <string>
#include <utility>

#include "Benchmarks/Transport/Peer.h"

namespace bench {

SocketDriver::SocketDriver(Child server, std::vector<FileDescriptor> sockets)
    : server_(std::move(server)),
      sockets_(std::move(sockets)),
      request_(TextRequest(kMeasuredRequest, std::array{std::string(255, 't')})) {
  if (sockets_.size() == 1) return;
  epoll_ = FileDescriptor(Check(::epoll_create1(EPOLL_CLOEXEC), "epoll_create1"));
  for (const FileDescriptor& socket : sockets_) {
    epoll_event event{.events = EPOLLIN, .data = {.fd = socket.get()}};
    Check(::epoll_ctl(epoll_.get(), EPOLL_CTL_ADD, socket.get(), &event), "epoll_ctl");
  }
}

SocketDriver::~SocketDriver() = default;

void SocketDriver::run(std::size_t calls) {
  if (sockets_.size() == 1) return runOne(calls);
  runAll(calls);
}

void SocketDriver::runOne(std::size_t calls) {
  std::array<std::byte, 512> reply;
  for (std::size_t call = 0; call < calls; ++call) {
    if (Call(sockets_.front(), request_, reply) != kReplySize) Fail("reply of another size");
  }
}

void SocketDriver::runAll(std::size_t calls) {
  std::array<std::byte, 512> reply;
  std::array<epoll_event, 64> events;
  std::size_t sent = 0;
  const auto send = [&](int socket) {
    if (sent == calls) return;
    ++sent;
    if (::send(socket, request_.data(), request_.size(), MSG_NOSIGNAL) < 0) Fail("send");
  };
  for (const FileDescriptor& socket : sockets_) send(socket.get());
  for (std::size_t received = 0; received < calls;) {
    const int ready =
        Check(::epoll_wait(epoll_.get(), events.data(), static_cast<int>(events.size()), -1),
              "epoll_wait");
    for (std::size_t index = 0; index < static_cast<std::size_t>(ready); ++index) {
      const int socket = events[index].data.fd;
      if (::recv(socket, reply.data(), reply.size(), 0) != kReplySize) Fail("recv");
      ++received;
      send(socket);
    }
  }
}

}  // namespace bench
