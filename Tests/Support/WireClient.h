// SPDX-License-Identifier: Apache-2.0
//
// Raw messages over raw sockets for tests: literal bytes out, literal bytes in. Shares no code with
// the port layer or the client library, so that it can bear witness against both.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"

namespace support {

using Bytes = std::vector<std::uint8_t>;
using platform::FileDescriptor;

/// Writes `value` little endian at `offset`.
template <class T>
void Put(Bytes& bytes, std::size_t offset, T value) {
  std::memcpy(bytes.data() + offset, &value, sizeof value);
}
template <class T>
[[nodiscard]] T Get(const Bytes& bytes, std::size_t offset) {
  T value{};
  if (offset + sizeof value <= bytes.size())
    std::memcpy(&value, bytes.data() + offset, sizeof value);
  return value;
}
void PutText(Bytes& bytes, std::size_t offset, const std::string& text);

/// The two ends of a fresh port.
struct PortPair {
  FileDescriptor receive;
  FileDescriptor send;
};
[[nodiscard]] PortPair MakePort();

/// Sends one packet with descriptors; the errno, or 0.
int SendPacket(int socket, const Bytes& bytes, const std::vector<int>& descriptors = {});

struct Packet {
  Bytes bytes;  // empty when nothing is there
  std::vector<FileDescriptor> descriptors;
};
/// Takes one packet without waiting.
[[nodiscard]] Packet ReceivePacket(int socket);
/// The same, waiting up to 20 s for it: for processes that answer in their own time.
[[nodiscard]] Packet AwaitPacket(int socket);

/// Whether the other side of `socket` is gone.
[[nodiscard]] bool IsHungUp(int socket);

/// A service port as a launcher holds it, handed over to this process by the launcher's variables.
class LauncherSocket {
 public:
  explicit LauncherSocket(const std::string& serviceName, bool passCredentials = true);
  ~LauncherSocket();
  LauncherSocket(const LauncherSocket&) = delete;
  LauncherSocket& operator=(const LauncherSocket&) = delete;
  [[nodiscard]] const std::string& path() const { return path_; }
  /// The launcher's own copy of the socket.
  [[nodiscard]] int get() const { return socket_.get(); }

 private:
  std::string directory_;
  std::string path_;
  FileDescriptor socket_;
};

/// The 40 bytes of a good connect request.
[[nodiscard]] Bytes ConnectRequest();
/// A header of `size` bytes' message with `id`, zero-filled up to `size`.
[[nodiscard]] Bytes Message(std::int32_t id, std::uint32_t size);

/// A SetPreferenceValue request with `value` behind it.
[[nodiscard]] Bytes SetPreferenceRequest(const std::string& domain, const std::string& key,
                                         const std::string& value);

/// The successful reply to request `id` that carries `content` behind it.
[[nodiscard]] Bytes OutOfLineReply(std::int32_t id, const std::string& content);

/// One client as it appears to the service: sends connects, keeps its own port and its private one.
class WireClient {
 public:
  explicit WireClient(std::string servicePath) : servicePath_(std::move(servicePath)) {}

  /// Sends a connect made of `request`; the reply is read with takeConnectReply().
  void sendConnect(const Bytes& request = ConnectRequest(), bool askForCredentials = true);
  /// Reads the connect reply that has arrived; keeps the private port it carries.
  Bytes takeConnectReply(bool wait = false);

  FileDescriptor ownPort;      // the receive right whose death ends the connection
  FileDescriptor replyPort;    // where the connect reply arrives
  FileDescriptor privatePort;  // where requests go

 private:
  std::string servicePath_;
};

/// How many descriptors this process has open once those that it gave up are closed.
[[nodiscard]] std::size_t OpenDescriptors();

}  // namespace support
