// SPDX-License-Identifier: Apache-2.0
//
// Clients that flood, stall, lie about what they send or shut what they share: each costs nobody
// else anything and leaves no right, descriptor or memory behind.
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/socket.h>

#include "Helper/Platform/Port.h"
#include "Helper/Platform/UnixSocketAddress.h"
#include "Tests/Fakes/FakePreferencesStore.h"
#include "Tests/Support/DescriptorLimit.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using support::Bytes;
using support::Get;
using support::Put;

class HostileClient : public support::ServerFixture {
 protected:
  void SetUp() override {
    start();
    good = connect();
    bad = connect();
    names = platform::PortNameCount();
    descriptors = support::OpenDescriptors();
  }

  void expectGoodClientIsServed() {
    EXPECT_EQ(request(*good, support::Message(8683551, 24)).bytes.size(), 36U);
  }
  void expectNothingLeaked() const {
    EXPECT_EQ(platform::PortNameCount(), names);
    EXPECT_EQ(support::OpenDescriptors(), descriptors);
  }
  static Bytes setPreferenceHeader(std::uint32_t size) {
    Bytes bytes(568);
    Put(bytes, 0, 0x80000000U);
    Put(bytes, 4, 568U);
    Put(bytes, 20, 8683555);
    Put(bytes, 24, 1U);
    Put(bytes, 28, std::uint64_t{1});
    bytes[39] = 1;
    Put(bytes, 40, size);
    Put(bytes, 564, size);
    return bytes;
  }
  std::int32_t codeForMemory(int file, std::uint32_t size) {
    const support::Packet reply = request(*bad, setPreferenceHeader(size), {file});
    return reply.bytes.size() == 36 ? Get<std::int32_t>(reply.bytes, 32) : 0;
  }
  static support::FileDescriptor memory(std::size_t size, unsigned seals) {
    support::FileDescriptor file(::memfd_create("value", MFD_CLOEXEC | MFD_ALLOW_SEALING));
    EXPECT_EQ(::ftruncate(file.get(), static_cast<off_t>(size)), 0);
    EXPECT_EQ(::fcntl(file.get(), F_ADD_SEALS, seals), 0);
    return file;
  }
  static constexpr unsigned kSeals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE;

  std::unique_ptr<support::WireClient> good;
  std::unique_ptr<support::WireClient> bad;
  std::size_t names = 0;
  std::size_t descriptors = 0;
};

TEST_F(HostileClient, SendingRightsThatNoMessageCarriesHasThemClosed) {
  const support::FileDescriptor file(::open("/dev/null", O_RDONLY | O_CLOEXEC));
  const std::size_t before = support::OpenDescriptors();
  for (const std::size_t count : {1U, 2U, 8U, 9U, 40U, 253U}) {
    const std::vector<int> surplus(count, file.get());
    (void)request(*bad, support::Message(8683551, 24), surplus);
    EXPECT_EQ(support::OpenDescriptors(), before) << count;
  }
  expectGoodClientIsServed();
}

