// SPDX-License-Identifier: Apache-2.0
//
// What travels to the telephony daemon, byte for byte, and what a daemon can do wrong.
#include "Helper/Platform/Linux/TelephonySockets.h"

#include <sys/resource.h>
#include <sys/socket.h>

#include <memory>
#include <string>
#include <thread>

#include "Tests/Location/DaemonInTest.h"
#include "Tests/Support/LingeringSocket.h"

namespace {

using location_test::Answer;
using location_test::OneWay;
using platform::String;
using platform::TelephonyResult;
using support::Bytes;

constexpr std::int32_t kAnswerId = 5501101;
constexpr std::int32_t kNotificationId = 5501002;
constexpr platform::Duration kShort = std::chrono::milliseconds(1);
constexpr platform::Duration kAmple = std::chrono::seconds(20);

Bytes operator+(Bytes left, const Bytes& right) {
  left.insert(left.end(), right.begin(), right.end());
  return left;
}
Bytes Text(const std::string& text) { return {text.begin(), text.end()}; }

class TelephonySockets : public ::testing::Test {
 protected:
  /// A connection whose daemon's end the test holds.
  void open(platform::Duration answerLimit) {
    platform::TelephonySockets framework(daemon.portsDirectory(), answerLimit);
    connection = framework.createConnection(
        [](platform::TelephonyConnection*, void* context) { ++*static_cast<int*>(context); },
        &notifications);
    ASSERT_NE(connection, nullptr);
    daemon.takeConnection();
  }
  TelephonyResult call() { return connection->setCivicInfo({String("US"), {}, {}, {}}); }
  /// What a call comes to when `packet` is what the daemon says.
  TelephonyResult callAnsweredBy(const Bytes& packet) {
    open(kAmple);
    daemon.say(packet);
    return call();
  }
  static TelephonyResult systemError(std::int32_t code) { return {.domain = 1, .errorCode = code}; }

