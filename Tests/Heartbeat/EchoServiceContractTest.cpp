// SPDX-License-Identifier: Apache-2.0
//
// What every echo service keeps to, run on the one in memory and on raw sockets in a network of the
// test's own, where the loopback interface stands for the cellular one. One thread.
#include <gtest/gtest.h>
#include <net/if.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstring>

#include "Helper/Heartbeat/EchoExchange.h"
#include "Helper/Heartbeat/EchoRequest.h"
#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Linux/HandsetErrors.h"
#include "Tests/Fakes/FakeEchoService.h"
#include "Tests/Support/WireClient.h"

namespace {

using platform::EchoDestination;
using platform::EchoService;
using platform::EchoSocket;
using platform::EchoTime;
using platform::EchoTransfer;
using platform::HandsetError;

class MemoryNetwork {
 public:
  MemoryNetwork() {
    service_.interfaces["lo"] = 1;
    service_.network = [](const fakes::FakeEchoService::Packet& request) {
      return std::vector<fakes::FakeEchoService::Arrival>{
          {.delay = 10, .packet = fakes::EchoReplyTo(request)}};
    };
  }
  [[nodiscard]] static const char* refusal() { return nullptr; }
  EchoService& service() { return service_; }

 private:
  fakes::FakeEchoService service_;
};

class RealNetwork {
 public:
  RealNetwork() {
    if (::unshare(CLONE_NEWNET) != 0) {
      refusal_ = ::strerrordesc_np(errno);
      return;
    }
    const platform::FileDescriptor socket(::socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    ifreq request{};
    std::strcpy(static_cast<char*>(request.ifr_name), "lo");
    request.ifr_flags = IFF_UP;
    if (::ioctl(socket.get(), SIOCSIFFLAGS, &request) != 0) refusal_ = ::strerrordesc_np(errno);
  }
  [[nodiscard]] const char* refusal() const { return refusal_; }
  static EchoService& service() { return platform::DefaultProvider<EchoService>(); }

 private:
  const char* refusal_ = nullptr;
};

template <class Network>
class EchoServiceContract : public testing::Test {
 protected:
  void SetUp() override {
    if (network.refusal()) GTEST_SKIP() << "no network of its own: " << network.refusal();
  }
  std::unique_ptr<EchoSocket> open() { return network.service().open(1); }
  static EchoDestination loopback() {
    return {.family = EchoDestination::kIpv4, .address = {127, 0, 0, 1}};
  }
  static bool limit(EchoSocket& socket, EchoTime time) {
    HandsetError error = 0;
    return socket.setReceiveTimeout(time, error);
  }

