// SPDX-License-Identifier: Apache-2.0
//
// A descriptor whose last close takes ten minutes, unless it is refused that or the peer leaves: a
// connected TCP socket that lingers over bytes which nobody reads.
#pragma once

#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>

#include <cerrno>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"

namespace support {

class LingeringSocket {
 public:
  LingeringSocket() {
    const platform::FileDescriptor listener(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t length = sizeof address;
    auto* where = reinterpret_cast<sockaddr*>(&address);
    EXPECT_EQ(::bind(listener.get(), where, length), 0);
    EXPECT_EQ(::listen(listener.get(), 1), 0);
    EXPECT_EQ(::getsockname(listener.get(), where, &length), 0);
    socket_.reset(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    EXPECT_EQ(::connect(socket_.get(), where, length), 0);
    peer_.reset(::accept4(listener.get(), nullptr, nullptr, SOCK_CLOEXEC));
    const std::vector<char> bytes(1 << 16);
    while (::send(socket_.get(), bytes.data(), bytes.size(), MSG_DONTWAIT) > 0) {
    }
    EXPECT_EQ(errno, EAGAIN);
    constexpr linger kLong{.l_onoff = 1, .l_linger = 600};
    EXPECT_EQ(::setsockopt(socket_.get(), SOL_SOCKET, SO_LINGER, &kLong, sizeof kLong), 0);
  }
  ~LingeringSocket() { peer_.reset(); }  // first, so that nobody waits longer than the test
  LingeringSocket(const LingeringSocket&) = delete;
  LingeringSocket& operator=(const LingeringSocket&) = delete;

  [[nodiscard]] int get() const { return socket_.get(); }
  /// Leaves the last close to whoever holds another copy.
  void leave() { socket_.reset(); }

 private:
  platform::FileDescriptor socket_;
  platform::FileDescriptor peer_;
};

}  // namespace support
