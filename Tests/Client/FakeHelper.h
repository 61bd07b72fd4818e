// SPDX-License-Identifier: Apache-2.0
//
// The helper's side of the wire for client tests, written from the description of the transport
// with literal bytes: it shares no code with the library. Not thread-safe; the connect thread ends
// before connect() returns.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"

namespace fake {

using platform::FileDescriptor;

/// Bytes that can be joined with +.
struct Bytes : std::vector<std::uint8_t> {
  using vector::vector;
};

/// Bytes from hexadecimal text; spaces are ignored.
[[nodiscard]] Bytes Hex(std::string_view text);
/// `size` zero bytes.
[[nodiscard]] Bytes Zeros(std::size_t size);
/// A text and zeros up to `size`.
[[nodiscard]] Bytes Slot(std::size_t size, std::string_view text);
[[nodiscard]] Bytes Text(std::string_view text);
[[nodiscard]] Bytes operator+(Bytes left, const Bytes& right);
/// A 32-bit number, little endian.
[[nodiscard]] Bytes Word(std::uint32_t value);
[[nodiscard]] std::string ToHex(const Bytes& bytes);

/// A packet as it arrived, with every descriptor that came along.
struct Packet {
  Bytes bytes;
  std::vector<FileDescriptor> descriptors;
  pid_t senderPid = 0;  // 0 unless the kernel attested it
};

/// Waits for a packet and receives it; an empty packet after 10 seconds without one.
[[nodiscard]] Packet Receive(int socket);
/// Sends a packet with descriptors.
void Send(int socket, const Bytes& bytes, const std::vector<int>& descriptors = {});
/// A connected pair of sockets of `type`.
[[nodiscard]] std::pair<FileDescriptor, FileDescriptor> MakePair(int type);
/// A memfd with `content`, sealed against what `seals` names.
[[nodiscard]] FileDescriptor MakeMemory(const Bytes& content, int seals);
inline constexpr int kAllSeals = 2 | 4 | 8;  // shrink, grow, write

/// A reply without results, 36 bytes. `id` is the reply's own.
[[nodiscard]] Bytes PlainReply(std::uint32_t id, std::int32_t code);
/// A reply with data, 56 bytes, without the data itself.
[[nodiscard]] Bytes DataReply(std::uint32_t id, std::uint32_t address, std::uint32_t size);
/// The 40 bytes that answer a connect.
[[nodiscard]] Bytes ConnectReply();
/// The 40 bytes that ask for a connection.
[[nodiscard]] Bytes ConnectRequest();

/// A service socket in a folder of its own.
class Service {
 public:
  Service();
  ~Service();
  Service(const Service&) = delete;
  Service& operator=(const Service&) = delete;

  [[nodiscard]] const std::string& path() const { return path_; }
  [[nodiscard]] int socket() const { return socket_.get(); }
  /// Closes the socket; its name stays.
  void close() { socket_.reset(); }
  /// Removes the name and binds anew.
  void bind();

 private:
  std::string folder_;
  std::string path_;
  FileDescriptor socket_;
};

/// What the helper holds of a connected client.
struct Connection {
  FileDescriptor clientPort;   // send right to the client's own port
  FileDescriptor privatePort;  // receive right of the private port
  FileDescriptor sendRight;    // the helper's own copy of the client's end
};

/// Receives a connect and answers it with success.
[[nodiscard]] Connection Accept(int service);

/// Receives a connect and answers it with `reply` and `descriptors`.
void AnswerConnect(int service, const Bytes& reply, const std::vector<int>& descriptors = {});

/// Runs `body` in a thread that ends before this object does.
class Beside {
 public:
  explicit Beside(std::function<void()> body) : thread_(std::move(body)) {}
  ~Beside() { join(); }
  Beside(const Beside&) = delete;
  Beside& operator=(const Beside&) = delete;
  void join() {
    if (thread_.joinable()) thread_.join();
  }

 private:
  std::thread thread_;
};

/// Fails the test if this process holds another number of descriptors at the end than at the start.
class DescriptorBalance {
 public:
  DescriptorBalance();
  ~DescriptorBalance();
  DescriptorBalance(const DescriptorBalance&) = delete;
  DescriptorBalance& operator=(const DescriptorBalance&) = delete;

 private:
  std::size_t before_;
};

}  // namespace fake
