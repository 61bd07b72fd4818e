// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/RunLoop.h"

#include <asio/post.hpp>
#include <utility>

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
  static MonotonicClock clock;
  return clock;
}

std::shared_ptr<RunLoopTimer> RunLoopTimer::Create(RunLoop& loop, TimePoint fireDate,
                                                   Callback callback, void* context) {
  if (!loop.clock().providesTimers()) return nullptr;
  return std::make_shared<RunLoopTimer>(loop, fireDate, callback, context);
}

void RunLoopTimer::invalidate() { loop_.remove(*this); }

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
  // The loop outlives moments without any source: it waits for posted work and timers then.
  const auto work = asio::make_work_guard(core_->context);
  core_->handledSource = false;
  for (;;) {
    core_->context.restart();
    fireDueTimers();
    {
      const std::lock_guard guard(core_->mutex);
      if (std::exchange(core_->stopRequested, false)) return RunResult::kStopped;
    }
    const std::size_t ran = forever          ? core_->context.run_one()
                            : seconds <= 0.0 ? core_->context.poll_one()
                                             : core_->context.run_one_until(deadline);
    if (core_->handledSource) return RunResult::kHandledSource;
    if (ran == 0 && !core_->context.stopped()) return RunResult::kTimedOut;
  }
}

void RunLoop::stop() {
  {
    const std::lock_guard guard(core_->mutex);
    core_->stopRequested = true;
  }
  core_->context.stop();
}

void RunLoop::post(std::function<void()> work) { asio::post(core_->context, std::move(work)); }

void RunLoop::add(const std::shared_ptr<RunLoopTimer>& timer) {
  const std::lock_guard guard(core_->mutex);
  core_->timers.emplace(timer->fireDate(), timer);
  armDriver();
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

/// With the lock held. The driver only wakes the loop, which then looks for itself what is due: a
/// driver that fires although its timer has been taken back does no harm.
void RunLoop::armDriver() {
  if (core_->timers.empty() || !core_->clock.passes()) return;
  const TimePoint first = core_->timers.begin()->first;
  if (core_->driver.expiry() == first) return;
  core_->driver.expires_at(first);
  core_->driver.async_wait([this](const asio::error_code& error) {
    if (error) return;
    fireDueTimers();
    const std::lock_guard guard(core_->mutex);
    armDriver();
  });
}

}  // namespace platform
