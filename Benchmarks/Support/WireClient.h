// SPDX-License-Identifier: Apache-2.0
//
// The smallest client of the helper: raw bytes on raw sockets, as Documentation/transport.md
// describes them. One thread; every call waits for its answer.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"

namespace bench {

using platform::FileDescriptor;

struct SocketPair {
  FileDescriptor first, second;
};
[[nodiscard]] SocketPair MakePair(int type);

/// Binds a datagram socket at `path` as a service launcher does: credentials on.
[[nodiscard]] FileDescriptor BindService(const std::string& path);

/// A connect that has been sent and not been answered yet.
struct PendingConnect {
  FileDescriptor clientPort, replyPort;
};
[[nodiscard]] PendingConnect SendConnect(const std::string& servicePath);

/// A connection: it lasts as long as the client's own port.
struct WireClient {
  FileDescriptor clientPort, privatePort;
};
/// Waits for the answer of a connect. Ends the program with a message when it is a refusal.
[[nodiscard]] WireClient FinishConnect(PendingConnect pending);
[[nodiscard]] WireClient Connect(const std::string& servicePath);

/// Connects once with patience: the server may still be starting.
void AwaitService(const std::string& servicePath);

/// A request whose arguments are texts in slots of 256 bytes.
[[nodiscard]] std::vector<std::byte> TextRequest(std::int32_t id,
                                                 std::span<const std::string> texts);

/// Sends a request and returns the reply's bytes in `reply`. Ends the program when the other side
/// is gone.
std::size_t Call(const FileDescriptor& port, std::span<const std::byte> request,
                 std::span<std::byte> reply);

/// The same for the request that sets a preference: `value` travels out of line, behind the message
/// up to 131072 bytes and in a sealed memfd above. The return code.
std::int32_t SetPreference(const FileDescriptor& port, const std::string& domain,
                           const std::string& key, std::span<const std::byte> value);

/// A memfd that holds `bytes` and can be changed by nobody any more.
[[nodiscard]] FileDescriptor SealedMemory(std::span<const std::byte> bytes);

/// Sends one packet with at most two descriptors, to the socket bound at `path` unless that is
/// empty. False when the socket refuses.
bool SendWithDescriptors(int socket, std::span<const std::span<const std::byte>> parts,
                         std::span<const int> descriptors, const std::string& path = {});
/// Receives one packet with at most one descriptor.
std::size_t ReceiveWithDescriptor(int socket, std::span<std::byte> bytes, FileDescriptor& received);

}  // namespace bench
