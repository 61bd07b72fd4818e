// SPDX-License-Identifier: Apache-2.0
//
// Named message ports as datagram sockets in a directory, one file per port (unix(7)). Any thread;
// no state but the directory's name.
#pragma once

#include <memory>
#include <string>
#include <utility>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/MessagePort.h"

namespace platform {

/// A socket that sends to the port `name` in `directory`; empty when nobody has published it, or
/// when `name` is no port name. The socket file itself is connected to: a symbolic link in its
/// place is nobody's port, since whoever may publish a port could otherwise point the helper at any
/// socket of the system.
[[nodiscard]] FileDescriptor ConnectToNamedPort(const std::string& directory,
                                                const std::string& name);

class MessagePortSockets final : public MessagePorts {
 public:
  /// `directory` holds the sockets. Nothing is opened before the first handle.
  explicit MessagePortSockets(std::string directory) : directory_(std::move(directory)) {}

  [[nodiscard]] std::unique_ptr<RemoteMessagePort> createRemote(const std::string& name) override;

 private:
  const std::string directory_;
};

}  // namespace platform
