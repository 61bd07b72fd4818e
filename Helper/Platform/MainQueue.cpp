// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/MainQueue.h"

#include <memory>
#include <mutex>
#include <utility>

namespace platform {
namespace {

/// Never destroyed: other threads may post while the process exits.
struct MainQueue {
  std::mutex mutex;
  RunLoop* loop = nullptr;

  static MainQueue& Instance() {
    static auto* queue = new MainQueue;
    return *queue;
  }

  void set(RunLoop* newLoop) {
    const std::lock_guard guard(mutex);
    loop = newLoop;
  }
};

/// A timer and the work it runs, one allocation: whoever holds the timer holds the work.
struct DelayedWork {
  DelayedWork(RunLoop& loop, TimePoint fireDate, std::function<void()> delayedWork)
      : work(std::move(delayedWork)), timer(loop, fireDate, Run, this) {}

  static void Run(RunLoopTimer* /*timer*/, void* context) {
    static_cast<DelayedWork*>(context)->work();
  }

  const std::function<void()> work;
  RunLoopTimer timer;
};

}  // namespace

ScopedMainQueue::ScopedMainQueue(RunLoop& loop) { MainQueue::Instance().set(&loop); }

ScopedMainQueue::~ScopedMainQueue() { MainQueue::Instance().set(nullptr); }

void PostToMainQueue(std::function<void()> work) {
  MainQueue& queue = MainQueue::Instance();
  const std::lock_guard guard(queue.mutex);
  if (queue.loop) queue.loop->post(std::move(work));
}

void PostToMainQueueAfter(Duration delay, std::function<void()> work) {
  MainQueue& queue = MainQueue::Instance();
  const std::lock_guard guard(queue.mutex);
  if (!queue.loop) return;
  const auto delayed =
      std::make_shared<DelayedWork>(*queue.loop, queue.loop->now() + delay, std::move(work));
  queue.loop->add(std::shared_ptr<RunLoopTimer>(delayed, &delayed->timer));
}

}  // namespace platform
