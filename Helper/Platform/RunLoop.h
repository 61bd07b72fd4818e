// SPDX-License-Identifier: Apache-2.0
//
// A run loop and its one-shot timers. Sources, timers and posted work are served on the thread that
// runs the loop. Sources belong to that thread; timers, post() and stop() may be used from any
// thread. The loop's own lock guards its timer table only and is never held while a callback runs.
#pragma once

#include <functional>
#include <memory>

#include "Helper/Platform/Clock.h"

namespace platform {

class RunLoop;

/// A one-shot timer. Fires at most once, never after invalidate() has returned on the loop's
/// thread.
class RunLoopTimer {
 public:
  using Callback = void (*)(RunLoopTimer* timer, void* context);

  /// A timer that is due at `fireDate` once it is added to a loop. Null when none can be made.
  [[nodiscard]] static std::shared_ptr<RunLoopTimer> Create(RunLoop& loop, TimePoint fireDate,
                                                            Callback callback, void* context);
  /// Takes the timer out of its loop. Harmless when repeated.
  void invalidate();
  [[nodiscard]] TimePoint fireDate() const { return fireDate_; }

  RunLoopTimer(RunLoop& loop, TimePoint fireDate, Callback callback, void* context)
      : loop_(loop), fireDate_(fireDate), callback_(callback), context_(context) {}

 private:
  friend class RunLoop;
  RunLoop& loop_;
  const TimePoint fireDate_;
  const Callback callback_;
  void* const context_;
};

/// Why run() returned.
enum class RunResult : int { kStopped = 2, kTimedOut = 3, kHandledSource = 4 };

class RunLoop {
 public:
  explicit RunLoop(Clock& clock);
  ~RunLoop();
  RunLoop(const RunLoop&) = delete;
  RunLoop& operator=(const RunLoop&) = delete;

  /// The loop of the calling thread; made on first use with the system's clock.
  [[nodiscard]] static RunLoop& Current();

  /// Serves the loop for `seconds` (0: only what is ready; anything beyond a century: for ever), or
  /// until stop(), or until one source has been handled.
  RunResult run(double seconds);

  /// Ends the current run(), or the next one when none is under way.
  void stop();

  /// Runs `work` on the loop's thread, never inside this call.
  void post(std::function<void()> work);

  /// Starts `timer`. Keeps it until it fires or is invalidated.
  void add(const std::shared_ptr<RunLoopTimer>& timer);

  [[nodiscard]] TimePoint now() const;
  [[nodiscard]] Clock& clock() const;

  /// For sources: the machinery behind the loop, and the word that one has been handled.
  struct Core;
  [[nodiscard]] Core& core() { return *core_; }
  void noteHandledSource();

 private:
  friend class RunLoopTimer;
  friend class ScopedCurrentRunLoop;
  void remove(const RunLoopTimer& timer);
  void fireDueTimers();

  std::unique_ptr<Core> core_;
};

/// Makes `loop` the calling thread's loop while this object lives.
class ScopedCurrentRunLoop {
 public:
  explicit ScopedCurrentRunLoop(RunLoop& loop);
  ~ScopedCurrentRunLoop();
  ScopedCurrentRunLoop(const ScopedCurrentRunLoop&) = delete;
  ScopedCurrentRunLoop& operator=(const ScopedCurrentRunLoop&) = delete;

 private:
  RunLoop* previous_;
};

}  // namespace platform
