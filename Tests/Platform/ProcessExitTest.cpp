// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/ProcessExit.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <future>
#include <thread>

#include "Helper/Platform/GlobalQueue.h"
#include "Helper/Platform/ProcessIdentity.h"
#include "Tests/Support/ThreadsRefused.h"

namespace {

using namespace platform;

class ProcessExit : public ::testing::Test {
 protected:
  ProcessExit() {
    int ends[2];
    if (::pipe(ends) != 0) ADD_FAILURE() << "pipe failed";
    process = ::fork();
    if (process == 0) {
      ::close(ends[1]);
      char byte = 0;
      (void)!::read(ends[0], &byte, 1);
      ::_exit(0);
    }
    ::close(ends[0]);
    release.reset(ends[1]);
    version = ProcessVersion(OpenPidfd(process).get(), process);
  }
  ~ProcessExit() override {
    release.reset();
    if (process > 0) ::waitpid(process, nullptr, 0);
  }
  void endProcess() {
    release.reset();
    siginfo_t information{};
    ASSERT_EQ(::waitid(P_PID, static_cast<id_t>(process), &information, WEXITED | WNOWAIT), 0);
  }
  /// Waits until everything posted to the global queue so far has run.
  static void drainQueue() {
    std::promise<void> done;
    PostToGlobalQueue([&done] { done.set_value(); });
    done.get_future().wait();
  }
  pid_t process = 0;
  FileDescriptor release;
  std::uint32_t version = 0;
};

TEST_F(ProcessExit, IsDeliveredOnTheGlobalQueue) {
  const auto source = ProcessExitSource::Create(process, version);
  ASSERT_TRUE(source);
  std::promise<std::thread::id> delivered;
  source->setEventHandler([&] { delivered.set_value(std::this_thread::get_id()); });
  source->resume();
  endProcess();
  EXPECT_NE(delivered.get_future().get(), std::this_thread::get_id());
  source->cancel();
  drainQueue();
}

TEST_F(ProcessExit, IsDeliveredOnceWhoeverComesFirst) {
  const auto source = ProcessExitSource::Create(process, version);
  std::atomic<int> calls = 0;
  source->setEventHandler([&] { ++calls; });
  source->resume();
  endProcess();
  DeliverPendingProcessExits();
  EXPECT_EQ(calls, 1) << "when it returns, the exit has been handled";
  DeliverPendingProcessExits();
  drainQueue();
  EXPECT_EQ(calls, 1);
  source->cancel();
  drainQueue();
}

TEST_F(ProcessExit, IsNotDeliveredBeforeItHappens) {
  const auto source = ProcessExitSource::Create(process, version);
  std::atomic<int> calls = 0;
  source->setEventHandler([&] { ++calls; });
  source->resume();
  DeliverPendingProcessExits();
  drainQueue();
  EXPECT_EQ(calls, 0);
  source->cancel();
  drainQueue();
}

TEST_F(ProcessExit, IsNotDeliveredAfterACancellation) {
  const auto source = ProcessExitSource::Create(process, version);
  std::atomic<int> calls = 0;
  source->setEventHandler([&] { ++calls; });
  source->resume();
  source->cancel();
  endProcess();
  DeliverPendingProcessExits();
  drainQueue();
  EXPECT_EQ(calls, 0);
}

TEST_F(ProcessExit, CancelHandlerRunsOnceAndGivesItsReferenceBack) {
  auto source = ProcessExitSource::Create(process, version);
  const std::weak_ptr<ProcessExitSource> weak = source;
  std::promise<void> cancelled;
  source->setCancelHandler([extra = source, &cancelled] { cancelled.set_value(); });
  source->resume();
  source->cancel();
  source->cancel();
  source.reset();
  cancelled.get_future().wait();
  drainQueue();
  drainQueue();
  EXPECT_TRUE(weak.expired());
}

TEST_F(ProcessExit, CannotBeWatchedForAProcessThatIsGone) {
  endProcess();
  EXPECT_EQ(ProcessExitSource::Create(process, version), nullptr) << "a zombie has exited";
  ::waitpid(process, nullptr, 0);
  EXPECT_EQ(ProcessExitSource::Create(process, version), nullptr);
  process = 0;
}

TEST_F(ProcessExit, CannotBeWatchedForAnotherProcessThatHasTheIdNow) {
  EXPECT_EQ(ProcessExitSource::Create(process, version + 1), nullptr);
}

using ProcessExitDeathTest = ProcessExit;

bool CanBeWatched(pid_t process, std::uint32_t version) {
  return ProcessExitSource::Create(process, version) != nullptr;
}

bool CanBeWatchedWithoutThreads(pid_t process, std::uint32_t version) {
  const support::ThreadsRefused refused;
  return CanBeWatched(process, version);
}

TEST_F(ProcessExitDeathTest, CannotBeWatchedWhereTheQueueCannotBeMadeAndLaterCan) {
  // In a process of its own, where the queue has not been made yet.
  ::testing::FLAGS_gtest_death_test_style = "threadsafe";
  EXPECT_EXIT(
      ::_exit(CanBeWatchedWithoutThreads(process, version) || !CanBeWatched(process, version)),
      ::testing::ExitedWithCode(0), "");
}

TEST_F(ProcessExit, VersionStaysTheSameWhileTheProcessLives) {
  EXPECT_NE(version, 0U);
  EXPECT_EQ(ProcessVersion(OpenPidfd(process).get(), process), version);
  EXPECT_NE(ProcessVersion(OpenPidfd(::getpid()).get(), ::getpid()), version);
}

}  // namespace
