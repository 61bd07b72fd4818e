// SPDX-License-Identifier: Apache-2.0
//
// What a connect leaves behind in the server, and what a client's death takes away.
#include <fcntl.h>
#include <sys/wait.h>

#include <future>

#include "Helper/Platform/GlobalQueue.h"
#include "Helper/Platform/Port.h"
#include "Helper/Platform/ProcessIdentity.h"
#include "Helper/Shared/Server/PortToServerMap.h"
#include "Tests/Support/DescriptorLimit.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using support::Get;

class Connect : public support::ServerFixture {
 protected:
  void SetUp() override { start(); }

  void expectNoTrace(std::size_t names) const {
    EXPECT_TRUE(server->clientPorts->empty());
    EXPECT_TRUE(server->portSources->empty());
    EXPECT_EQ(platform::PortNameCount(), names);
  }
};

TEST_F(Connect, EntersTheClientAndAnswersWithItsPrivatePort) {
  const auto client = connect();
  ASSERT_EQ(server->clientPorts->size(), 1U);
  const auto [watcher, privatePort] = *server->clientPorts->begin();
  EXPECT_TRUE(watcher->isValid());
  EXPECT_TRUE(server->portSources->at(privatePort)->isValid());
  const auto rights = platform::PortQuery(privatePort);
  ASSERT_TRUE(rights);
  EXPECT_TRUE(rights->receive);
  EXPECT_EQ(rights->sendReferences, 1U);
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(Connect, WithoutTheEntitlementAnswers35AndLeavesNothingBehind) {
  security.answer(wire::kRequiredEntitlement, {});
  const std::size_t names = platform::PortNameCount();
  support::WireClient client(launcher.path());
  client.sendConnect();
  pump();
  const support::Bytes reply = client.takeConnectReply();
  EXPECT_EQ(reply.size(), 36U);
  EXPECT_EQ(Get<std::int32_t>(reply, 32), 35);
  EXPECT_FALSE(client.privatePort);
  EXPECT_TRUE(support::IsHungUp(client.ownPort.get())) << "the client's right must be given back";
  expectNoTrace(names);
  EXPECT_FALSE(idleTimerIsArmed());
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(Connect, ThatIsRefusedLeavesAnArmedIdleTimerArmed) {
  connect().reset();
  pump();
  ASSERT_TRUE(idleTimerIsArmed());
  HandleProcessExit(::getpid());  // forget that this very process was let in before
  security.answer(wire::kRequiredEntitlement, {});
  support::WireClient stranger(launcher.path());
  stranger.sendConnect();
  pump();
  EXPECT_EQ(Get<std::int32_t>(stranger.takeConnectReply(), 32), 35);
  EXPECT_TRUE(idleTimerIsArmed()) << "strangers must not keep the helper up";

  support::Bytes illFormed = support::ConnectRequest();
  illFormed[3] = 0;
  stranger.sendConnect(illFormed);
  pump();
  EXPECT_EQ(Get<std::int32_t>(stranger.takeConnectReply(), 32), -304);
  EXPECT_TRUE(idleTimerIsArmed());
  clock.advance(std::chrono::duration<double>(kIdleSeconds));
  pump();
  EXPECT_NE(server->stopRequested, 0);
}

TEST_F(Connect, OfAClientWhosePortIsAlreadyDeadAnswers5AndKeepsTheServiceUp) {
  const std::size_t names = platform::PortNameCount();
  support::WireClient client(launcher.path());
  client.sendConnect();
  client.ownPort.reset();
  pump();
  EXPECT_EQ(Get<std::int32_t>(client.takeConnectReply(), 32), 5);
  expectNoTrace(names);
  EXPECT_FALSE(idleTimerIsArmed()) << "the connect cancels what the removal armed";

  connect().reset();
  pump();
  EXPECT_TRUE(idleTimerIsArmed()) << "another client's coming and going arms it";
}

TEST_F(Connect, OfAClientThatHasWrittenToItsOwnPortAnswers5) {
  support::WireClient client(launcher.path());
  const std::size_t names = platform::PortNameCount();
  client.sendConnect();
  ASSERT_EQ(support::SendPacket(client.ownPort.get(), {1}), 0);
  pump();
  EXPECT_EQ(Get<std::int32_t>(client.takeConnectReply(), 32), 5);
  expectNoTrace(names);
}

TEST_F(Connect, WithoutASubsystemForItsPortAnswers5AndLeavesNothingBehind) {
  server->requestSubsystem = nullptr;
  const std::size_t names = platform::PortNameCount();
  support::WireClient client(launcher.path());
  client.sendConnect();
  pump();
  EXPECT_EQ(Get<std::int32_t>(client.takeConnectReply(), 32), 5);
  expectNoTrace(names);
}

TEST_F(Connect, WithoutARightForTheClientsPortAnswers5AndLeavesNothingBehind) {
  const std::size_t names = platform::PortNameCount();
  wire::AuditToken token;
  token.words[5] = static_cast<std::uint32_t>(::getpid());
  PortName privatePort = 77;
  EXPECT_EQ(HelperServerConnectClient(server->servicePort, kPortNull, privatePort, token), 5);
  EXPECT_EQ(privatePort, kPortNull);
  EXPECT_EQ(HelperServerConnectClient(server->servicePort, kPortDead, privatePort, token), 5);
  expectNoTrace(names);
}

TEST_F(Connect, AnswersTheAllocationsCodeWhenNoPortCanBeMade) {
  support::PortPair port = support::MakePort();
  const PortName clientPort = platform::PortAdoptSendRight(std::move(port.send), nullptr);
  wire::AuditToken token;
  token.words[5] = static_cast<std::uint32_t>(::getpid());
  ASSERT_TRUE(CallerHasEntitlement(wire::kRequiredEntitlement, token));
  PortName privatePort = 77;
  {
    const support::DescriptorLimit none(0);
    EXPECT_EQ(HelperServerConnectClient(server->servicePort, clientPort, privatePort, token),
              KERN_RESOURCE_SHORTAGE);
  }
  EXPECT_EQ(privatePort, kPortNull);
  EXPECT_EQ(platform::PortDeallocate(clientPort), KERN_SUCCESS);
}

TEST_F(Connect, EndsWhenTheClientsPortDiesAndTakesItsPrivatePortAway) {
  const std::size_t names = platform::PortNameCount();
  const auto client = connect();
  const auto [watcher, privatePort] = *server->clientPorts->begin();
  client->ownPort.reset();
  pump();
  expectNoTrace(names);
  EXPECT_EQ(HelperServerForPort(privatePort), nullptr);
  EXPECT_EQ(HelperServerForPort(watcher->port()), nullptr);
  EXPECT_TRUE(support::IsHungUp(client->privatePort.get()));
  EXPECT_TRUE(idleTimerIsArmed());
}

TEST_F(Connect, DoesNotEndWhenTheClientDropsItsSendRightOfThePrivatePort) {
  const auto client = connect();
  client->privatePort.reset();
  pump();
  EXPECT_EQ(server->clientPorts->size(), 1U);
}

TEST_F(Connect, GivesEachClientAPrivatePortOfItsOwn) {
  const auto first = connect();
  const auto second = connect();
  EXPECT_EQ(server->clientPorts->size(), 2U);
  EXPECT_EQ(server->portSources->size(), 2U);
  first->ownPort.reset();
  pump();
  const support::Packet reply = request(*second, support::Message(8683551, 24));
  EXPECT_EQ(reply.bytes.size(), 36U) << "the other client is served on";
}

TEST_F(Connect, IsNotDeliveredBeforeTheExitsThatPrecedeIt) {
  // A process that is entitled and ends, while the queue that would hear of it is kept busy.
  int release[2];
  ASSERT_EQ(::pipe2(release, O_CLOEXEC), 0);
  const pid_t child = ::fork();
  if (child == 0) {
    ::close(release[1]);
    char byte = 0;
    (void)!::read(release[0], &byte, 1);
    ::_exit(0);
  }
  ::close(release[0]);
  wire::AuditToken token;
  token.words[5] = static_cast<std::uint32_t>(child);
  token.words[7] = platform::ProcessVersion(platform::OpenPidfd(child).get(), child);
  ASSERT_TRUE(CallerHasEntitlement(wire::kRequiredEntitlement, token));
  ASSERT_EQ(GetEntitlementRegistrySize().watchers, 1U);

  std::promise<void> busy;
  std::promise<void> go;
  platform::PostToGlobalQueue([&busy, gate = go.get_future().share()] {
    busy.set_value();
    gate.wait();
  });
  busy.get_future().wait();
  ::close(release[1]);
  ::waitpid(child, nullptr, 0);
  // Only the connecting process itself is remembered once it has been let in.
  const auto client = connect();
  EXPECT_EQ(GetEntitlementRegistrySize().grants, 1U);
  EXPECT_EQ(GetEntitlementRegistrySize().watchers, 1U);
  go.set_value();
}

TEST_F(Connect, RemovalOfNothingIsHarmless) {
  const std::lock_guard guard(server->lock);
  HelperServerRemoveClient(nullptr, kPortNull, server);
  HelperServerRemoveClient(nullptr, kPortDead, server);
}

TEST_F(Connect, DeathOfAPortIsTracedToItsServerThroughTheMap) {
  support::PortPair port = support::MakePort();
  const PortName name = platform::PortAdoptSendRight(std::move(port.send), nullptr);
  PortToServerMapAdd(name, server);
  const auto watcher = platform::PortWatcher::Create(name, nullptr);
  watcher->setInvalidationCallback(MachPortInvalidationCallBack);
  watcher->invalidate();
  EXPECT_EQ(HelperServerForPort(name), nullptr);
  EXPECT_FALSE(platform::PortQuery(name));
  EXPECT_TRUE(idleTimerIsArmed());
}

using ConnectDeathTest = Connect;

TEST_F(ConnectDeathTest, OfAPortWithoutAServerFailsTheAssertion) {
  ::testing::FLAGS_gtest_death_test_style = "threadsafe";
  support::PortPair port = support::MakePort();
  const PortName name = platform::PortAdoptSendRight(std::move(port.send), nullptr);
  const auto watcher = platform::PortWatcher::Create(name, nullptr);
  EXPECT_DEATH(MachPortInvalidationCallBack(watcher.get(), nullptr),
               "Helper/Shared/Server/HelperServerUtils:310: MachPortInvalidationCallBack: "
               "Assertion `server' failed");
  EXPECT_EQ(platform::PortDeallocate(name), KERN_SUCCESS);
}

}  // namespace
