// SPDX-License-Identifier: Apache-2.0
//
// The one-call services over real ports: the subscription query without a library, the radio
// manager's port and the log line, the heartbeat's trigger on a network in memory.
#include "Helper/Proxies/OneCallServices.h"

#include <thread>

#include "Helper/Shared/Server/RequestRoutines.h"
#include "Tests/Fakes/FakeEchoService.h"
#include "Tests/Fakes/FakeMessagePorts.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using platform::LogPriority;
using support::Bytes;
using support::Get;
using Lines = std::vector<fakes::FakeSystemLog::Line>;
using Message = fakes::FakeMessagePorts::Message;

constexpr std::int32_t kIsSubscribed = 8683561;
constexpr std::int32_t kTriggerHeartbeat = 8683562;
constexpr std::int32_t kSetLogging = 8683569;
const std::string kRadioManager = "com.zarvo.radio-manager";

class OneCallServices : public support::ServerFixture {
 protected:
  void SetUp() override {
    start();
    client = connect();
  }
  /// Sends a request with one integer; the reply.
  Bytes sendInteger(std::int32_t id, std::int32_t value) {
    Bytes bytes = support::Message(id, 36);
    support::Put(bytes, 32, value);
    return request(*client, bytes).bytes;
  }
  static Bytes successReply(std::int32_t id, std::uint32_t size = 36) {
    Bytes reply(size);
    support::Put(reply, 4, size);
    support::Put(reply, 20, id + 100);
    reply[28] = 1;
    return reply;
  }
  static Message logToFile(std::uint8_t enabled) {
    return {1, {std::byte{enabled}, std::byte{0}, std::byte{0}, std::byte{0}}};
  }

  fakes::FakeMessagePorts ports;
  platform::ScopedReplacement<platform::MessagePorts> portsReplacement{ports};
  fakes::FakeEchoService echo;
  platform::ScopedReplacement<platform::EchoService> echoReplacement{echo};
  std::unique_ptr<support::WireClient> client;
};

TEST_F(OneCallServices, AnswerFalseForTheSubscriptionWithoutTheLibraryAndLookForItOnce) {
  for (int query = 0; query < 3; ++query) {
    EXPECT_EQ(request(*client, support::Message(kIsSubscribed, 24)).bytes,
              successReply(kIsSubscribed, 40));
  }
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(OneCallServices, MayBeAskedForTheSubscriptionFromManyThreadsAtOnce) {
  std::vector<std::thread> threads;
  for (int number = 0; number < 8; ++number) {
    threads.emplace_back([] { EXPECT_EQ(IsVoicemailServiceSubscribed(), 0); });
  }
  for (std::thread& thread : threads) thread.join();
}

TEST_F(OneCallServices, FindNoSubscriptionFunctionWithoutTheLibraryAndSayNothing) {
  EXPECT_EQ(LoadVoicemailSubscriptionFunction(), nullptr);
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(OneCallServices, AnswerTheSubscriptionInTheLowestByteAndWriteNoOther) {
  wire::Flag subscribed{0xffff'ffff};
  EXPECT_EQ(server_HvMobileHelperIsVoicemailSubscribed(kPortNull, subscribed), 0);
  EXPECT_EQ(subscribed.value, 0xffff'ff00);
}

TEST_F(OneCallServices, TellTheRadioManagerBeforeTheyLogTheIntegerAsItCame) {
  ports.publish(kRadioManager);
  for (const auto& [value, enabled] :
       {std::pair{2, 1}, std::pair{1, 1}, std::pair{-1, 1}, std::pair{0, 0}}) {
    Lines before{{LogPriority::kError, "nothing was sent"}};
    ports.observeSends([&] { before = log.takeLines(); });
    EXPECT_EQ(sendInteger(kSetLogging, value), successReply(kSetLogging));
    EXPECT_EQ(before, Lines{});
    EXPECT_EQ(ports.take(kRadioManager), logToFile(static_cast<std::uint8_t>(enabled)));
    EXPECT_EQ(log.takeLines(),
              (Lines{{LogPriority::kError,
                      "Enabling wireless radio manager logs: " + std::to_string(value)}}));
  }
  EXPECT_TRUE(ports.isEmpty(kRadioManager));
}

TEST_F(OneCallServices, AnswerZeroAndLogWithoutARadioManagerToo) {
  EXPECT_EQ(sendInteger(kSetLogging, 1), successReply(kSetLogging));
  EXPECT_EQ(log.takeLines(),
            (Lines{{LogPriority::kError, "Enabling wireless radio manager logs: 1"}}));
}

TEST_F(OneCallServices, AnswerZeroWhenTheRadioManagerDoesNotRead) {
  ports.publish(kRadioManager);
  for (int message = 0; message < 20; ++message) {
    EXPECT_EQ(sendInteger(kSetLogging, 1), successReply(kSetLogging));
  }
  EXPECT_EQ(log.takeLines().size(), 20U);
}

TEST_F(OneCallServices, SwitchTheHeartbeatOfTheServerOnWhosePortTheyWereAsked) {
  EXPECT_EQ(sendInteger(kTriggerHeartbeat, -5), successReply(kTriggerHeartbeat));
  const auto busy = [this] {
    const std::lock_guard guard(server->lock);
    return server->busyMask;
  };
  while (busy() != 1) std::this_thread::yield();
  EXPECT_EQ(sendInteger(kTriggerHeartbeat, 0), successReply(kTriggerHeartbeat));
  while (busy() != 0) std::this_thread::yield();
  EXPECT_GE(echo.takeSent().size(), 1U);
  EXPECT_TRUE(log.takeLines().empty());
}

}  // namespace
