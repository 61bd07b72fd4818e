// SPDX-License-Identifier: Apache-2.0
//
// One exchange on a network in memory: what goes out, what is waited for, and every outcome.
#include "Helper/Heartbeat/EchoExchange.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <string>

#include "Helper/Heartbeat/EchoRequest.h"
#include "Tests/Fakes/FakeEchoService.h"

namespace {

using fakes::EchoReplyTo;
using fakes::FakeEchoService;
using platform::String;
using Arrival = FakeEchoService::Arrival;
using Packet = FakeEchoService::Packet;
namespace handset = platform::handset;

constexpr std::int64_t kSecond = 1'000'000;
const String kTarget("192.0.2.1");

std::uint16_t Identifier() { return static_cast<std::uint16_t>(::getpid() & 0xffff); }

class EchoExchange : public testing::Test {
 protected:
  /// The network answers each request with these.
  void arrive(std::vector<Arrival> arrivals) {
    echo.network = [arrivals = std::move(arrivals)](const Packet&) { return arrivals; };
  }
  void answerAfter(std::int64_t delay) {
    echo.network = [delay](const Packet& request) {
      return std::vector<Arrival>{{.delay = delay, .packet = EchoReplyTo(request)}};
    };
  }
  /// Runs one exchange; `took` is how long it waited in microseconds.
  std::int32_t exchange(const String& target = kTarget) {
    const std::int64_t before = echo.uptimeMicroseconds();
    const std::int32_t outcome = ExchangeEcho(target);
    took = echo.uptimeMicroseconds() - before;
    EXPECT_EQ(echo.openSockets(), 0);
    return outcome;
  }
  static Packet reply(std::uint16_t identifier) {
    const EchoRequest request = MakeEchoRequest(identifier, {});
    return EchoReplyTo({request.begin(), request.end()});
  }

