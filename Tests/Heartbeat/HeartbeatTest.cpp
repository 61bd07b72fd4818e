// SPDX-License-Identifier: Apache-2.0
//
// The heartbeat's record on a queue with a manual clock, a real server and a network in memory:
// requests on the way, work tokens, many starts and stops.
#include "Helper/Heartbeat/Heartbeat.h"

#include <arpa/inet.h>

#include <thread>

#include "Tests/Fakes/FakeEchoService.h"
#include "Tests/Support/LiveAllocations.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using namespace std::chrono_literals;
using fakes::EchoReplyTo;
using fakes::FakeEchoService;
using Arrival = FakeEchoService::Arrival;
using Packet = FakeEchoService::Packet;

class HeartbeatRecord : public support::ServerFixture {
 protected:
  void SetUp() override {
    echo.network = [](const Packet& request) {
      return std::vector<Arrival>{{.delay = 30'000, .packet = EchoReplyTo(request)}};
    };
    heartbeat.queue = std::make_unique<platform::WorkQueue>(kHeartbeatQueueLabel, clock);
    start();
  }
  void TearDown() override {
    heartbeat.queue->sync([this] { heartbeat.timer.reset(); });
  }

  void turnOn(HelperServer* by) {
    heartbeat.queue->sync([this, by] { HeartbeatStart(heartbeat, by); });
    heartbeat.queue->sync([] {});
  }
  void turnOff(HelperServer* by) {
    heartbeat.queue->sync([this, by] { HeartbeatStop(heartbeat, by); });
  }
  void pass(platform::Duration time) {
    clock.advance(time);
    heartbeat.queue->noteClockMoved();
    heartbeat.queue->sync([] {});
  }
  std::uint32_t busy() {
    const std::lock_guard guard(server->lock);
    return server->busyMask;
  }
  std::size_t requests() { return echo.takeSent().size(); }

  FakeEchoService echo;
  platform::ScopedReplacement<platform::EchoService> echoReplacement{echo};
  Heartbeat heartbeat;
};

TEST_F(HeartbeatRecord, SendsAtOnceThenRightAwayThenEveryTwoSeconds) {
  heartbeat.queue->sync([this] {
    HeartbeatStart(heartbeat, server);
    EXPECT_EQ(requests(), 1U) << "by the start itself";
  });
  heartbeat.queue->sync([] {});
  EXPECT_EQ(requests(), 1U) << "by the timer's first tick";
  for (int tick = 0; tick < 5; ++tick) {
    pass(1999ms);
    EXPECT_EQ(requests(), 0U);
    pass(1ms);
    EXPECT_EQ(requests(), 1U);
  }
}

TEST_F(HeartbeatRecord, SendsToTheTargetOfTheBuild) {
  turnOn(server);
  in_addr address{};
  ASSERT_EQ(::inet_pton(AF_INET, HALVEC_HEARTBEAT_TARGET, &address), 1);
  std::array<std::uint8_t, 4> expected{};
  std::memcpy(expected.data(), &address, expected.size());
  for (const auto& sent : echo.takeSent()) EXPECT_EQ(sent.destination.address, expected);
}

TEST_F(HeartbeatRecord, HoldsOneWorkTokenWhileItIsOn) {
  turnOn(server);
  EXPECT_EQ(busy(), 1U);
  EXPECT_EQ(heartbeat.workToken, 1U);
  EXPECT_EQ(heartbeat.server, server);
  turnOff(server);
  EXPECT_EQ(busy(), 0U);
  EXPECT_EQ(heartbeat.workToken, 0U);
  EXPECT_EQ(heartbeat.timer, nullptr);
}

TEST_F(HeartbeatRecord, TakesItsTokenAfterTheFirstExchange) {
  std::vector<std::uint32_t> held;
  echo.network = [&](const Packet&) {
    held.push_back(busy());
    return std::vector<Arrival>{};
  };
  turnOn(server);
  EXPECT_EQ(held, (std::vector<std::uint32_t>{0, 1})) << "its own exchange, then the first tick's";
}

TEST_F(HeartbeatRecord, StopsSendingWhenItIsTurnedOff) {
  turnOn(server);
  (void)requests();
  turnOff(server);
  pass(10s);
  EXPECT_EQ(requests(), 0U);
}

TEST_F(HeartbeatRecord, TurnedOffArmsTheIdleExitOfAServerWithoutClients) {
  turnOn(server);
  EXPECT_FALSE(idleTimerIsArmed());
  turnOff(server);
  EXPECT_TRUE(idleTimerIsArmed());
}

TEST_F(HeartbeatRecord, TurnedOnTwiceAndOffOnceLosesATokenForGood) {
  turnOn(server);
  turnOn(server);
  EXPECT_EQ(busy(), 3U);
  turnOff(server);
  EXPECT_EQ(busy(), 1U);
  EXPECT_FALSE(idleTimerIsArmed());
  turnOff(server);
  EXPECT_EQ(busy(), 1U) << "the token 0 is refused";
  (void)requests();
  pass(10s);
  EXPECT_EQ(requests(), 0U);
}

TEST_F(HeartbeatRecord, TurnedOnTwiceStillTicksOnceEveryTwoSeconds) {
  turnOn(server);
  turnOn(server);
  EXPECT_EQ(requests(), 4U);
  pass(2s);
  EXPECT_EQ(requests(), 1U);
}

TEST_F(HeartbeatRecord, TurnedOffTwiceIsHarmless) {
  turnOff(server);
  turnOn(server);
  turnOff(server);
  turnOff(server);
  EXPECT_EQ(busy(), 0U);
}

TEST_F(HeartbeatRecord, TurnedOffWithoutAServerForgetsItsToken) {
  turnOn(server);
  turnOff(nullptr);
  EXPECT_EQ(busy(), 1U);
  EXPECT_EQ(heartbeat.workToken, 0U);
  (void)requests();
  pass(10s);
  EXPECT_EQ(requests(), 0U);
}

TEST_F(HeartbeatRecord, GivesItsTokenToTheServerThatTurnsItOff) {
  support::LauncherSocket secondLauncher("com.zarvo.test.second");
  HelperServer* second = HelperServerCreate("com.zarvo.test.second", &RequestSubsystem());
  ASSERT_NE(second, nullptr);
  second->runLoop = &loop;
  (void)HelperServerAcquireWorkToken(second);
  turnOn(server);
  turnOff(second);
  EXPECT_EQ(busy(), 1U) << "the one that it was taken from keeps it";
  EXPECT_EQ(second->busyMask, 0U) << "bit 0 was given back where it was out already";
  HelperServerDestroy(second);
}

TEST_F(HeartbeatRecord, TurnedOnWithoutAServerRunsWithoutAToken) {
  turnOn(nullptr);
  EXPECT_EQ(requests(), 2U);
  EXPECT_EQ(heartbeat.workToken, 0U);
  EXPECT_EQ(heartbeat.server, nullptr);
  pass(2s);
  EXPECT_EQ(requests(), 1U);
  turnOff(nullptr);
  pass(10s);
  EXPECT_EQ(requests(), 0U);
}

TEST_F(HeartbeatRecord, TurnedOnWithoutAServerReplacesTheTimerThatRuns) {
  turnOn(server);
  pass(1s);
  (void)requests();
  turnOn(nullptr);
  EXPECT_EQ(requests(), 2U);
  EXPECT_EQ(busy(), 1U) << "the token of the first start is lost";
  pass(1s);
  EXPECT_EQ(requests(), 0U) << "the first start's phase is over";
  pass(1s);
  EXPECT_EQ(requests(), 1U);
}

TEST_F(HeartbeatRecord, OutlivesItsServerWithoutTouchingIt) {
  // What a start that is still busy with its first exchange meets when the process ends.
  echo.network = [this](const Packet&) {
    if (server) HelperServerDestroy(std::exchange(server, nullptr));
    return std::vector<Arrival>{};
  };
  turnOn(server);
  EXPECT_EQ(heartbeat.workToken, 0U);
  turnOff(heartbeat.server);
}

TEST_F(HeartbeatRecord, CoalescesTheTicksOfASlowExchangeAndKeepsItsPhase) {
  bool slow = true;
  echo.network = [&](const Packet&) {
    if (std::exchange(slow, false)) clock.advance(5s);
    return std::vector<Arrival>{};
  };
  turnOn(server);
  EXPECT_EQ(requests(), 2U) << "the three ticks that fell due came to one";
  pass(999ms);
  EXPECT_EQ(requests(), 0U);
  pass(1ms);
  EXPECT_EQ(requests(), 1U);
}

TEST_F(HeartbeatRecord, RunsForADayWithoutLeavingAnythingBehind) {
  turnOn(server);
  pass(2s);
  const std::size_t descriptors = support::OpenDescriptors();
  (void)requests();
  const std::ptrdiff_t allocations = support::LiveAllocations();
  constexpr int kTicksOfADay = 24 * 60 * 60 / 2;
  int sent = 0;
  for (int tick = 0; tick < kTicksOfADay; ++tick) {
    pass(2s);
    sent += static_cast<int>(requests());
  }
  EXPECT_EQ(support::LiveAllocations(), allocations);
  EXPECT_EQ(sent, kTicksOfADay);
  EXPECT_EQ(echo.openSockets(), 0);
  EXPECT_EQ(support::OpenDescriptors(), descriptors);
}

TEST_F(HeartbeatRecord, SurvivesStormsOfStartsAndStopsFromManyThreads) {
  std::vector<std::thread> threads;
  for (int number = 0; number < 4; ++number) {
    threads.emplace_back([this, number] {
      for (int round = 0; round < 200; ++round) {
        const bool on = (round + number) % 2 == 0;
        heartbeat.queue->async([this, on] {
          on ? HeartbeatStart(heartbeat, server) : HeartbeatStop(heartbeat, server);
        });
        if (round % 16 == 0) heartbeat.queue->noteClockMoved();
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  turnOff(server);
  EXPECT_EQ(echo.openSockets(), 0);
  EXPECT_EQ(heartbeat.timer, nullptr);
  EXPECT_EQ(heartbeat.workToken, 0U);
}

/// The process's own record, on the system's clock.
class ProcessHeartbeat : public support::ServerFixture {
 protected:
  void SetUp() override {
    echo.network = [](const Packet& request) {
      return std::vector<Arrival>{{.delay = 1, .packet = EchoReplyTo(request)}};
    };
    start();
  }
  /// Waits until exactly these tokens of `of` are out.
  static void awaitBusy(HelperServer* of, std::uint32_t mask) {
    for (;;) {
      {
        const std::lock_guard guard(of->lock);
        if (of->busyMask == mask) return;
      }
      std::this_thread::yield();
    }
  }

  FakeEchoService echo;
  platform::ScopedReplacement<platform::EchoService> echoReplacement{echo};
};

TEST_F(ProcessHeartbeat, IsSwitchedOnAndOffOnItsOwnQueue) {
  HeartbeatSetEnabled(server, 2);
  awaitBusy(server, 1);
  HeartbeatSetEnabled(server, 0);
  awaitBusy(server, 0);
  EXPECT_GE(echo.takeSent().size(), 1U);
}

TEST_F(ProcessHeartbeat, IsSwitchedOnAndOffWithoutAServerToo) {
  HeartbeatSetEnabled(nullptr, 1);
  HeartbeatSetEnabled(nullptr, 0);
  HeartbeatSetEnabled(server, 1);
  awaitBusy(server, 1);
  HeartbeatSetEnabled(server, 0);
  awaitBusy(server, 0);
  EXPECT_GE(echo.takeSent().size(), 2U) << "one of each switch's own";
}

TEST_F(ProcessHeartbeat, SurvivesAStormOfSwitches) {
  std::vector<std::thread> threads;
  for (int number = 0; number < 4; ++number) {
    threads.emplace_back([this, number] {
      for (int round = 0; round < 100; ++round) HeartbeatSetEnabled(server, (round + number) % 2);
    });
  }
  for (std::thread& thread : threads) thread.join();
  // A server of its own tells when the queue has come this far: double starts lost tokens of the
  // other one.
  support::LauncherSocket secondLauncher("com.zarvo.test.second");
  HelperServer* second = HelperServerCreate("com.zarvo.test.second", &RequestSubsystem());
  ASSERT_NE(second, nullptr);
  second->runLoop = &loop;
  HeartbeatSetEnabled(server, 0);
  HeartbeatSetEnabled(second, 1);
  awaitBusy(second, 1);
  HeartbeatSetEnabled(second, 0);
  awaitBusy(second, 0);
  EXPECT_EQ(echo.openSockets(), 0);
  HelperServerDestroy(second);
}

}  // namespace
