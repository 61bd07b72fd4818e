// SPDX-License-Identifier: Apache-2.0
//
// Work tokens and the idle timer, on a manual clock.
#include "Tests/Support/ServerFixture.h"

namespace {

using platform::RunResult;

class IdleExit : public support::ServerFixture {
 protected:
  void SetUp() override { start(); }

  /// Lets `seconds` pass; true when the server has been stopped by then.
  bool stopsWithin(double seconds) {
    clock.advance(std::chrono::duration<double>(seconds));
    (void)loop.run(0);
    return server->stopRequested != 0;
  }
  [[nodiscard]] std::uint32_t acquire() { return HelperServerAcquireWorkToken(server); }
};

TEST_F(IdleExit, IsNeverArmedInAFreshServerWithoutClients) {
  EXPECT_FALSE(idleTimerIsArmed());
  EXPECT_FALSE(stopsWithin(1e6));
}

TEST_F(IdleExit, ComesTenSecondsAfterTheLastClientsPortDied) {
  auto client = connect();
  EXPECT_FALSE(idleTimerIsArmed());
  client.reset();
  pump();
  EXPECT_TRUE(idleTimerIsArmed());
  EXPECT_FALSE(stopsWithin(9.999));
  EXPECT_TRUE(stopsWithin(0.001));
}

TEST_F(IdleExit, IsCancelledByAConnectWithinTheTenSeconds) {
  connect().reset();
  pump();
  EXPECT_FALSE(stopsWithin(9.9));
  const auto second = connect();
  EXPECT_FALSE(idleTimerIsArmed());
  EXPECT_FALSE(stopsWithin(60));
}

TEST_F(IdleExit, IsNotReachedByAConnectThatIsServedBeforeTheDueTimer) {
  connect().reset();
  pump();
  support::WireClient client(launcher.path());
  client.sendConnect();
  ASSERT_EQ(loop.run(0), RunResult::kHandledSource);
  EXPECT_FALSE(stopsWithin(3600));
}

TEST_F(IdleExit, WaitsForEveryClient) {
  auto first = connect();
  auto second = connect();
  first.reset();
  pump();
  EXPECT_FALSE(idleTimerIsArmed());
  second.reset();
  pump();
  EXPECT_TRUE(idleTimerIsArmed());
}

TEST_F(IdleExit, ArmsOnReleaseOfTheLastTokenWhenNoClientRemains) {
  auto client = connect();
  const std::uint32_t token = acquire();
  client.reset();
  pump();
  EXPECT_FALSE(idleTimerIsArmed()) << "a token is out when the client goes";
  EXPECT_TRUE(HelperServerReleaseWorkToken(server, token));
  EXPECT_TRUE(idleTimerIsArmed());
  EXPECT_TRUE(stopsWithin(10));
}

TEST_F(IdleExit, IsNotArmedByAReleaseWhileAClientIsConnected) {
  const auto client = connect();
  EXPECT_TRUE(HelperServerReleaseWorkToken(server, acquire()));
  EXPECT_FALSE(idleTimerIsArmed());
}

TEST_F(IdleExit, IsCancelledByTheAcquisitionOfAToken) {
  connect().reset();
  pump();
  ASSERT_TRUE(idleTimerIsArmed());
  (void)acquire();
  EXPECT_FALSE(idleTimerIsArmed());
  EXPECT_FALSE(stopsWithin(60));
}

TEST_F(IdleExit, BeginsAnewWithEveryArming) {
  EXPECT_TRUE(HelperServerReleaseWorkToken(server, acquire()));
  EXPECT_FALSE(stopsWithin(6));
  EXPECT_TRUE(HelperServerReleaseWorkToken(server, acquire()));
  EXPECT_FALSE(stopsWithin(9.9)) << "the first timer must be gone";
  EXPECT_TRUE(stopsWithin(0.1));
}

TEST_F(IdleExit, StopsAtOnceWhenTheTimerCannotBeMade) {
  clock.refuseTimers();
  const std::uint32_t token = acquire();
  EXPECT_TRUE(HelperServerReleaseWorkToken(server, token));
  EXPECT_FALSE(idleTimerIsArmed());
  EXPECT_EQ(server->stopRequested, 1);
  EXPECT_EQ(loop.run(1e300), RunResult::kStopped);
}

TEST_F(IdleExit, StopDoesNothingWithoutAServer) { HelperServerStop(nullptr, nullptr); }

TEST_F(IdleExit, StopEndsTheRun) {
  HelperServerStop(nullptr, server);
  EXPECT_EQ(server->stopRequested, 1);
  EXPECT_EQ(loop.run(1e300), RunResult::kStopped);
}

class WorkToken : public IdleExit {};

TEST_F(WorkToken, IsAlwaysTheLowestClearBit) {
  EXPECT_EQ(acquire(), 1U);
  EXPECT_EQ(acquire(), 2U);
  EXPECT_EQ(acquire(), 4U);
  EXPECT_TRUE(HelperServerReleaseWorkToken(server, 2));
  EXPECT_EQ(acquire(), 2U);
  EXPECT_EQ(acquire(), 8U);
  EXPECT_EQ(server->busyMask, 15U);
}

TEST_F(WorkToken, ThirtyThirdAliasesBitZeroAndOneReleaseClearsItForBoth) {
  for (int bit = 0; bit < 32; ++bit) EXPECT_EQ(acquire(), 1U << bit);
  EXPECT_EQ(acquire(), 1U);
  EXPECT_EQ(server->busyMask, 0xffffffffU);
  EXPECT_TRUE(HelperServerReleaseWorkToken(server, 1));
  EXPECT_EQ(server->busyMask, 0xfffffffeU);
  EXPECT_TRUE(HelperServerReleaseWorkToken(server, 1));
  EXPECT_EQ(server->busyMask, 0xfffffffeU);
}

TEST_F(WorkToken, ThatIsNotASingleBitIsRefusedAndChangesNothing) {
  (void)acquire();
  for (const std::uint32_t token : {0U, 3U, 0x80000001U}) {
    EXPECT_FALSE(HelperServerReleaseWorkToken(server, token));
    EXPECT_EQ(server->busyMask, 1U);
    EXPECT_FALSE(idleTimerIsArmed());
  }
}

TEST_F(WorkToken, ThatIsNotOutClearsNothingAndMayArmTheTimer) {
  const std::uint32_t token = acquire();
  EXPECT_TRUE(HelperServerReleaseWorkToken(server, 0x80000000));
  EXPECT_EQ(server->busyMask, token);
  EXPECT_FALSE(idleTimerIsArmed());
  server->busyMask = 0;
  EXPECT_TRUE(HelperServerReleaseWorkToken(server, 0x80000000));
  EXPECT_TRUE(idleTimerIsArmed());
}

}  // namespace
