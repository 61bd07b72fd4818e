// SPDX-License-Identifier: Apache-2.0
//
// Watches a send right for the death of its port and says so once. A port is dead when nobody
// holds its receive right, when the process that sent the right has exited, or when something
// arrives on it: a client never writes to its own port, and one that does is cut off. Belongs to
// its run loop's thread.
#pragma once

#include <memory>

#include "Helper/Platform/Port.h"
#include "Helper/Platform/RunLoop.h"

namespace platform {

class PortWatcher : public std::enable_shared_from_this<PortWatcher> {
 public:
  using Callback = void (*)(PortWatcher* watcher, void* info);

  /// A watcher of the send right `port` on the calling thread's loop. `info` is passed to the
  /// invalidation callback. Null when the name holds no send right, or the loop cannot watch it.
  [[nodiscard]] static std::shared_ptr<PortWatcher> Create(PortName port, void* info);
  ~PortWatcher();
  PortWatcher(const PortWatcher&) = delete;
  PortWatcher& operator=(const PortWatcher&) = delete;

  /// Sets or clears what runs when the watcher becomes invalid. Runs it at once when the port is
  /// dead already.
  void setInvalidationCallback(Callback callback);
  /// Stops watching and runs the invalidation callback, if one is set. Harmless when repeated.
  void invalidate();
  [[nodiscard]] bool isValid() const { return valid_; }
  [[nodiscard]] PortName port() const { return port_; }

 private:
  struct Watches;
  PortWatcher(PortName port, void* info, SharedDescriptor socket, SharedDescriptor holder);
  [[nodiscard]] bool isDead() const;

  const PortName port_;
  void* const info_;
  const SharedDescriptor socket_;
  const SharedDescriptor holder_;  // pidfd; null when not known
  Callback callback_ = nullptr;
  bool valid_ = true;
  std::unique_ptr<Watches> watches_;
};

}  // namespace platform
