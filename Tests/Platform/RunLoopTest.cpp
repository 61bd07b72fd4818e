// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/RunLoop.h"

#include <gtest/gtest.h>

#include <limits>
#include <thread>
#include <vector>

#include "Tests/Fakes/ManualClock.h"

namespace {

using namespace platform;
using std::chrono::seconds;

class Timers : public ::testing::Test {
 protected:
  std::shared_ptr<RunLoopTimer> add(int afterSeconds) {
    auto timer = RunLoopTimer::Create(
        loop, loop.now() + seconds(afterSeconds),
        [](RunLoopTimer* fired, void* context) {
          static_cast<std::vector<RunLoopTimer*>*>(context)->push_back(fired);
        },
        &fired);
    loop.add(timer);
    return timer;
  }
  void pass(int step) {
    clock.advance(seconds(step));
    EXPECT_EQ(loop.run(0), RunResult::kTimedOut);
  }
  fakes::ManualClock clock;
  RunLoop loop{clock};
  std::vector<RunLoopTimer*> fired;
};

TEST_F(Timers, FireOnceInTheOrderOfTheirFireDates) {
  const auto late = add(3);
  const auto early = add(1);
  pass(0);
  EXPECT_TRUE(fired.empty());
  pass(5);
  EXPECT_EQ(fired, (std::vector{early.get(), late.get()}));
  pass(100);
  EXPECT_EQ(fired.size(), 2U);
}

TEST_F(Timers, DoNotFireOnceInvalidatedEvenWhenDue) {
  const auto timer = add(1);
  clock.advance(seconds(2));
  timer->invalidate();
  timer->invalidate();
  pass(0);
  EXPECT_TRUE(fired.empty());
}

TEST_F(Timers, OfTheSameDateAreToldApart) {
  const auto first = add(1);
  const auto second = add(1);
  first->invalidate();
  pass(1);
  EXPECT_EQ(fired, (std::vector{second.get()}));
}

TEST_F(Timers, AreNotMadeWhereTheClockProvidesNone) {
  clock.refuseTimers();
  EXPECT_EQ(RunLoopTimer::Create(loop, loop.now(), nullptr, nullptr), nullptr);
}

TEST(RunLoopRun, ForTheLargestFiniteTimeDoesNotTimeOutAtOnce) {
  RunLoop loop(SystemClock());
  std::thread stopper([&loop] { loop.stop(); });
  EXPECT_EQ(loop.run(std::numeric_limits<double>::max()), RunResult::kStopped);
  stopper.join();
}

TEST(RunLoopRun, EndsAtItsTimeLimit) {
  RunLoop loop(SystemClock());
  EXPECT_EQ(loop.run(0.001), RunResult::kTimedOut);
}

TEST(RunLoopRun, IsEndedByAStopThatCameBeforeIt) {
  RunLoop loop(SystemClock());
  loop.stop();
  EXPECT_EQ(loop.run(1e300), RunResult::kStopped);
  EXPECT_EQ(loop.run(0), RunResult::kTimedOut);
}

TEST(RunLoopRun, WakesForATimerOfTheSystemClock) {
  RunLoop loop(SystemClock());
  const auto timer = RunLoopTimer::Create(
      loop, loop.now() + std::chrono::milliseconds(5),
      [](RunLoopTimer*, void* context) { static_cast<RunLoop*>(context)->stop(); }, &loop);
  loop.add(timer);
  EXPECT_EQ(loop.run(1e300), RunResult::kStopped);
}

TEST(RunLoopRun, WakesForTheEarlierOfTwoTimersWhicheverCameFirst) {
  RunLoop loop(SystemClock());
  const auto stop = [](RunLoopTimer*, void* context) { static_cast<RunLoop*>(context)->stop(); };
  const auto late = RunLoopTimer::Create(loop, loop.now() + std::chrono::hours(1), stop, &loop);
  const auto early =
      RunLoopTimer::Create(loop, loop.now() + std::chrono::milliseconds(5), stop, &loop);
  loop.add(late);
  loop.add(early);
  EXPECT_EQ(loop.run(1e300), RunResult::kStopped);
}

TEST(RunLoopPost, RunsWorkFromOtherThreadsOnTheLoopsThread) {
  RunLoop loop(SystemClock());
  std::thread::id where;
  std::thread other([&] {
    loop.post([&] {
      where = std::this_thread::get_id();
      loop.stop();
    });
  });
  EXPECT_EQ(loop.run(1e300), RunResult::kStopped);
  other.join();
  EXPECT_EQ(where, std::this_thread::get_id());
}

TEST(RunLoopTimers, ComeAndGoFromManyThreads) {
  RunLoop loop(SystemClock());
  std::vector<std::thread> threads;
  for (int index = 0; index < 4; ++index) {
    threads.emplace_back([&loop] {
      for (int round = 0; round < 500; ++round) {
        const auto timer = RunLoopTimer::Create(
            loop, loop.now() + std::chrono::microseconds(50), [](RunLoopTimer*, void*) {}, nullptr);
        loop.add(timer);
        if (round % 2 == 0) timer->invalidate();
      }
    });
  }
  std::thread stopper([&] {
    for (std::thread& thread : threads) thread.join();
    loop.stop();
  });
  while (loop.run(1e300) != RunResult::kStopped) {
  }
  stopper.join();
}

TEST(CurrentRunLoop, IsOnePerThread) {
  RunLoop* mine = &RunLoop::Current();
  EXPECT_EQ(mine, &RunLoop::Current());
  std::thread([mine] { EXPECT_NE(mine, &RunLoop::Current()); }).join();
}

}  // namespace
