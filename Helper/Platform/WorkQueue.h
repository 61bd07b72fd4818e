// SPDX-License-Identifier: Apache-2.0
//
// Serial work queues and their repeating timers. A queue runs one piece of work at a time, in the
// order of submission, on a thread of its own that exists only while there is work or a timer: an
// idle queue costs no thread. Any thread may call; a queue's lock is never held while work runs.
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "Helper/Platform/Clock.h"

namespace platform {

class TimerSource;

class WorkQueue {
 public:
  using Work = std::function<void()>;

  /// `label` names the queue for people. `clock` drives its timers and outlives them.
  explicit WorkQueue(std::string label, Clock& clock = SystemClock());
  /// Gives the queue up: what has been submitted still runs, timers end. May happen on the queue.
  ~WorkQueue();
  WorkQueue(const WorkQueue&) = delete;
  WorkQueue& operator=(const WorkQueue&) = delete;

  [[nodiscard]] const std::string& label() const;

  /// Runs `work` on the queue after all that was submitted before, never inside this call. Where
  /// the system refuses a thread the work waits for the next submission.
  void async(Work work);

  /// As async(), for work that somebody waits for: false, and `work` is not kept, where the system
  /// refuses the thread that would run it.
  [[nodiscard]] bool tryAsync(Work work);

  /// Runs `work` on the queue and returns when it has run. Not from the queue itself.
  void sync(const Work& work);

  /// Whether the calling code runs on this queue.
  [[nodiscard]] bool isCurrent() const;

  /// The time by the queue's clock.
  [[nodiscard]] TimePoint now() const;

  /// Submits the ticks that are due by now. For clocks that do not pass by themselves.
  void noteClockMoved();

 private:
  friend class TimerSource;
  struct State;
  std::shared_ptr<State> state_;
};

/// A repeating timer whose handler runs on a queue. Ticks that fall due while the queue is busy are
/// coalesced into one; the phase stays that of the first tick.
class TimerSource {
 public:
  /// A timer that ticks first at `start` and then every `interval` (> 0); idle until resume(). The
  /// kernel may be up to `leeway` late.
  TimerSource(WorkQueue& queue, TimePoint start, Duration interval, Duration leeway,
              WorkQueue::Work handler);
  /// As cancel().
  ~TimerSource();
  TimerSource(const TimerSource&) = delete;
  TimerSource& operator=(const TimerSource&) = delete;

  /// Starts ticking; at once when `start` has passed. Harmless when repeated.
  void resume();
  /// Ends the timer. Called on the queue, its handler never runs again; called elsewhere, a run
  /// that is under way ends on its own.
  void cancel();

 private:
  friend class WorkQueue;
  struct State;
  const std::shared_ptr<WorkQueue::State> queue_;
  const std::shared_ptr<State> state_;
};

}  // namespace platform
