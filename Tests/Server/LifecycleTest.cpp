// SPDX-License-Identifier: Apache-2.0
//
// Creation and its failures, run, teardown, the port-to-server map.
#include <fcntl.h>

#include <optional>

#include "Helper/Platform/Port.h"
#include "Helper/Shared/Server/PortToServerMap.h"
#include "Tests/Support/DescriptorLimit.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using Lifecycle = support::ServerFixture;
using platform::LogPriority;

TEST_F(Lifecycle, CreationChecksTheServiceInAndRegistersItsPort) {
  start();
  EXPECT_NE(server->servicePort, kPortNull);
  EXPECT_EQ(HelperServerForPort(server->servicePort), server);
  EXPECT_TRUE(server->connectSource->isValid());
  EXPECT_EQ(server->requestSubsystem, &RequestSubsystem());
  EXPECT_EQ(server->descriptor, -1);
  EXPECT_EQ(server->busyMask, 0U);
  EXPECT_EQ(server->stopRequested, 0);
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(Lifecycle, CreationFailsWithOneLineWhenTheServiceCannotBeCheckedIn) {
  const std::size_t names = platform::PortNameCount();
  EXPECT_EQ(HelperServerCreate("no/such/name", &RequestSubsystem()), nullptr);
  using Lines = std::vector<fakes::FakeSystemLog::Line>;
  EXPECT_EQ(log.takeLines(),
            (Lines{{LogPriority::kError, "unable to create server objects - out of resources"}}));
  EXPECT_EQ(platform::PortNameCount(), names);
}

TEST_F(Lifecycle, CreationFailsWithOneLineWhenTheHandedOverDescriptorIsNoServicePort) {
  // What stands at the announced place is a pipe's end.
  int ends[2];
  ASSERT_EQ(::pipe2(ends, O_CLOEXEC), 0);
  const platform::FileDescriptor reading(ends[0]);
  std::string names;
  for (int index = 3; index < ends[1]; ++index) names += ":";
  ::setenv("LISTEN_FDS", std::to_string(ends[1] - 2).c_str(), 1);
  ::setenv("LISTEN_FDNAMES", (names + wire::kServiceName).c_str(), 1);
  EXPECT_EQ(HelperServerCreate(wire::kServiceName, &RequestSubsystem()), nullptr);
  EXPECT_EQ(log.takeLines().size(), 1U);
}

TEST_F(Lifecycle, CreationFailsWithOneLineWhenTheLoopCannotWatchTheServicePort) {
  auto none = std::make_optional<support::DescriptorLimit>(0);
  platform::RunLoop blind(clock);  // without the descriptors that a loop watches with
  none.reset();
  const platform::ScopedCurrentRunLoop blindIsCurrent(blind);
  PortName before = kPortNull;
  ASSERT_EQ(platform::PortAllocate(before), KERN_SUCCESS);
  const std::size_t names = platform::PortNameCount();

  EXPECT_EQ(HelperServerCreate(wire::kServiceName, &RequestSubsystem()), nullptr);
  using Lines = std::vector<fakes::FakeSystemLog::Line>;
  EXPECT_EQ(log.takeLines(),
            (Lines{{LogPriority::kError, "unable to create server objects - out of resources"}}));
  EXPECT_EQ(platform::PortNameCount(), names);
  PortName after = kPortNull;
  ASSERT_EQ(platform::PortAllocate(after), KERN_SUCCESS);
  EXPECT_EQ(after, before + 2) << "one name lies between: the service had been checked in";
  EXPECT_EQ(HelperServerForPort(before + 1), nullptr);
  EXPECT_EQ(platform::PortDropReceiveRight(before), KERN_SUCCESS);
  EXPECT_EQ(platform::PortDropReceiveRight(after), KERN_SUCCESS);
}

TEST_F(Lifecycle, RunAfterAStopReturnsZeroWithoutRunningTheLoop) {
  start();
  bool ran = false;
  loop.post([&ran] { ran = true; });
  server->stopRequested = 1;
  EXPECT_EQ(HelperServerRun(server), 0);
  EXPECT_FALSE(ran);
}

TEST_F(Lifecycle, RunRepeatsUntilTheStopAndReturnsTheLastResult) {
  start();
  support::WireClient client(launcher.path());
  client.sendConnect();
  loop.post([this] { HelperServerStop(nullptr, server); });
  EXPECT_EQ(HelperServerRun(server), static_cast<int>(platform::RunResult::kStopped));
  EXPECT_EQ(server->runLoop, &loop);
}

TEST_F(Lifecycle, TeardownRemovesEveryClientPortAndMapEntry) {
  const std::size_t names = platform::PortNameCount();
  const std::size_t descriptors = support::OpenDescriptors();
  start();
  const auto first = connect();
  const auto second = connect();
  const PortName servicePort = server->servicePort;
  const auto [watcher, privatePort] = *server->clientPorts->begin();
  HelperServerDestroy(std::exchange(server, nullptr));

  EXPECT_EQ(HelperServerForPort(servicePort), nullptr);
  EXPECT_EQ(HelperServerForPort(privatePort), nullptr);
  EXPECT_EQ(HelperServerForPort(watcher->port()), nullptr);
  EXPECT_FALSE(watcher->isValid());
  EXPECT_EQ(platform::PortNameCount(), names);
  EXPECT_TRUE(support::IsHungUp(first->privatePort.get()));
  EXPECT_TRUE(support::IsHungUp(second->privatePort.get()));
  // What this process holds of the clients themselves is still open: three ends each. The first
  // grant also made the global queue and a process-exit source, which outlive servers.
  EXPECT_LE(support::OpenDescriptors(), descriptors + 6 + 6);
}

TEST_F(Lifecycle, TeardownClosesTheSpareDescriptor) {
  start();
  server->descriptor = ::open("/dev/null", O_RDONLY | O_CLOEXEC);
  const int descriptor = server->descriptor;
  HelperServerDestroy(std::exchange(server, nullptr));
  EXPECT_EQ(::fcntl(descriptor, F_GETFD), -1);
}

TEST_F(Lifecycle, TeardownLeavesNoTimerBehindThatFiresIntoTheFreedRecord) {
  start();
  connect().reset();
  pump();
  ASSERT_TRUE(idleTimerIsArmed());
  HelperServerDestroy(std::exchange(server, nullptr));
  clock.advance(std::chrono::seconds(11));
  (void)loop.run(0);
}

TEST_F(Lifecycle, MapHoldsServicePortPrivatePortAndClientsPort) {
  start();
  const auto client = connect();
  const auto [watcher, privatePort] = *server->clientPorts->begin();
  EXPECT_EQ(HelperServerForPort(privatePort), server);
  EXPECT_EQ(HelperServerForPort(watcher->port()), server);
  EXPECT_EQ(HelperServerForPort(kPortNull), nullptr);
  EXPECT_EQ(HelperServerForPort(kPortDead), nullptr);
}

}  // namespace
