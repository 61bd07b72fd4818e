// SPDX-License-Identifier: Apache-2.0
//
// Named message ports as datagram sockets in a directory, one file per port (unix(7)). Any thread;
// no state but the directory's name.
#pragma once

#include <memory>
#include <string>
#include <utility>

#include "Helper/Platform/MessagePort.h"

namespace platform {

class MessagePortSockets final : public MessagePorts {
 public:
  /// `directory` holds the sockets. Nothing is opened before the first handle.
  explicit MessagePortSockets(std::string directory) : directory_(std::move(directory)) {}

  /// The socket file itself is connected to: a symbolic link in its place is nobody's port, since
  /// whoever may publish a port could otherwise point the helper at any socket of the system.
  [[nodiscard]] std::unique_ptr<RemoteMessagePort> createRemote(const std::string& name) override;

 private:
  const std::string directory_;
};

}  // namespace platform