  Network network;
};

class NetworkNames {
 public:
  template <class Network>
  static std::string GetName(int) {
    return std::is_same_v<Network, MemoryNetwork> ? "Memory" : "RawSockets";
  }
};
using Networks = testing::Types<MemoryNetwork, RealNetwork>;
TYPED_TEST_SUITE(EchoServiceContract, Networks, NetworkNames);

TYPED_TEST(EchoServiceContract, KnowsIcmpAndNoInventedProtocol) {
  EXPECT_EQ(this->network.service().protocolNumber("icmp"), 1);
  EXPECT_FALSE(this->network.service().protocolNumber("no-such-protocol"));
}

TYPED_TEST(EchoServiceContract, KnowsInterfacesByName) {
  EXPECT_NE(this->network.service().interfaceIndex("lo"), 0U);
  EXPECT_EQ(this->network.service().interfaceIndex("nosuch0"), 0U);
}

TYPED_TEST(EchoServiceContract, ResolvesNoHostThatDoesNotExist) {
  EXPECT_FALSE(this->network.service().resolve("heartbeat.invalid"));
}

TYPED_TEST(EchoServiceContract, ExchangesARequestForItsReply) {
  const auto socket = this->open();
  ASSERT_TRUE(socket);
  socket->setReceiveBuffer(51'200);
  socket->bindToInterface(this->network.service().interfaceIndex("lo"));
  ASSERT_TRUE(this->limit(*socket, {.seconds = 10}));
  const EchoRequest request = MakeEchoRequest(0x4242, {.seconds = 1, .microseconds = 2});
  const EchoTransfer sent = socket->send(this->loopback(), request);
  EXPECT_EQ(sent.length, 48);
  EchoBuffer buffer{};
  EchoTransfer received;
  do {
    received = socket->receive(buffer);
    ASSERT_GE(received.length, 0) << received.error;
  } while (!IsEchoReply(buffer, received.length, 0x4242));
  EXPECT_EQ(received.length, 20 + 48) << "with the IPv4 header in front";
  EXPECT_EQ(std::memcmp(&buffer[28], &request[8], 40), 0);
}

TYPED_TEST(EchoServiceContract, GivesUpReceivingWith35WhenTheTimeIsOver) {
  const auto socket = this->open();
  ASSERT_TRUE(socket && this->limit(*socket, {.seconds = 0, .microseconds = 1000}));
  EchoBuffer buffer{};
  const EchoTransfer received = socket->receive(buffer);
  EXPECT_LT(received.length, 0);
  EXPECT_EQ(received.error, 35);
}

TYPED_TEST(EchoServiceContract, ClosesASocketOnceHoweverOftenItIsAsked) {
  const auto socket = this->open();
  const auto other = this->open();
  ASSERT_TRUE(socket && other);
  socket->close();
  const auto third = this->open();  // may get the number that became free
  ASSERT_TRUE(third);
  socket->close();
  EXPECT_EQ(socket->send(this->loopback(), MakeEchoRequest(1, {})).error, 9);
  EchoBuffer buffer{};
  EXPECT_EQ(socket->receive(buffer).error, 9);
  EXPECT_EQ(third->send(this->loopback(), MakeEchoRequest(1, {})).length, 48);
}

TYPED_TEST(EchoServiceContract, SendsToNothingButIpv4) {
  const auto socket = this->open();
  ASSERT_TRUE(socket);
  EchoDestination destination = this->loopback();
  destination.family = 30;
  const EchoTransfer sent = socket->send(destination, MakeEchoRequest(1, {}));
  EXPECT_LT(sent.length, 0);
  EXPECT_EQ(sent.error, 47);
}

TYPED_TEST(EchoServiceContract, ReadsBothClocks) {
  HandsetError error = 0;
  EchoTime first;
  EchoTime second;
  ASSERT_TRUE(this->network.service().timeOfDay(first, error));
  EXPECT_GT(first.seconds, 1'600'000'000);
  EXPECT_LT(first.microseconds, 1'000'000);
  ASSERT_TRUE(this->network.service().uptime(first, error));
  ASSERT_TRUE(this->network.service().uptime(second, error));
  EXPECT_GE(second.seconds * 1'000'000 + second.microseconds,
            first.seconds * 1'000'000 + first.microseconds);
}

TEST(RawEchoSocket, LeavesNoDescriptorBehindInAnHoursWorthOfExchanges) {
  const RealNetwork network;
  if (network.refusal()) GTEST_SKIP() << "no network of its own: " << network.refusal();
  const platform::String target("127.0.0.1");
  ASSERT_EQ(ExchangeEcho(target), 0);
  const std::size_t descriptors = support::OpenDescriptors();
  constexpr int kExchangesOfAnHour = 60 * 60 / 2;
  int answered = 0;
  for (int exchange = 0; exchange < kExchangesOfAnHour; ++exchange) {
    if (ExchangeEcho(target) == 0) ++answered;
  }
  EXPECT_EQ(answered, kExchangesOfAnHour);
  EXPECT_EQ(support::OpenDescriptors(), descriptors);
}

TEST(RawEchoSocket, CannotBeHadForAProtocolThatDoesNotExist) {
  EXPECT_EQ(platform::DefaultProvider<EchoService>().open(100'000), nullptr);
}

TEST(RawEchoSocket, ReportsANetworkThatIsDownByTheHandsetsNumber) {
  if (::unshare(CLONE_NEWNET) != 0) GTEST_SKIP() << "no network of its own";
  const auto socket = platform::DefaultProvider<EchoService>().open(1);
  ASSERT_TRUE(socket);
  const EchoDestination nowhere{.family = EchoDestination::kIpv4, .address = {192, 0, 2, 1}};
  EXPECT_EQ(socket->send(nowhere, MakeEchoRequest(1, {})).error, 51);
}

TEST(HandsetErrors, AreThoseOfTheHandset) {
  using platform::HandsetErrorOf;
  EXPECT_EQ(HandsetErrorOf(0), 0);
  EXPECT_EQ(HandsetErrorOf(EPERM), 1);
  EXPECT_EQ(HandsetErrorOf(EBADF), 9);
  EXPECT_EQ(HandsetErrorOf(EINVAL), 22);
  EXPECT_EQ(HandsetErrorOf(EAGAIN), 35);
  EXPECT_EQ(HandsetErrorOf(EDEADLK), 11);
  EXPECT_EQ(HandsetErrorOf(EPFNOSUPPORT), 46);
  EXPECT_EQ(HandsetErrorOf(ENETUNREACH), 51);
  EXPECT_EQ(HandsetErrorOf(ETIMEDOUT), 60);
  EXPECT_EQ(HandsetErrorOf(EHOSTUNREACH), 65);
  EXPECT_EQ(HandsetErrorOf(EKEYREJECTED), 5) << "which the handset lacks";
  EXPECT_EQ(HandsetErrorOf(-1), 5);
}

}  // namespace
