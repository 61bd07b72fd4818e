// SPDX-License-Identifier: Apache-2.0
//
// One epoll set and a list of deadlines: everything that the handset's first process waits for.
// One thread, no lock; actions run on the thread that called run().
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>

#include "Helper/Platform/FileDescriptor.h"

namespace handset {

class EventLoop {
 public:
  using Clock = std::chrono::steady_clock;
  /// Names one watch or one deadline; never reused, 0 is none.
  using Ticket = std::uint64_t;

  /// Throws Failure where the kernel gives no epoll descriptor.
  EventLoop();

  /// Calls `action` with the ready events (EPOLLIN ...) while `descriptor`, which stays the
  /// caller's, is ready for `events`. The caller forgets the watch before it closes the descriptor.
  [[nodiscard]] Ticket watch(int descriptor, std::uint32_t events,
                             std::function<void(std::uint32_t)> action);
  /// Asks the watch for other events from now on.
  void change(Ticket watch, std::uint32_t events);
  /// Ends the watch; a 0 or already ended one is left alone.
  void forget(Ticket watch);

  /// Calls `action` once at `deadline`.
  [[nodiscard]] Ticket at(Clock::time_point deadline, std::function<void()> action);
  /// Ends the deadline; its action does not run any more.
  void cancel(Ticket deadline);

  /// Waits and acts until stop(). Throws what an action throws.
  void run();
  void stop() { stopped_ = true; }

 private:
  struct Watch {
    int descriptor;
    std::function<void(std::uint32_t)> action;
  };
  struct Deadline {
    Clock::time_point time;
    std::function<void()> action;
  };

  [[nodiscard]] int millisecondsToNextDeadline() const;
  void runDueDeadlines();

  platform::FileDescriptor epoll_;
  std::map<Ticket, Watch> watches_;
  std::map<Ticket, Deadline> deadlines_;
  Ticket next_ = 1;
  bool stopped_ = false;
};

}  // namespace handset
