// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/WorkQueue.h"

#include <pthread.h>
#include <sys/prctl.h>

#include <algorithm>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <semaphore>
#include <system_error>
#include <utility>
#include <vector>

#include "Helper/Platform/CurrentWork.h"
#include "Helper/Platform/DetachedThread.h"

namespace platform {

struct TimerSource::State {
  TimePoint due;
  Duration interval;
  Duration leeway;
  WorkQueue::Work handler;
  bool pending = false;    // a tick has been submitted and has not begun
  bool cancelled = false;  // final
};

/// What a queue's handle, its timers and its thread share. Everything below `mutex` is guarded by
/// it.
struct WorkQueue::State : std::enable_shared_from_this<WorkQueue::State> {
  State(std::string queueLabel, Clock& queueClock)
      : label(std::move(queueLabel)), clock(queueClock) {}

  const std::string label;
  Clock& clock;

  std::mutex mutex;
  std::condition_variable changed;
  std::deque<Work> work;
  std::vector<std::shared_ptr<TimerSource::State>> timers;  // the resumed ones
  bool threadRuns = false;

  void submit(Work item);
  void startThread();
  void run();
  void submitDueTicks();
  void tick(const std::shared_ptr<TimerSource::State>& timer);
  void remove(TimerSource::State& timer);
  [[nodiscard]] TimePoint firstDue(Duration& leeway) const;
};

namespace {

/// The queue whose thread this is.
thread_local const void* currentQueue = nullptr;

/// The kernel keeps 15 bytes of a thread's name; the last part of a label tells queues apart.
void NameThread(const std::string& label) {
  const std::size_t dot = label.rfind('.');
  const std::string name = label.substr(dot == std::string::npos ? 0 : dot + 1).substr(0, 15);
  (void)::pthread_setname_np(::pthread_self(), name.c_str());
}

}  // namespace

void WorkQueue::State::submit(Work item) {
  const std::lock_guard guard(mutex);
  work.push_back(std::move(item));
  startThread();
}

/// With `mutex` held.
void WorkQueue::State::startThread() {
  changed.notify_one();
  if (threadRuns) return;
  try {
    StartDetachedThread([self = shared_from_this()] { self->run(); });
    threadRuns = true;
  } catch (const std::system_error&) {
    // No thread to be had now. The work stays, and the next submission tries again.
  }
}

/// With `mutex` held. A tick takes its place behind the work that waits, so that a handler slower
/// than its interval cannot keep other work from running.
void WorkQueue::State::submitDueTicks() {
  if (timers.empty()) return;  // the clock need not outlive the timers
  const TimePoint now = clock.now();
  for (const auto& timer : timers) {
    if (timer->pending || timer->due > now) continue;
    timer->pending = true;
    work.push_back([this, timer] { tick(timer); });
  }
}

void WorkQueue::State::tick(const std::shared_ptr<TimerSource::State>& timer) {
  {
    const std::lock_guard guard(mutex);
    timer->pending = false;
    if (timer->cancelled) return;
    const Duration late = clock.now() - timer->due;
    timer->due += (late / timer->interval + 1) * timer->interval;
  }
  timer->handler();
}

/// With `mutex` held.
void WorkQueue::State::remove(TimerSource::State& timer) {
  timer.cancelled = true;
  std::erase_if(timers, [&](const auto& each) { return each.get() == &timer; });
  changed.notify_one();
}

/// With `mutex` held: when the thread must wake for a timer, and how much later will do.
TimePoint WorkQueue::State::firstDue(Duration& leeway) const {
  TimePoint first = TimePoint::max();
  for (const auto& timer : timers) {
    if (timer->due >= first) continue;
    first = timer->due;
    leeway = timer->leeway;
  }
  return first;
}

void WorkQueue::State::run() {
  currentQueue = this;
  WorkOfThisThread().queue = label.c_str();
  NameThread(label);
  std::unique_lock guard(mutex);
  for (;;) {
    submitDueTicks();
    if (!work.empty()) {
      Work item = std::move(work.front());
      work.pop_front();
      guard.unlock();
      item();
      item = nullptr;  // what it holds goes on the queue too, without the lock
      guard.lock();
    } else if (timers.empty()) {
      threadRuns = false;
      return;
    } else if (clock.passes()) {
      Duration leeway{};
      const TimePoint due = firstDue(leeway);
      const auto nanoseconds = std::chrono::duration_cast<std::chrono::nanoseconds>(leeway).count();
      (void)::prctl(PR_SET_TIMERSLACK, std::max<long>(1, static_cast<long>(nanoseconds)));
      changed.wait_until(guard, due);
    } else {
      changed.wait(guard);
    }
  }
}

WorkQueue::WorkQueue(std::string label, Clock& clock)
    : state_(std::make_shared<State>(std::move(label), clock)) {}

WorkQueue::~WorkQueue() {
  const std::lock_guard guard(state_->mutex);
  while (!state_->timers.empty()) state_->remove(*state_->timers.back());
}

const std::string& WorkQueue::label() const { return state_->label; }

void WorkQueue::async(Work work) { state_->submit(std::move(work)); }

bool WorkQueue::tryAsync(Work work) {
  const std::lock_guard guard(state_->mutex);
  state_->startThread();
  if (!state_->threadRuns) return false;
  state_->work.push_back(std::move(work));
  return true;
}

void WorkQueue::sync(const Work& work) {
  std::binary_semaphore done(0);
  async([&] {
    work();
    done.release();
  });
  done.acquire();
}

bool WorkQueue::isCurrent() const { return currentQueue == state_.get(); }

TimePoint WorkQueue::now() const { return state_->clock.now(); }

void WorkQueue::noteClockMoved() {
  const std::lock_guard guard(state_->mutex);
  state_->submitDueTicks();
  if (!state_->work.empty()) state_->startThread();
}

TimerSource::TimerSource(WorkQueue& queue, TimePoint start, Duration interval, Duration leeway,
                         WorkQueue::Work handler)
    : queue_(queue.state_),
      state_(std::make_shared<State>(State{
          .due = start, .interval = interval, .leeway = leeway, .handler = std::move(handler)})) {}

TimerSource::~TimerSource() { cancel(); }

void TimerSource::resume() {
  const std::lock_guard guard(queue_->mutex);
  if (state_->cancelled ||
      std::find(queue_->timers.begin(), queue_->timers.end(), state_) != queue_->timers.end()) {
    return;
  }
  queue_->timers.push_back(state_);
  queue_->submitDueTicks();
  queue_->startThread();
}

void TimerSource::cancel() {
  const std::lock_guard guard(queue_->mutex);
  queue_->remove(*state_);
}

}  // namespace platform
