// SPDX-License-Identifier: Apache-2.0
//
// The event machinery behind RunLoop, for the files that implement sources. Nothing above this
// folder sees it.
#pragma once

#include <asio/io_context.hpp>
#include <asio/posix/stream_descriptor.hpp>
#include <asio/steady_timer.hpp>
#include <map>
#include <memory>
#include <mutex>

#include "Helper/Platform/RunLoop.h"

namespace platform {

struct RunLoop::Core {
  explicit Core(Clock& loopClock) : clock(loopClock), driver(context) {}

  Clock& clock;
  asio::io_context context;
  asio::steady_timer driver;   // wakes the loop for the earliest timer; used under `mutex`
  bool handledSource = false;  // the loop's thread only

  std::mutex mutex;
  bool stopRequested = false;
  std::multimap<TimePoint, std::shared_ptr<RunLoopTimer>> timers;
};

/// Watches one descriptor, which stays its owner's, until it is cancelled. The loop's thread only.
class DescriptorWatch {
 public:
  explicit DescriptorWatch(RunLoop& loop) : descriptor_(loop.core().context) {}
  ~DescriptorWatch() { cancel(); }
  DescriptorWatch(const DescriptorWatch&) = delete;
  DescriptorWatch& operator=(const DescriptorWatch&) = delete;

  /// False when the descriptor cannot be watched.
  [[nodiscard]] bool open(int descriptor) {
    asio::error_code error;
    descriptor_.assign(descriptor, error);
    return !error;
  }

  /// Calls `handler` once when the descriptor is readable or hung up; not after cancel().
  template <class Handler>
  void wait(Handler handler) {
    descriptor_.async_wait(asio::posix::descriptor_base::wait_read,
                           [handler = std::move(handler)](const asio::error_code& error) mutable {
                             if (!error) handler();
                           });
  }

  void cancel() {
    if (descriptor_.is_open()) (void)descriptor_.release();
  }

 private:
  asio::posix::stream_descriptor descriptor_;
};

}  // namespace platform
