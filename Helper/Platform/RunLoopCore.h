// SPDX-License-Identifier: Apache-2.0
//
// The event machinery behind RunLoop, for the files that implement sources. Nothing above this
// folder sees it. One epoll instance, level-triggered: a descriptor is registered once and costs no
// further call per event, however often it becomes ready.
#pragma once

#include <sys/epoll.h>

#include <array>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/RunLoop.h"

namespace platform {

/// Watches one descriptor, which stays its owner's, from open() until it is cancelled. The loop's
/// thread only.
class DescriptorWatch {
 public:
  using Handler = void (*)(void* context);

  /// `handler` runs each time the loop finds the descriptor readable or hung up. It may cancel or
  /// destroy this watch.
  DescriptorWatch(RunLoop& loop, Handler handler, void* context);
  ~DescriptorWatch() { cancel(); }
  DescriptorWatch(const DescriptorWatch&) = delete;
  DescriptorWatch& operator=(const DescriptorWatch&) = delete;

  /// False when the descriptor cannot be watched.
  [[nodiscard]] bool open(int descriptor);
  void cancel();

 private:
  friend class RunLoop;
  RunLoop& loop_;
  const Handler handler_;
  void* const context_;
  int descriptor_ = -1;
};

struct RunLoop::Core {
  explicit Core(Clock& loopClock);

  /// Waits until something is ready (`milliseconds` as epoll_wait takes them) unless something
  /// still is from the last time.
  void collect(int milliseconds);
  /// Serves one ready descriptor or one piece of posted work. False when there is none.
  bool serveOne();
  /// Interrupts a wait. Any thread.
  void wake() const;

  Clock& clock;
  FileDescriptor epoll;
  FileDescriptor wakeUp;       // an event counter: readable when another thread wants the loop
  bool handledSource = false;  // the loop's thread only

  // Ready descriptors that have not been served yet; the loop's thread only. A watch that is
  // cancelled takes itself out.
  std::array<epoll_event, 64> ready;
  std::size_t nextReady = 0;
  std::size_t readyCount = 0;

  std::mutex mutex;
  bool stopRequested = false;
  std::deque<std::function<void()>> posted;
  std::multimap<TimePoint, std::shared_ptr<RunLoopTimer>> timers;
};

}  // namespace platform
