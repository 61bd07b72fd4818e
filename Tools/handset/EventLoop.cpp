// SPDX-License-Identifier: Apache-2.0
//
// The wait itself. One thread, no lock.
#include "Tools/handset/EventLoop.h"

#include <sys/epoll.h>

#include <algorithm>
#include <array>
#include <climits>
#include <utility>
#include <vector>

#include "Tools/handset/Failure.h"

namespace handset {

EventLoop::EventLoop() : epoll_(epoll_create1(EPOLL_CLOEXEC)) {
  if (!epoll_) throw Failure::FromErrno("epoll_create1");
}

EventLoop::Ticket EventLoop::watch(int descriptor, std::uint32_t events,
                                   std::function<void(std::uint32_t)> action) {
  const Ticket ticket = next_++;
  epoll_event event{};
  event.events = events;
  event.data.u64 = ticket;
  if (epoll_ctl(epoll_.get(), EPOLL_CTL_ADD, descriptor, &event) != 0) {
    throw Failure::FromErrno("epoll_ctl");
  }
  watches_.emplace(ticket, Watch{descriptor, std::move(action)});
  return ticket;
}

void EventLoop::change(Ticket watch, std::uint32_t events) {
  const auto found = watches_.find(watch);
  if (found == watches_.end()) return;
  epoll_event event{};
  event.events = events;
  event.data.u64 = watch;
  if (epoll_ctl(epoll_.get(), EPOLL_CTL_MOD, found->second.descriptor, &event) != 0) {
    throw Failure::FromErrno("epoll_ctl");
  }
}

void EventLoop::forget(Ticket watch) {
  const auto found = watches_.find(watch);
  if (found == watches_.end()) return;
  // A failure would mean that the descriptor is closed already, and then epoll has forgotten it.
  static_cast<void>(epoll_ctl(epoll_.get(), EPOLL_CTL_DEL, found->second.descriptor, nullptr));
  watches_.erase(found);
}

EventLoop::Ticket EventLoop::at(Clock::time_point deadline, std::function<void()> action) {
  const Ticket ticket = next_++;
  deadlines_.emplace(ticket, Deadline{deadline, std::move(action)});
  return ticket;
}

void EventLoop::cancel(Ticket deadline) { deadlines_.erase(deadline); }

int EventLoop::millisecondsToNextDeadline() const {
  if (deadlines_.empty()) return -1;
  const auto soonest = std::min_element(
      deadlines_.begin(), deadlines_.end(),
      [](const auto& left, const auto& right) { return left.second.time < right.second.time; });
  const auto left =
      std::chrono::ceil<std::chrono::milliseconds>(soonest->second.time - Clock::now());
  return static_cast<int>(std::clamp<std::int64_t>(left.count(), 0, INT_MAX));
}

void EventLoop::runDueDeadlines() {
  const Clock::time_point now = Clock::now();
  std::vector<Ticket> due;
  for (const auto& [ticket, deadline] : deadlines_) {
    if (deadline.time <= now) due.push_back(ticket);
  }
  for (const Ticket ticket : due) {
    const auto found = deadlines_.find(ticket);
    if (found == deadlines_.end()) continue;
    const std::function<void()> action = std::move(found->second.action);
    deadlines_.erase(found);
    action();
  }
}

void EventLoop::run() {
  std::array<epoll_event, 16> ready{};
  while (!stopped_) {
    const int count = epoll_wait(epoll_.get(), ready.data(), static_cast<int>(ready.size()),
                                 millisecondsToNextDeadline());
    if (count < 0 && errno != EINTR) throw Failure::FromErrno("epoll_wait");
    for (int i = 0; i < count && !stopped_; ++i) {
      const epoll_event& event = ready.at(static_cast<std::size_t>(i));
      // An earlier action of this round may have ended the watch: look it up again, and keep a
      // copy of the action, which may end its own watch.
      const auto found = watches_.find(event.data.u64);
      if (found == watches_.end()) continue;
      const std::function<void(std::uint32_t)> action = found->second.action;
      action(event.events);
    }
    if (!stopped_) runDueDeadlines();
  }
}

}  // namespace handset
