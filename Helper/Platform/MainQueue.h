// SPDX-License-Identifier: Apache-2.0
//
// The main queue: work for the thread that serves requests, from any thread, in the order of
// posting. It is that thread's run loop, so nothing posted here runs inside the call that posts it.
// One lock guards which loop that is; it is never held while work runs.
#pragma once

#include <functional>

#include "Helper/Platform/RunLoop.h"

namespace platform {

/// Makes `loop` the main queue's loop while this object lives. One at a time.
class ScopedMainQueue {
 public:
  explicit ScopedMainQueue(RunLoop& loop);
  ~ScopedMainQueue();
  ScopedMainQueue(const ScopedMainQueue&) = delete;
  ScopedMainQueue& operator=(const ScopedMainQueue&) = delete;
};

/// Runs `work` on the main queue. Dropped when the queue has no loop: nothing is served any more.
void PostToMainQueue(std::function<void()> work);

/// Runs `work` on the main queue once `delay` has passed on its loop's clock. It cannot be
/// cancelled. Dropped as above.
void PostToMainQueueAfter(Duration delay, std::function<void()> work);

}  // namespace platform
