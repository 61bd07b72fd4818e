// SPDX-License-Identifier: Apache-2.0
//
// The sending side of named message ports, and the provider that uses those of this system.
#include "Helper/Platform/Linux/MessagePortSocket.h"
#include "Helper/Platform/UnixSocketAddress.h"

#include <fcntl.h>
#include <sys/socket.h>

#include <cerrno>
#include <vector>

#include "Helper/Shared/Interface/OneWayMessage.h"

namespace platform {
namespace {

class RemoteSocket final : public RemoteMessagePort {
 public:
  explicit RemoteSocket(FileDescriptor socket) : socket_(std::move(socket)) {}

  bool sendRequest(std::int32_t messageId, std::span<const std::byte> payload) override {
    if (payload.size() > wire::kOneWayPayloadLimit) return false;
    const std::vector<std::byte> datagram =
        wire::EncodeOneWay({.id = messageId, .payload = payload});
    ssize_t sent = -1;
    do {
      sent = ::send(socket_.get(), datagram.data(), datagram.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
    } while (sent < 0 && errno == EINTR);
    return sent >= 0;
  }

 private:
  const FileDescriptor socket_;
};

bool IsPortName(const std::string& name) {
  return !name.empty() && name.front() != '.' && name.find('/') == std::string::npos &&
         name.find('\0') == std::string::npos;
}

/// Connects to the socket file that `file` names, whatever stands at its path by now.
bool ConnectToFile(int socket, int file) {
  const UnixSocketAddress address("/proc/self/fd/" + std::to_string(file));
  return ::connect(socket, address.get(), address.size()) == 0;
}

}  // namespace

FileDescriptor ConnectToNamedPort(const std::string& directory, const std::string& name) {
  if (!IsPortName(name)) return {};
  const std::string path = directory + "/" + name;
  const FileDescriptor file(::open(path.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC));
  if (!file) return {};
  FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  if (!socket || !ConnectToFile(socket.get(), file.get())) return {};
  return socket;
}

std::unique_ptr<RemoteMessagePort> MessagePortSockets::createRemote(const std::string& name) {
  FileDescriptor socket = ConnectToNamedPort(directory_, name);
  if (!socket) return nullptr;
  return std::make_unique<RemoteSocket>(std::move(socket));
}

template <>
MessagePorts& DefaultProvider<MessagePorts>() {
  static MessagePorts& ports = *new MessagePortSockets(HALVEC_PORTS_DIRECTORY);
  return ports;
}

}  // namespace platform
