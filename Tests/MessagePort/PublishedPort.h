// SPDX-License-Identifier: Apache-2.0
//
// A named port as another process publishes it: a datagram socket in a folder. One thread.
#pragma once

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstddef>
#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/UnixSocketAddress.h"

namespace message_port_test {

class PublishedPort {
 public:
  explicit PublishedPort(std::string path, int type = SOCK_DGRAM)
      : path_(std::move(path)), socket_(::socket(AF_UNIX, type | SOCK_CLOEXEC, 0)) {
    const platform::UnixSocketAddress address(path_);
    EXPECT_TRUE(address);
    EXPECT_EQ(::bind(socket_.get(), address.get(), address.size()), 0);
  }
  ~PublishedPort() { ::unlink(path_.c_str()); }
  PublishedPort(const PublishedPort&) = delete;
  PublishedPort& operator=(const PublishedPort&) = delete;

  [[nodiscard]] int get() const { return socket_.get(); }

  /// Stops listening and leaves the file, as a process does that was killed.
  void abandon() { socket_.reset(); }

  /// The oldest datagram; empty when none waits.
  [[nodiscard]] std::vector<std::byte> take() const {
    std::vector<std::byte> datagram(std::size_t{256} << 10);
    const ssize_t length =
        ::recv(socket_.get(), datagram.data(), datagram.size(), MSG_DONTWAIT | MSG_TRUNC);
    datagram.resize(length < 0 ? 0 : static_cast<std::size_t>(length));
    return datagram;
  }

 private:
  const std::string path_;
  platform::FileDescriptor socket_;
};

}  // namespace message_port_test
