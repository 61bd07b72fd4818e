// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/RunLoop.h"

#include <sys/eventfd.h>
#include <unistd.h>

#include <algorithm>
#include <utility>

#include "Helper/Platform/PollTimeout.h"
#include "Helper/Platform/RunLoopCore.h"

namespace platform {
namespace {

/// Longer than any machine runs, short enough not to overflow when it is added to a time point.
constexpr double kForeverSeconds = 100.0 * 366 * 86400;

thread_local RunLoop* currentLoop = nullptr;

class MonotonicClock final : public Clock {
 public:
  TimePoint now() const override { return std::chrono::steady_clock::now(); }
  bool passes() const override { return true; }
  bool providesTimers() const override { return true; }
};

}  // namespace

Clock& SystemClock() {
  static auto* clock = new MonotonicClock;  // never destroyed: other threads may ask at exit
  return *clock;
}

std::shared_ptr<RunLoopTimer> RunLoopTimer::Create(RunLoop& loop, TimePoint fireDate,
                                                   Callback callback, void* context) {
  if (!loop.clock().providesTimers()) return nullptr;
  return std::make_shared<RunLoopTimer>(loop, fireDate, callback, context);
}

void RunLoopTimer::invalidate() { loop_.remove(*this); }

DescriptorWatch::DescriptorWatch(RunLoop& loop, Handler handler, void* context)
    : loop_(loop), handler_(handler), context_(context) {}

bool DescriptorWatch::open(int descriptor) {
  epoll_event event{.events = EPOLLIN, .data = {.ptr = this}};
  if (::epoll_ctl(loop_.core().epoll.get(), EPOLL_CTL_ADD, descriptor, &event) != 0) return false;
  descriptor_ = descriptor;
  return true;
}

void DescriptorWatch::cancel() {
  const int descriptor = std::exchange(descriptor_, -1);
  if (descriptor < 0) return;
  RunLoop::Core& core = loop_.core();
  (void)::epoll_ctl(core.epoll.get(), EPOLL_CTL_DEL, descriptor, nullptr);
  for (std::size_t index = core.nextReady; index < core.readyCount; ++index) {
    if (core.ready[index].data.ptr == this) core.ready[index].data.ptr = nullptr;
  }
}

RunLoop::Core::Core(Clock& loopClock)
    : clock(loopClock),
      epoll(::epoll_create1(EPOLL_CLOEXEC)),
      wakeUp(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
  // A loop that did not get its two descriptors watches nothing: whoever opens a watch is told.
  epoll_event event{.events = EPOLLIN, .data = {.ptr = this}};
  (void)::epoll_ctl(epoll.get(), EPOLL_CTL_ADD, wakeUp.get(), &event);
}

void RunLoop::Core::collect(int milliseconds) {
  if (nextReady < readyCount) return;
  nextReady = 0;
  const int count =
      ::epoll_wait(epoll.get(), ready.data(), static_cast<int>(ready.size()), milliseconds);
  readyCount = count > 0 ? static_cast<std::size_t>(count) : 0;
}

bool RunLoop::Core::serveOne() {
  while (nextReady < readyCount) {
    void* const entry = ready[nextReady++].data.ptr;
    if (!entry) continue;  // cancelled since
    if (entry != this) {
      auto* watch = static_cast<DescriptorWatch*>(entry);
      watch->handler_(watch->context_);
      return true;
    }
    std::function<void()> work;
    {
      const std::lock_guard guard(mutex);
      if (!posted.empty()) {
        work = std::move(posted.front());
        posted.pop_front();
      }
      if (posted.empty()) {
        std::uint64_t count = 0;
        (void)!::read(wakeUp.get(), &count, sizeof count);  // empty already: nothing to take back
      }
    }
    if (work) work();
    return true;
  }
  return false;
}

void RunLoop::Core::wake() const {
  const std::uint64_t one = 1;
  (void)!::write(wakeUp.get(), &one, sizeof one);  // full: the loop is awake in any case
}

RunLoop::RunLoop(Clock& clock) : core_(std::make_unique<Core>(clock)) {}

RunLoop::~RunLoop() = default;

RunLoop& RunLoop::Current() {
  if (!currentLoop) {
    static thread_local RunLoop loop(SystemClock());
    currentLoop = &loop;
  }
  return *currentLoop;
}

ScopedCurrentRunLoop::ScopedCurrentRunLoop(RunLoop& loop)
    : previous_(std::exchange(currentLoop, &loop)) {}

ScopedCurrentRunLoop::~ScopedCurrentRunLoop() { currentLoop = previous_; }

RunResult RunLoop::run(double seconds) {
  const bool forever = !(seconds < kForeverSeconds);
  const TimePoint deadline =
      forever ? TimePoint::max()
              : std::chrono::steady_clock::now() +
                    std::chrono::duration_cast<Duration>(std::chrono::duration<double>(seconds));
  core_->handledSource = false;
  for (;;) {
    TimePoint firstTimer = TimePoint::max();
    {
      const std::lock_guard guard(core_->mutex);
      if (std::exchange(core_->stopRequested, false)) return RunResult::kStopped;
      if (!core_->timers.empty()) firstTimer = core_->timers.begin()->first;
    }
    if (firstTimer != TimePoint::max()) {
      if (firstTimer <= core_->clock.now()) {
        fireDueTimers();
        continue;  // one of them may have ended the run
      }
      if (!core_->clock.passes()) firstTimer = TimePoint::max();
    }
    core_->collect(MillisecondsUntil(std::min(firstTimer, deadline)));
    const bool served = core_->serveOne();
    if (core_->handledSource) return RunResult::kHandledSource;
    if (!served && !forever && std::chrono::steady_clock::now() >= deadline) {
      return RunResult::kTimedOut;
    }
  }
}

void RunLoop::stop() {
  {
    const std::lock_guard guard(core_->mutex);
    core_->stopRequested = true;
  }
  core_->wake();
}

void RunLoop::post(std::function<void()> work) {
  {
    const std::lock_guard guard(core_->mutex);
    core_->posted.push_back(std::move(work));
  }
  core_->wake();
}

void RunLoop::add(const std::shared_ptr<RunLoopTimer>& timer) {
  {
    const std::lock_guard guard(core_->mutex);
    core_->timers.emplace(timer->fireDate(), timer);
    if (core_->timers.begin()->second != timer) return;
  }
  core_->wake();  // the loop may be asleep until a later date
}

TimePoint RunLoop::now() const { return core_->clock.now(); }

Clock& RunLoop::clock() const { return core_->clock; }

void RunLoop::noteHandledSource() { core_->handledSource = true; }

void RunLoop::remove(const RunLoopTimer& timer) {
  const std::lock_guard guard(core_->mutex);
  const auto [first, last] = core_->timers.equal_range(timer.fireDate());
  for (auto entry = first; entry != last; ++entry) {
    if (entry->second.get() == &timer) {
      core_->timers.erase(entry);
      return;
    }
  }
}

void RunLoop::fireDueTimers() {
  for (;;) {
    std::shared_ptr<RunLoopTimer> due;
    {
      const std::lock_guard guard(core_->mutex);
      const auto first = core_->timers.begin();
      if (first == core_->timers.end() || first->first > core_->clock.now()) return;
      due = std::move(first->second);
      core_->timers.erase(first);
    }
    due->callback_(due.get(), due->context_);
  }
}

}  // namespace platform
