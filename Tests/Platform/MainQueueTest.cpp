// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/MainQueue.h"

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <thread>

#include "Tests/Fakes/ManualClock.h"

namespace {

using namespace platform;
using std::chrono::seconds;

class MainQueue : public ::testing::Test {
 protected:
  void pass(int step) {
    clock.advance(seconds(step));
    EXPECT_EQ(loop.run(0), RunResult::kTimedOut);
  }
  fakes::ManualClock clock;
  RunLoop loop{clock};
  std::optional<ScopedMainQueue> queue{std::in_place, loop};
  std::string ran;
};

TEST_F(MainQueue, RunsWorkInTheOrderOfPostingAndNeverInsideThePost) {
  PostToMainQueue([this] {
    ran += "a";
    PostToMainQueue([this] { ran += "c"; });
    ran += "a";
  });
  PostToMainQueue([this] { ran += "b"; });
  EXPECT_EQ(ran, "");
  pass(0);
  EXPECT_EQ(ran, "aabc");
}

TEST_F(MainQueue, RunsOnTheLoopsThreadWhatAnotherThreadPosts) {
  std::thread::id runner;
  std::thread([&] { PostToMainQueue([&] { runner = std::this_thread::get_id(); }); }).join();
  pass(0);
  EXPECT_EQ(runner, std::this_thread::get_id());
}

TEST_F(MainQueue, RunsDelayedWorkOnceWhenItsTimeHasCome) {
  PostToMainQueueAfter(seconds(5), [this] { ran += "late"; });
  PostToMainQueueAfter(seconds(1), [this] { ran += "early "; });
  pass(0);
  EXPECT_EQ(ran, "");
  pass(4);
  EXPECT_EQ(ran, "early ");
  pass(1);
  EXPECT_EQ(ran, "early late");
  pass(100);
  EXPECT_EQ(ran, "early late");
}

TEST_F(MainQueue, DelaysWorkAlsoWhereNoIdleTimerCanBeMade) {
  clock.refuseTimers();
  PostToMainQueueAfter(seconds(1), [this] { ran += "x"; });
  pass(1);
  EXPECT_EQ(ran, "x");
}

TEST_F(MainQueue, WakesALoopThatSleepsUntilALaterDate) {
  RunLoop sleeping(SystemClock());
  queue.emplace(sleeping);
  PostToMainQueueAfter(std::chrono::hours(1), [] { FAIL(); });
  std::thread poster([&] {
    PostToMainQueueAfter(std::chrono::milliseconds(1), [&sleeping] { sleeping.stop(); });
  });
  EXPECT_EQ(sleeping.run(1e9), RunResult::kStopped);
  poster.join();
}

TEST_F(MainQueue, WithoutALoopDropsWorkAndWhatItHolds) {
  queue.reset();
  const auto held = std::make_shared<int>(0);
  PostToMainQueue([this, held] { ran += "x"; });
  PostToMainQueueAfter(seconds(0), [this, held] { ran += "x"; });
  EXPECT_EQ(held.use_count(), 1);
  pass(0);
  EXPECT_EQ(ran, "");
}

TEST_F(MainQueue, GivesUpDelayedWorkWithItsLoop) {
  const auto held = std::make_shared<int>(0);
  {
    RunLoop shortLived(clock);
    queue.emplace(shortLived);
    PostToMainQueueAfter(seconds(1), [held] {});
    EXPECT_EQ(held.use_count(), 2);
    queue.reset();
  }
  EXPECT_EQ(held.use_count(), 1);
}

}  // namespace