  location_test::DaemonInTest daemon;
  std::unique_ptr<platform::TelephonyConnection> connection;
  int notifications = 0;
};

TEST_F(TelephonySockets, ConnectWithOnePortDescriptorAndTheIdentifiers) {
  platform::TelephonySockets framework(daemon.portsDirectory(), kAmple);
  framework.addIdentifierException(String("HalvecMobileHelper"));
  const auto opened = framework.createConnection(nullptr, nullptr);
  ASSERT_NE(opened, nullptr);
  // Array of one text of 18 characters, the offsets of the two, and the trailer: 63 bytes.
  const Bytes payload = Text("bplist00") + Bytes{0xa1, 0x01, 0x5f, 0x10, 0x12} +
                        Text("HalvecMobileHelper") + Bytes{0x08, 0x0a} +
                        Bytes{0, 0, 0, 0, 0, 0, 1, 1} + Bytes{0, 0, 0, 0, 0, 0, 0, 2} +
                        Bytes{0, 0, 0, 0, 0, 0, 0, 0} + Bytes{0, 0, 0, 0, 0, 0, 0, 0x1f};
  ASSERT_EQ(payload.size(), 65U);
  Bytes expected = Bytes{0x00, 0x00, 0x00, 0x80,    // complex
                         0x70, 0x00, 0x00, 0x00} +  // 112 bytes
                   Bytes(12) +
                   Bytes{0x48, 0xf0, 0x53, 0x00,  // 5501000
                         0x01, 0x00, 0x00, 0x00} +
                   Bytes(10) + Bytes{0x11, 0x00,  // a send right that moves
                                     0x41, 0x00, 0x00, 0x00} +
                   payload + Bytes(3);
  EXPECT_EQ(daemon.takeConnection(), expected);
}

TEST_F(TelephonySockets, SendTheTextsThatAreThereInTheirOrder) {
  open(kShort);
  (void)connection->setCivicInfo({String("US"), {}, String(""), String("95014")});
  // {"country": "US", "city": "", "postalCode": "95014"}
  const Bytes payload = Text("bplist00") + Bytes{0xd3, 1, 2, 3, 4, 5, 6, 0x57} + Text("country") +
                        Bytes{0x54} + Text("city") + Bytes{0x5a} + Text("postalCode") +
                        Bytes{0x52} + Text("US") + Bytes{0x50, 0x55} + Text("95014") +
                        Bytes{0x08, 0x0f, 0x17, 0x1c, 0x27, 0x2a, 0x2b} +
                        Bytes{0, 0, 0, 0, 0, 0, 1, 1} + Bytes{0, 0, 0, 0, 0, 0, 0, 7} +
                        Bytes{0, 0, 0, 0, 0, 0, 0, 0} + Bytes{0, 0, 0, 0, 0, 0, 0, 0x31};
  EXPECT_EQ(daemon.hear(), OneWay(5501001, payload));
}

TEST_F(TelephonySockets, GiveTheAnswerWhateverItsNumbers) {
  EXPECT_EQ(callAnsweredBy(Answer(0, 0)), TelephonyResult{});
  EXPECT_EQ(callAnsweredBy(Answer(INT32_MIN, INT32_MAX)),
            (TelephonyResult{.domain = INT32_MIN, .errorCode = INT32_MAX}));
}

TEST_F(TelephonySockets, Answer22ToWhatIsNoAnswer) {
  Bytes wrongSize = Answer(0, 0);
  support::Put(wrongSize, 4, 40U);
  Bytes complex = Answer(0, 0);
  support::Put(complex, 0, 0x80000000U);
  Bytes wrongLength = Answer(0, 0);
  support::Put(wrongLength, 24, 0xffffffffU);
  for (const Bytes& packet : {Bytes{1}, Bytes(23), Bytes(28), Bytes(200), OneWay(kAnswerId, {}),
                              OneWay(kAnswerId, Bytes(7)), OneWay(kAnswerId, Bytes(9)),
                              OneWay(5501001, Bytes(8)), OneWay(0, Bytes(8)), wrongSize, complex,
                              wrongLength, Answer(0, 0) + Bytes(4), Bytes(140 * 1024)}) {
    EXPECT_EQ(callAnsweredBy(packet), systemError(22)) << packet.size();
  }
}

TEST_F(TelephonySockets, Answer60WhenNothingComesInTime) {
  open(kShort);
  EXPECT_EQ(call(), systemError(60));
  EXPECT_EQ(notifications, 0);
}

TEST_F(TelephonySockets, Answer60ToADaemonThatOnlyNotifies) {
  open(std::chrono::milliseconds(20));
  // Blocks while the connection is full of notifications that nobody has read yet.
  const Bytes notification = OneWay(kNotificationId, {});
  std::thread chatter([&] {
    while (::send(daemon.connection(), notification.data(), notification.size(), MSG_NOSIGNAL) >=
           0) {
    }
  });
  EXPECT_EQ(call(), systemError(60));
  connection.reset();
  chatter.join();
  EXPECT_GT(notifications, 0);
}

TEST_F(TelephonySockets, Answer57ToADaemonThatClosesInsteadOfAnswering) {
  open(kAmple);
  daemon.say(OneWay(kNotificationId, {}));
  daemon.close();
  EXPECT_EQ(call(), systemError(57));
  EXPECT_EQ(notifications, 0);  // the call could not even be sent
}

TEST_F(TelephonySockets, Answer57ToADaemonThatWillSayNothingMore) {
  open(kAmple);
  daemon.say(OneWay(kNotificationId, {}));
  ::shutdown(daemon.connection(), SHUT_WR);
  EXPECT_EQ(call(), systemError(57));
  EXPECT_EQ(notifications, 1);
}

TEST_F(TelephonySockets, Answer57ToADaemonThatDiedWithTheRequestUnread) {
  platform::TelephonySockets framework(daemon.portsDirectory(), kAmple);
  connection = framework.createConnection(nullptr, nullptr);
  daemon.die();
  EXPECT_EQ(call(), systemError(57));
}

TEST_F(TelephonySockets, TakeTheAnswerOfADaemonThatClosesBehindIt) {
  open(kAmple);
  std::thread answerer([this] {
    EXPECT_FALSE(support::AwaitPacket(daemon.connection()).bytes.empty());
    daemon.say(Answer(0, 5));
    daemon.close();
  });
  EXPECT_EQ(call().errorCode, 5);
  answerer.join();
}

TEST_F(TelephonySockets, PassOverEmptyPacketsAndLargeNotifications) {
  open(kAmple);
  daemon.say({});
  daemon.say(OneWay(kNotificationId, Bytes(100'000)));
  daemon.say({});
  daemon.say(Answer(0, 0));
  EXPECT_EQ(call(), TelephonyResult{});
  EXPECT_EQ(notifications, 1);
}

TEST_F(TelephonySockets, Answer35WhenTheConnectionTakesNothingMore) {
  open(kShort);
  TelephonyResult result = call();
  for (int count = 0; count < 10'000 && result == systemError(60); ++count) result = call();
  EXPECT_EQ(result, systemError(35));
}

TEST_F(TelephonySockets, Answer40ToTextsThatFitIntoNoMessage) {
  open(kAmple);
  const auto text = String::Decode(std::string(128 * 1024, 'x'), platform::StringEncoding::kUtf8);
  EXPECT_EQ(connection->setCivicInfo({text, {}, {}, {}}), systemError(40));
  EXPECT_TRUE(daemon.hear().empty());
}

TEST_F(TelephonySockets, CloseTheirEndWithTheConnection) {
  open(kAmple);
  EXPECT_FALSE(support::IsHungUp(daemon.connection()));
  connection.reset();
  EXPECT_TRUE(support::IsHungUp(daemon.connection()));
}

TEST_F(TelephonySockets, KeepNoDescriptorBeyondTheConnection) {
  const std::size_t before = support::OpenDescriptors();
  for (int round = 0; round < 3; ++round) {
    open(kAmple);
    EXPECT_EQ(support::SendPacket(daemon.connection(), OneWay(kNotificationId, {}),
                                  {daemon.connection(), daemon.port()}),
              0);
    daemon.say(Answer(0, 0));
    EXPECT_EQ(call(), TelephonyResult{});
    connection.reset();
    daemon.close();
    EXPECT_EQ(support::OpenDescriptors(), before);
  }
}

TEST_F(TelephonySockets, HaveNoConnectionToAPortThatNobodyHolds) {
  platform::TelephonySockets framework(daemon.portsDirectory(), kAmple);
  daemon.die();
  EXPECT_EQ(framework.createConnection(nullptr, nullptr), nullptr);
  daemon.retract();
  EXPECT_EQ(framework.createConnection(nullptr, nullptr), nullptr);
}

TEST_F(TelephonySockets, HaveNoConnectionToAPortThatIsALink) {
  const location_test::DaemonInTest other;
  daemon.retract();
  daemon.folder().link("com.zarvo.Halvec.connection", other.portPath());
  platform::TelephonySockets framework(daemon.portsDirectory(), kAmple);
  EXPECT_EQ(framework.createConnection(nullptr, nullptr), nullptr);
}

TEST_F(TelephonySockets, HaveNoConnectionWhenTheDaemonReadsNoneAndLeakNothing) {
  platform::TelephonySockets framework(daemon.portsDirectory(), kAmple);
  std::vector<std::unique_ptr<platform::TelephonyConnection>> queued;
  do {
    queued.push_back(framework.createConnection(nullptr, nullptr));
  } while (queued.back() && queued.size() < 10'000);
  EXPECT_EQ(queued.back(), nullptr);
  const std::size_t before = support::OpenDescriptors();
  EXPECT_EQ(framework.createConnection(nullptr, nullptr), nullptr);
  EXPECT_EQ(support::OpenDescriptors(), before);
}

TEST_F(TelephonySockets, HaveNoConnectionWithoutFreeDescriptors) {
  platform::TelephonySockets framework(daemon.portsDirectory(), kAmple);
  const std::size_t before = support::OpenDescriptors();
  const auto lowestFree = static_cast<rlim_t>(support::FileDescriptor(::dup(daemon.port())).get());
  rlimit limit{};
  ASSERT_EQ(::getrlimit(RLIMIT_NOFILE, &limit), 0);
  for (rlim_t free = 0; free < 3; ++free) {
    const rlimit tight{.rlim_cur = lowestFree + free, .rlim_max = limit.rlim_max};
    ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &tight), 0);
    EXPECT_EQ(framework.createConnection(nullptr, nullptr), nullptr) << free;
    ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &limit), 0);
    EXPECT_EQ(support::OpenDescriptors(), before);
  }
}

TEST_F(TelephonySockets, DoNotWaitForDescriptorsThatTheDaemonSendsAlong) {
  // Who does wait for them waits ten minutes.
  support::LingeringSocket slow;
  open(kAmple);
  ASSERT_EQ(support::SendPacket(daemon.connection(), {}, {slow.get()}), 0);
  daemon.say(Answer(0, 7));
  ASSERT_EQ(support::SendPacket(daemon.connection(), {}, {slow.get()}), 0);
  slow.leave();
  EXPECT_EQ(call(), (TelephonyResult{.domain = 0, .errorCode = 7}));
  connection.reset();
}

}  // namespace
