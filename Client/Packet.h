// SPDX-License-Identifier: Apache-2.0
//
// One packet out, one packet in, on the Unix sockets that stand for message ports. Every wait ends
// at a deadline, signals interrupt nothing, and no descriptor that arrives is ever lost. No state;
// any thread.
#pragma once

#include <array>
#include <cstddef>
#include <span>

#include "Client/Deadline.h"
#include "Client/Result.h"
#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/UnixSocketAddress.h"

namespace halvec {

/// A packet to send: the message, the bytes behind it, up to two descriptors to pass along.
struct OutgoingPacket {
  std::span<const std::byte> message;
  std::span<const std::byte> behind;
  std::array<int, 2> descriptors{-1, -1};
  std::size_t descriptorCount = 0;
  const platform::UnixSocketAddress* destination = nullptr;  // null on a connected socket
};

/// Sends without waiting. Answers 0 or an errno; the packet is sent whole or not at all.
[[nodiscard]] int SendPacket(int socket, const OutgoingPacket& packet, int flags);

/// What became of a wait for a packet.
enum class Arrival {
  kPacket,     // a packet is in the buffers
  kHangUp,     // the other end is closed and nothing is left to read
  kNeverRead,  // the other end was closed while a packet of ours still lay unread in its queue
  kTimedOut,
  kFailed  // see error
};

/// A packet that arrived.
struct IncomingPacket {
  std::size_t length = 0;               // of the whole packet, even where the buffers were shorter
  platform::FileDescriptor descriptor;  // the first that came along
  bool lostDescriptors = false;         // there were some for which this process had no room
  int error = 0;                        // errno with kFailed
};

/// Waits for a packet until `deadline`. It goes to `message` and what follows to `behind`. Only
/// with `takeDescriptor` is a descriptor accepted; all others are closed by the kernel or here.
/// Empty packets are skipped. `flags` is 0 for a socket whose own receive limit ends the wait,
/// which saves a system call, and MSG_DONTWAIT for any other.
[[nodiscard]] Arrival ReceivePacket(int socket, std::span<std::byte> message,
                                    std::span<std::byte> behind, bool takeDescriptor, int flags,
                                    const Deadline& deadline, IncomingPacket& packet);

}  // namespace halvec
