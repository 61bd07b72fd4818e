// SPDX-License-Identifier: Apache-2.0
//
// Descriptors that another process made: how they are received and how they are given up. close(2)
// of the last one waits for what its maker chose (a socket that lingers, a file system of his own),
// so what may wait is closed on a queue that nothing else waits for. Any thread, no lock.
#pragma once

#include <sys/socket.h>

#include <array>
#include <cstddef>
#include <memory>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/WorkQueue.h"

namespace platform {

/// A descriptor that lives as long as its name or anybody who still uses it.
using SharedDescriptor = std::shared_ptr<const FileDescriptor>;

/// The queue on which foreign descriptors are closed.
[[nodiscard]] WorkQueue& ForeignCloseQueue();

/// Gives up any descriptor that came from another process. Never waits.
void CloseForeign(FileDescriptor descriptor);

/// Gives up one end of a connected pair of Unix sockets whose other end is another process's. Never
/// waits: closes at once where nothing lies unread in it, for what lies there may carry descriptors
/// that are closed with it. Nothing more can be sent to it, by whoever holds another copy, too.
void ClosePairEnd(FileDescriptor end);

/// Shares such an end; its last user gives it up as ClosePairEnd() does.
[[nodiscard]] SharedDescriptor SharePairEnd(FileDescriptor end);

/// The most descriptors that the kernel lets one message carry (unix(7), SCM_RIGHTS).
inline constexpr std::size_t kMaxDescriptorsOfMessage = 253;

/// Room for the control messages of one received message, so that the kernel drops no descriptor
/// itself, which would wait where we receive.
using ControlStorage =
    std::array<std::byte, CMSG_SPACE(sizeof(int) * kMaxDescriptorsOfMessage) +
                              CMSG_SPACE(sizeof(ucred)) + CMSG_SPACE(sizeof(int))>;

/// The descriptors that one message carried, in their order. Those that nobody took are given up
/// with this object.
class ForeignDescriptors {
 public:
  ForeignDescriptors() = default;
  ForeignDescriptors(const ForeignDescriptors&) = delete;
  ForeignDescriptors& operator=(const ForeignDescriptors&) = delete;
  ~ForeignDescriptors();

  /// Takes over what an SCM_RIGHTS control message holds; other control messages are passed over.
  void add(const cmsghdr& entry);
  /// The next descriptor, or an empty one when none is left.
  [[nodiscard]] FileDescriptor take();

 private:
  // As many as the room can hold, and left unset beyond `count_`: most messages carry none, and are
  // not to pay for them.
  std::array<int, sizeof(ControlStorage) / sizeof(int)> descriptors_;
  std::size_t count_ = 0;
  std::size_t next_ = 0;
};

}  // namespace platform
