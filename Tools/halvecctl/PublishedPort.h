// SPDX-License-Identifier: Apache-2.0
//
// A named message port of this program's own, for the helper's one-way messages. One thread.
#pragma once

#include <chrono>
#include <cstddef>
#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"

namespace halvecctl {

/// Waits until something is at `socket`. Throws Failure when nothing has come by `deadline`, or
/// when `helper`, a descriptor that shows when the helper goes away, hangs up.
void AwaitPacket(int socket, int helper, std::chrono::steady_clock::time_point deadline);

class PublishedPort {
 public:
  /// Publishes the port `name` beside the service socket at `servicePath`. Throws Failure when
  /// another program holds the name, or the socket cannot be made.
  PublishedPort(const std::string& servicePath, const std::string& name);
  ~PublishedPort();
  PublishedPort(const PublishedPort&) = delete;
  PublishedPort& operator=(const PublishedPort&) = delete;

  /// Borrowed, for what receive() does not do.
  [[nodiscard]] int descriptor() const { return socket_.get(); }

  /// The next datagram; waits for it as AwaitPacket() does.
  [[nodiscard]] std::vector<std::byte> receive(int helper,
                                               std::chrono::steady_clock::time_point deadline);

 private:
  const std::string path_;
  platform::FileDescriptor socket_;
};

}  // namespace halvecctl
