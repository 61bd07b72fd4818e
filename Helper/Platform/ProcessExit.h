// SPDX-License-Identifier: Apache-2.0
//
// Process-exit sources: run a handler once on the global queue when a process has exited. Any
// thread may create, resume and cancel; handlers never run under this file's lock.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {

class ProcessExitSource : public std::enable_shared_from_this<ProcessExitSource> {
 public:
  /// A suspended source for `process`, whose version tells it from an earlier or later process
  /// with the same id. Null when it has exited or cannot be watched.
  [[nodiscard]] static std::shared_ptr<ProcessExitSource> Create(pid_t process,
                                                                 std::uint32_t version);

  /// Both are set before resume(). The event handler runs at most once; the cancel handler runs
  /// once after cancel(), on the global queue, and is destroyed then.
  void setEventHandler(std::function<void()> handler);
  void setCancelHandler(std::function<void()> handler);
  void resume();

  /// Ends the source: an event that has not been delivered is dropped.
  void cancel();

 private:
  friend void DeliverPendingProcessExits();
  explicit ProcessExitSource(FileDescriptor pidfd);
  void deliver();

  const FileDescriptor pidfd_;
  std::mutex delivery_;  // held while the event handler runs; taken before mutex_
  std::mutex mutex_;     // guards the handlers
  std::function<void()> eventHandler_;
  std::function<void()> cancelHandler_;
  struct Watch;
  std::shared_ptr<Watch> watch_;
};

/// Runs the handlers of all resumed sources whose process has exited, on the calling thread, and
/// waits for those that the global queue is running. After it returns, no exit that lies before the
/// call is unknown to anybody.
void DeliverPendingProcessExits();

}  // namespace platform
