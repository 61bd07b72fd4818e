// SPDX-License-Identifier: Apache-2.0
//
// A local socket on which root watches the program: whoever connects receives one snapshot and then
// each event as it happens, and can ask for nothing. Belongs to its run loop's thread.
#pragma once

#include <cstddef>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "Helper/Platform/BoundPath.h"
#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/RunLoop.h"

namespace platform {

class ObserverChannel {
 public:
  using Snapshot = std::function<std::vector<std::byte>()>;

  /// Observers at one time; who comes later is turned away.
  static constexpr std::size_t kMaxObservers = 8;

  /// Listens at `path` (SOCK_SEQPACKET, mode 0600), replacing what an earlier process left there.
  /// `snapshot` gives the first packet of each observer. Null when the socket cannot be made. The
  /// path is removed with the channel, unless another process has bound its own there since.
  [[nodiscard]] static std::unique_ptr<ObserverChannel> Open(RunLoop& loop, const std::string& path,
                                                             Snapshot snapshot);
  ~ObserverChannel();
  ObserverChannel(const ObserverChannel&) = delete;
  ObserverChannel& operator=(const ObserverChannel&) = delete;

  [[nodiscard]] bool isObserved() const { return !observers_.empty(); }

  /// Sends one packet to every observer. One that does not read is dropped, not waited for.
  void publish(std::span<const std::byte> event);

 private:
  struct Watch;
  struct Observer;
  ObserverChannel(RunLoop& loop, FileDescriptor socket, const std::string& path, Snapshot snapshot);
  void accept();
  void pause();
  void resume();

  RunLoop& loop_;
  const FileDescriptor socket_;
  const BoundPath boundPath_;
  const Snapshot snapshot_;
  std::unique_ptr<Watch> watch_;
  std::shared_ptr<RunLoopTimer> pause_;  // ends it; null while the socket is watched
  std::vector<std::unique_ptr<Observer>> observers_;
};

}  // namespace platform