TEST_F(HostileClient, SendingMoreRightsThanThereAreDescriptorsIsToldOfTheShortage) {
  const support::FileDescriptor file(::open("/dev/null", O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(support::SendPacket(bad->privatePort.get(), support::Message(8683551, 24),
                                std::vector<int>(40, file.get())),
            0);
  {
    const support::DescriptorLimit none(0);
    pump();
  }
  const support::Packet reply = support::ReceivePacket(bad->privatePort.get());
  EXPECT_EQ(Get<std::int32_t>(reply.bytes, 32), 6);
}

TEST_F(HostileClient, ThatNeverReadsLosesItsRepliesAndNobodyElsesTime) {
  for (int index = 0; index < 3000; ++index) {
    if (support::SendPacket(bad->privatePort.get(), support::Message(8683551, 24)) != 0) pump();
  }
  pump();
  expectGoodClientIsServed();
  expectNothingLeaked();
}

TEST_F(HostileClient, ThatFloodsIsServedInTurnWithTheOthers) {
  while (support::SendPacket(bad->privatePort.get(), support::Message(8683551, 24)) == 0) {
  }
  ASSERT_EQ(support::SendPacket(good->privatePort.get(), support::Message(8683551, 24)), 0);
  // Two turns of the loop at most pass before each of two waiting clients has had its own.
  (void)loop.run(0);
  (void)loop.run(0);
  EXPECT_EQ(support::ReceivePacket(good->privatePort.get()).bytes.size(), 36U);
}

TEST_F(HostileClient, SendingScrapsIsNotAnswered) {
  for (const std::size_t size : {0U, 1U, 23U}) {
    EXPECT_TRUE(request(*bad, Bytes(size)).bytes.empty()) << size;
  }
  EXPECT_EQ(request(*bad, support::Message(8683551, 24)).bytes.size(), 36U);
  expectNothingLeaked();
}

TEST_F(HostileClient, SendingAnOversizePacketGetsMinus304) {
  const int large = 1 << 20;
  ::setsockopt(bad->privatePort.get(), SOL_SOCKET, SO_SNDBUFFORCE, &large, sizeof large);
  const support::Packet reply = request(*bad, support::Message(8683551, 150'000));
  EXPECT_EQ(Get<std::int32_t>(reply.bytes, 32), -304);
  expectNothingLeaked();
}

TEST_F(HostileClient, ThatShutsTheSharedChannelMakesNobodySpin) {
  ASSERT_EQ(::shutdown(bad->privatePort.get(), SHUT_RDWR), 0);
  pump();  // fails by itself when the loop does not come to rest
  expectGoodClientIsServed();
  bad->ownPort.reset();
  pump();
  EXPECT_EQ(server->clientPorts->size(), 1U);
}

TEST_F(HostileClient, ThatWritesToItsOwnPortIsCutOff) {
  ASSERT_EQ(support::SendPacket(bad->ownPort.get(), {1}), 0);
  pump();
  EXPECT_EQ(server->clientPorts->size(), 1U);
  EXPECT_TRUE(support::IsHungUp(bad->privatePort.get()));
  expectGoodClientIsServed();
}

TEST_F(HostileClient, ThatQueuesItsOwnPortInsideItselfDoesNotStayForEver) {
  // Its receive right lies in its own queue, so that nobody holds it and it never hangs up.
  ASSERT_EQ(support::SendPacket(bad->ownPort.get(), {1}, {bad->ownPort.get()}), 0);
  bad->ownPort.reset();
  pump();
  EXPECT_EQ(server->clientPorts->size(), 1U);
}

TEST_F(HostileClient, WithUnsealedMemoryGetsMinus304) {
  for (const unsigned seals : {0U, unsigned{F_SEAL_SHRINK}, unsigned{F_SEAL_SHRINK | F_SEAL_GROW},
                               unsigned{F_SEAL_WRITE | F_SEAL_GROW}}) {
    EXPECT_EQ(codeForMemory(memory(64, seals).get(), 64), -304) << seals;
  }
  expectNothingLeaked();
}

TEST_F(HostileClient, WithMemoryOfAnotherSizeGetsMinus304) {
  EXPECT_EQ(codeForMemory(memory(63, kSeals).get(), 64), -304);
  EXPECT_EQ(codeForMemory(memory(65, kSeals).get(), 64), -304);
  EXPECT_EQ(codeForMemory(memory(0, kSeals).get(), 64), -304);
  expectNothingLeaked();
}

TEST_F(HostileClient, WithMemoryBeyond16MiBGetsMinus304) {
  constexpr std::uint32_t kTooLarge = 16 * 1024 * 1024 + 1;
  EXPECT_EQ(codeForMemory(memory(kTooLarge, kSeals).get(), kTooLarge), -304);
  EXPECT_EQ(codeForMemory(memory(std::size_t{1} << 40, kSeals).get(), 0xffffffff), -304);
  expectNothingLeaked();
}

TEST_F(HostileClient, WithSomethingElseThanMemoryGetsMinus304) {
  int ends[2];
  ASSERT_EQ(::pipe2(ends, O_CLOEXEC), 0);
  const support::FileDescriptor reading(ends[0]);
  const support::FileDescriptor writing(ends[1]);
  EXPECT_EQ(codeForMemory(reading.get(), 64), -304);
  const support::FileDescriptor device(::open("/dev/zero", O_RDONLY | O_CLOEXEC));
  EXPECT_EQ(codeForMemory(device.get(), 64), -304);
  const support::FileDescriptor file(::open("/proc/self/exe", O_RDONLY | O_CLOEXEC));
  EXPECT_EQ(codeForMemory(file.get(), 64), -304);
}

TEST_F(HostileClient, WithoutTheAnnouncedMemoryGetsMinus304) {
  const support::Packet reply = request(*bad, setPreferenceHeader(64));
  EXPECT_EQ(Get<std::int32_t>(reply.bytes, 32), -304);
}

TEST_F(HostileClient, PassingAServicesSocketAsAReplyRightIsNotWrittenTo) {
  // A socket with an address belongs to a service that might believe our credentials.
  const support::FileDescriptor listener(::socket(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0));
  const std::string path = launcher.path() + ".other";
  const platform::UnixSocketAddress address(path);
  ASSERT_EQ(::bind(listener.get(), address.get(), address.size()), 0);
  ASSERT_EQ(::listen(listener.get(), 1), 0);
  const support::FileDescriptor socket(::socket(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0));
  ASSERT_EQ(::connect(socket.get(), address.get(), address.size()), 0);
  ::unlink(path.c_str());
  const support::FileDescriptor accepted(::accept4(listener.get(), nullptr, nullptr, SOCK_CLOEXEC));
  Bytes bytes = support::Message(8683551, 24);
  Put(bytes, 0, 18U);
  EXPECT_TRUE(request(*bad, bytes, {socket.get()}).bytes.empty());
  EXPECT_TRUE(request(*bad, bytes, {accepted.get()}).bytes.empty());
  EXPECT_TRUE(support::ReceivePacket(accepted.get()).bytes.empty());
  EXPECT_TRUE(support::ReceivePacket(socket.get()).bytes.empty());
}

/// Clients of a value that no packet has room for.
class LargeReply : public HostileClient {
 protected:
  LargeReply() {
    store.setValue("key", platform::PropertyList(std::string(kSize, 'v')),
                   {.identifier = "domain"});
    Put(copy, 20, 8683556);
    support::PutText(copy, 32, "domain");
    support::PutText(copy, 288, "key");
  }
  static std::int32_t codeOf(const support::Packet& reply) {
    return reply.descriptors.empty() ? Get<std::int32_t>(reply.bytes, 32) : 0;
  }

  static constexpr std::size_t kSize = 200'000;
  Bytes copy = support::Message(8683556, 544);
  fakes::FakePreferencesStore store;
  platform::ScopedReplacement<platform::PreferencesStore> storeReplacement{store};
};

TEST_F(LargeReply, IsTheShortageWhereItsMemoryCannotBeMade) {
  EXPECT_EQ(request(*good, copy).descriptors.size(), 1U);
  ASSERT_EQ(support::SendPacket(good->privatePort.get(), copy), 0);
  {
    const support::DescriptorLimit none(0);
    pump();
  }
  Bytes shortage(36);
  Put(shortage, 4, 36);
  Put(shortage, 20, 8683656);
  shortage[28] = 1;
  Put(shortage, 32, 6);
  EXPECT_EQ(support::ReceivePacket(good->privatePort.get()).bytes, shortage);
  EXPECT_EQ(request(*good, copy).descriptors.size(), 1U) << "once there is room again";
  expectNothingLeaked();
}

TEST_F(LargeReply, OfWhichManyLieUnreadIsTheShortageAndTakesNoMoreMemory) {
  for (int index = 0; index < 100; ++index) {
    ASSERT_EQ(support::SendPacket(bad->privatePort.get(), copy), 0);
    pump();
  }
  std::size_t inMemory = 0;
  std::size_t shortages = 0;
  for (;;) {
    const support::Packet reply = support::ReceivePacket(bad->privatePort.get());
    if (reply.bytes.empty()) break;
    inMemory += reply.descriptors.size();
    if (codeOf(reply) == 6) ++shortages;
  }
  EXPECT_GE(inMemory, 2U) << "a client may be a little behind";
  EXPECT_LE(inMemory, 10U);
  EXPECT_EQ(inMemory + shortages, 100U) << "every request is answered";
  EXPECT_EQ(codeOf(request(*bad, copy)), 0) << "for who reads again";
  expectNothingLeaked();
}

TEST_F(HostileClient, FloodingTheServicePortWithoutEntitlementLeavesNothingBehind) {
  security.answer(wire::kRequiredEntitlement, {});
  HandleProcessExit(::getpid());  // forget that this very process was let in before
  for (int round = 0; round < 200; ++round) {
    support::WireClient stranger(launcher.path());
    stranger.sendConnect();
    pump();
    EXPECT_EQ(Get<std::int32_t>(stranger.takeConnectReply(), 32), 35);
  }
  EXPECT_EQ(platform::PortNameCount(), names);
  EXPECT_LE(support::OpenDescriptors(), descriptors);
}

TEST_F(HostileClient, ComingAndGoingAThousandTimesLeavesNothingBehind) {
  for (int round = 0; round < 1000; ++round) connect().reset();
  pump();
  expectNothingLeaked();
  EXPECT_EQ(server->clientPorts->size(), 2U);
}

}  // namespace
