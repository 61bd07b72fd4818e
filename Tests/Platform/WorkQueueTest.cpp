// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/WorkQueue.h"

#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <semaphore>
#include <thread>
#include <vector>

#include "Tests/Fakes/ManualClock.h"
#include "Tests/Support/ThreadsRefused.h"

namespace {

using namespace std::chrono_literals;
using platform::TimerSource;
using platform::WorkQueue;

TEST(WorkQueue, RunsWorkInTheOrderOfSubmissionAndOneAtATime) {
  WorkQueue queue("test.order");
  std::vector<int> order;
  for (int number = 0; number < 1000; ++number) {
    queue.async([&order, number] { order.push_back(number); });
  }
  queue.sync([] {});
  ASSERT_EQ(order.size(), 1000U);
  for (int number = 0; number < 1000; ++number) {
    EXPECT_EQ(order[static_cast<std::size_t>(number)], number);
  }
}

TEST(WorkQueue, RunsOnAThreadOfItsOwn) {
  WorkQueue queue("test.thread");
  WorkQueue other("test.other");
  EXPECT_FALSE(queue.isCurrent());
  queue.sync([&] {
    EXPECT_TRUE(queue.isCurrent());
    EXPECT_FALSE(other.isCurrent());
  });
}

TEST(WorkQueue, RunsWhatAQueueSubmitsToItselfAfterwards) {
  WorkQueue queue("test.self");
  std::vector<int> order;
  queue.sync([&] {
    queue.async([&] { order.push_back(2); });
    order.push_back(1);
  });
  queue.sync([] {});
  EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

TEST(WorkQueue, FinishesItsWorkAfterItsHandleIsGone) {
  std::binary_semaphore begin(0);
  std::binary_semaphore done(0);
  {
    WorkQueue queue("test.given.up");
    queue.async([&] { begin.acquire(); });
    queue.async([&] { done.release(); });
  }
  begin.release();
  done.acquire();
}

TEST(WorkQueue, MayBeGivenUpOnItself) {
  std::binary_semaphore done(0);
  auto queue = std::make_shared<WorkQueue>("test.suicide");
  WorkQueue& borrowed = *queue;
  borrowed.async([&done, queue = std::move(queue)]() mutable {
    queue.reset();
    done.release();
  });
  done.acquire();
}

TEST(WorkQueue, ReleasesWhatWorkHoldsOnceItHasRun) {
  WorkQueue queue("test.release");
  auto held = std::make_shared<int>(1);
  const std::weak_ptr<int> watch = held;
  queue.async([held = std::move(held)] {});
  queue.sync([] {});
  EXPECT_TRUE(watch.expired());
}

TEST(WorkQueue, KeepsWorkThatGetsNoThreadForTheNextSubmission) {
  WorkQueue queue("test.refused");
  std::vector<int> order;
  {
    const support::ThreadsRefused refused;
    queue.async([&] { order.push_back(1); });
  }
  queue.async([&] { order.push_back(2); });
  queue.sync([] {});
  EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

TEST(WorkQueue, SaysOnRequestThatItGetsNoThreadAndForgetsTheWork) {
  WorkQueue queue("test.refused");
  auto held = std::make_shared<int>(1);
  const std::weak_ptr<int> watch = held;
  bool ran = false;
  {
    const support::ThreadsRefused refused;
    EXPECT_FALSE(queue.tryAsync([&ran, held = std::move(held)] { ran = true; }));
  }
  EXPECT_TRUE(watch.expired());
  queue.sync([] {});
  EXPECT_FALSE(ran);
  EXPECT_TRUE(queue.tryAsync([&] { ran = true; }));
  queue.sync([] {});
  EXPECT_TRUE(ran);
}

TEST(WorkQueue, NeedsNoOtherThreadWhileItsOwnRuns) {
  WorkQueue queue("test.running");
  bool ran = false;
  queue.sync([&] {
    const support::ThreadsRefused refused;
    EXPECT_TRUE(queue.tryAsync([&] { ran = true; }));
  });
  queue.sync([] {});
  EXPECT_TRUE(ran);
}

class TimedQueue : public testing::Test {
 protected:
  void advance(platform::Duration step) {
    clock.advance(step);
    queue.noteClockMoved();
    queue.sync([] {});
  }

  fakes::ManualClock clock;
  WorkQueue queue{"test.timed", clock};
  int ticks = 0;
};

TEST_F(TimedQueue, TicksOnlyAfterResume) {
  TimerSource timer(queue, clock.now(), 2s, 5us, [&] { ++ticks; });
  queue.sync([] {});
  EXPECT_EQ(ticks, 0);
  timer.resume();
  queue.sync([] {});
  EXPECT_EQ(ticks, 1);
}

TEST_F(TimedQueue, TicksOnceAnInterval) {
  TimerSource timer(queue, clock.now(), 2s, 5us, [&] { ++ticks; });
  timer.resume();
  queue.sync([] {});
  for (int step = 0; step < 10; ++step) advance(1s);
  EXPECT_EQ(ticks, 6);
}

TEST_F(TimedQueue, CoalescesTheTicksOfABusyTimeAndKeepsItsPhase) {
  TimerSource timer(queue, clock.now(), 2s, 5us, [&] { ++ticks; });
  timer.resume();
  queue.sync([] {});
  advance(7s);
  EXPECT_EQ(ticks, 2);
  advance(900ms);
  EXPECT_EQ(ticks, 2);
  advance(100ms);
  EXPECT_EQ(ticks, 3);
}

TEST_F(TimedQueue, LetsOtherWorkRunBetweenTicksThatAreAlwaysDue) {
  TimerSource timer(queue, clock.now(), 1s, 5us, [&] {
    ++ticks;
    clock.advance(1s);
  });
  std::binary_semaphore stopped(0);
  queue.sync([&] {
    timer.resume();
    queue.async([&] {
      timer.cancel();
      stopped.release();
    });
  });
  stopped.acquire();
  queue.sync([] {});
  EXPECT_LE(ticks, 2);
}

TEST_F(TimedQueue, NeverTicksAgainAfterCancelOnTheQueue) {
  TimerSource timer(queue, clock.now(), 2s, 5us, [&] { ++ticks; });
  queue.sync([&] {
    timer.resume();  // the first tick waits behind this work
    timer.cancel();
  });
  advance(10s);
  EXPECT_EQ(ticks, 0);
  timer.resume();
  advance(10s);
  EXPECT_EQ(ticks, 0);
}

TEST(TimerSource, TicksByTheSystemsClock) {
  WorkQueue queue("test.real");
  std::counting_semaphore ticked(0);
  TimerSource timer(queue, platform::SystemClock().now(), 1ms, 5us, [&] { ticked.release(); });
  timer.resume();
  for (int tick = 0; tick < 3; ++tick) ticked.acquire();
  queue.sync([&] { timer.cancel(); });
}

}  // namespace