  FakeEchoService echo;
  platform::ScopedReplacement<platform::EchoService> replacement{echo};
  std::int64_t took = 0;
};

TEST_F(EchoExchange, SendsOneRequestOverTheCellularInterface) {
  answerAfter(30'000);
  EXPECT_EQ(exchange(), 0);
  EXPECT_EQ(took, 30'000);
  const auto sent = echo.takeSent();
  ASSERT_EQ(sent.size(), 1U);
  const EchoRequest expected = MakeEchoRequest(Identifier(), echo.wallClock);
  EXPECT_EQ(sent[0].packet, Packet(expected.begin(), expected.end()));
  EXPECT_EQ(sent[0].destination.length, 0);
  EXPECT_EQ(sent[0].destination.family, 2);
  EXPECT_EQ(sent[0].destination.port, 0);
  EXPECT_EQ(sent[0].destination.address, (std::array<std::uint8_t, 4>{192, 0, 2, 1}));
  EXPECT_EQ(sent[0].interface, 7U);
  EXPECT_EQ(echo.protocol(), 1);
  EXPECT_EQ(echo.receiveBuffer(), 51'200);
  EXPECT_EQ(echo.receiveTimeout().seconds, 1);
  EXPECT_EQ(echo.receiveTimeout().microseconds, 0);
}

TEST_F(EchoExchange, SendsUnboundWithoutTheCellularInterface) {
  echo.interfaces = {{"wlan0", 3}};
  answerAfter(0);
  EXPECT_EQ(exchange(), 0);
  const auto sent = echo.takeSent();
  ASSERT_EQ(sent.size(), 1U);
  EXPECT_EQ(sent[0].interface, 0U);
}

TEST_F(EchoExchange, WithoutAnyReplyTakesTwoReceiveTimeouts) {
  EXPECT_EQ(exchange(), 60);
  EXPECT_EQ(took, 2 * kSecond);
  EXPECT_EQ(echo.receives(), 2);
}

TEST_F(EchoExchange, WaitsAFullSecondFromItsFirstPacketOn) {
  const Packet other = reply(static_cast<std::uint16_t>(Identifier() + 1));
  arrive({{.delay = 400'000, .packet = other},
          {.delay = 999'999, .packet = other},
          {.delay = 1, .packet = other},
          {.delay = 1, .packet = reply(Identifier())}});
  EXPECT_EQ(exchange(), 60) << "the reply came after the second was over";
  EXPECT_EQ(took, 1'400'000);
  EXPECT_EQ(echo.receives(), 3);
}

TEST_F(EchoExchange, CountsWholeSecondsAcrossTheTurnOfASecond) {
  const Packet other = reply(static_cast<std::uint16_t>(Identifier() + 1));
  // The clock stands at x.300000 s: 800 ms later the second has turned, but none has passed.
  arrive({{.delay = 0, .packet = other},
          {.delay = 800'000, .packet = other},
          {.delay = 199'999, .packet = reply(Identifier())}});
  EXPECT_EQ(exchange(), 0);
  EXPECT_EQ(took, 999'999);
}

TEST_F(EchoExchange, IsAnsweredByAReplyThatComesWithTheWaitsLastPacket) {
  const Packet other = reply(static_cast<std::uint16_t>(Identifier() + 1));
  arrive({{.delay = 0, .packet = other}, {.delay = kSecond, .packet = reply(Identifier())}});
  EXPECT_EQ(exchange(), 0);
}

TEST_F(EchoExchange, IsAnsweredByAReplyInTheSecondReceive) {
  answerAfter(1'700'000);
  EXPECT_EQ(exchange(), 0);
  EXPECT_EQ(took, 1'700'000);
}

TEST_F(EchoExchange, DoesNotTakeItsOwnRequestLoopingBackForAReply) {
  echo.network = [](const Packet& request) {
    Packet looped = EchoReplyTo(request);
    looped[20] = std::byte{8};
    return std::vector<Arrival>{{.delay = 0, .packet = looped}};
  };
  EXPECT_EQ(exchange(), 60);
}

TEST_F(EchoExchange, IsEndedByTheClockHoweverManyOtherPacketsCome) {
  const Packet other = reply(static_cast<std::uint16_t>(Identifier() + 1));
  arrive(std::vector<Arrival>(100'000, {.delay = 100, .packet = other}));
  EXPECT_EQ(exchange(), 60);
  EXPECT_EQ(took, kSecond + 100);
  EXPECT_EQ(echo.receives(), 10'001);
}

TEST_F(EchoExchange, GoesOnAfterPacketsTooShortToSayAnything) {
  arrive({{.packet = {}},
          {.packet = {std::byte{0x4f}}},
          {.packet = Packet(27, std::byte{0xff})},
          {.packet = reply(Identifier())}});
  EXPECT_EQ(exchange(), 0);
}

TEST_F(EchoExchange, ComparesWhatAnEarlierPacketLeftBehindAShortOne) {
  Packet foreign = reply(Identifier());
  foreign[20] = std::byte{8};
  Packet stump(21);
  stump[0] = std::byte{0x4f};  // claims a header of 60 bytes
  Packet prepared(70);
  prepared[64] = static_cast<std::byte>(Identifier() >> 8);
  prepared[65] = static_cast<std::byte>(Identifier() & 0xff);
  prepared[0] = std::byte{0x4f};
  prepared[60] = std::byte{0};
  arrive({{.packet = foreign}, {.packet = prepared}, {.packet = stump}});
  EXPECT_EQ(exchange(), 0);
  EXPECT_EQ(echo.receives(), 3) << "the packet of 70 bytes was itself too short behind its header";
}

TEST_F(EchoExchange, TakesALargeReplyCutToItsBuffer) {
  Packet large = reply(Identifier());
  large.resize(4000);
  arrive({{.packet = large}});
  EXPECT_EQ(exchange(), 0);
}

TEST_F(EchoExchange, Answers60WhenReceivingFails) {
  arrive({{.delay = 10, .packet = {}, .error = 50, .length = -1}});
  EXPECT_EQ(exchange(), 60);
  EXPECT_EQ(took, 10) << "at once";
}

TEST_F(EchoExchange, Answers22ForATargetThatDoesNotFit) {
  const std::string longest(255, 'h');
  const std::string tooLong(256, 'h');
  EXPECT_EQ(exchange(String(longest.c_str())), 65);
  EXPECT_EQ(exchange(String(tooLong.c_str())), 22);
  EXPECT_EQ(echo.opened(), 0);
}

TEST_F(EchoExchange, Answers65ForAHostThatIsUnknown) {
  EXPECT_EQ(exchange(String("heartbeat.invalid")), 65);
  EXPECT_EQ(exchange(String("192.0.2.256")), 65) << "no address either";
  EXPECT_EQ(exchange(String("")), 65);
  EXPECT_EQ(echo.opened(), 0);
}

TEST_F(EchoExchange, GoesToTheFirstAddressOfAHostThatIsKnown) {
  echo.hosts["heartbeat.example"] = {198, 51, 100, 7};
  answerAfter(0);
  EXPECT_EQ(exchange(String("heartbeat.example")), 0);
  EXPECT_EQ(echo.takeSent().at(0).destination.address,
            (std::array<std::uint8_t, 4>{198, 51, 100, 7}));
}

TEST_F(EchoExchange, LooksTheAddressOfAllOnesUpAsAName) {
  EXPECT_EQ(exchange(String("255.255.255.255")), 65);
}

TEST_F(EchoExchange, Answers46WithoutTheProtocol) {
  echo.protocols.clear();
  EXPECT_EQ(exchange(), 46);
  EXPECT_EQ(echo.opened(), 0);
}

TEST_F(EchoExchange, ResolvesTheTargetBeforeItLooksTheProtocolUp) {
  echo.protocols.clear();
  EXPECT_EQ(exchange(String("heartbeat.invalid")), 65);
}

TEST_F(EchoExchange, Answers1WithoutASocket) {
  echo.faults.open = true;
  EXPECT_EQ(exchange(), 1);
}

TEST_F(EchoExchange, AnswersTheErrorOfTheReceiveTimeoutAndClosesTwice) {
  echo.faults.receiveTimeout = 12;
  EXPECT_EQ(exchange(), 12);
  EXPECT_EQ(echo.closeCalls(), 2);
  EXPECT_TRUE(echo.takeSent().empty());
}

TEST_F(EchoExchange, GoesOnWithTheClosedSocketWhenTheReceiveTimeoutFailsWithoutAReason) {
  echo.faults.receiveTimeout = 0;
  EXPECT_EQ(exchange(), 9) << "what sending on it comes to";
}

TEST_F(EchoExchange, AnswersTheErrorOfSending) {
  echo.faults.send = 51;
  EXPECT_EQ(exchange(), 51);
  EXPECT_EQ(echo.receives(), 0);
}

TEST_F(EchoExchange, Answers1WhenSendingFailsWithoutAReasonOrIsCutShort) {
  echo.faults.send = 0;
  EXPECT_EQ(exchange(), 1);
  echo.faults.send.reset();
  echo.faults.sendLength = 47;
  EXPECT_EQ(exchange(), 1);
}

TEST_F(EchoExchange, AnswersTheErrorOfTheClockBeforeItSends) {
  echo.faults.timeOfDay = 14;
  EXPECT_EQ(exchange(), 14);
  echo.faults.timeOfDay = 0;
  EXPECT_EQ(exchange(), 1);
  EXPECT_TRUE(echo.takeSent().empty());
}

TEST_F(EchoExchange, AnswersTheErrorOfTheClockAtTheStartOfTheWaitEvenWhenTheReplyIsThere) {
  answerAfter(0);
  echo.faults.uptime = {1, 14};
  EXPECT_EQ(exchange(), 14);
}

TEST_F(EchoExchange, Answers1WhenTheClockAtTheStartOfTheWaitFailsWithoutAReason) {
  answerAfter(0);
  echo.faults.uptime = {1, 0};
  EXPECT_EQ(exchange(), 1);
}

TEST_F(EchoExchange, Answers60WhenTheClockFailsDuringTheWait) {
  echo.faults.uptime = {2, 14};
  EXPECT_EQ(exchange(), 60);
  EXPECT_EQ(took, kSecond);
}

}  // namespace
