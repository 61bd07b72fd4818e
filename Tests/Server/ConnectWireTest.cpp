// SPDX-License-Identifier: Apache-2.0
//
// The connect message, byte for byte.
#include <sys/socket.h>

#include "Helper/Platform/ForeignDescriptor.h"
#include "Helper/Platform/UnixSocketAddress.h"
#include "Helper/Shared/Server/ConnectSubsystem.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using support::Bytes;
using support::Get;
using support::Put;

class ConnectWire : public support::ServerFixture {
 protected:
  void SetUp() override { start(); }

  Bytes replyTo(const Bytes& request, bool askForCredentials = true) {
    client.sendConnect(request, askForCredentials);
    pump();
    return client.takeConnectReply();
  }
  /// The ordinary error reply to connect.
  static Bytes errorReply(std::int32_t code) {
    Bytes reply{0, 0, 0,    0,    36,   0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0,
                0, 0, 0xd2, 0x1f, 0x49, 0, 0, 0, 0, 0, 1, 0, 0, 0, 0, 0, 0, 0};
    Put(reply, 32, code);
    return reply;
  }

  support::WireClient client{launcher.path()};
};

TEST_F(ConnectWire, SuccessIsFortyBytesWithACopySendRight) {
  EXPECT_EQ(replyTo(support::ConnectRequest()),
            (Bytes{0,    0,    0,    0x80, 40, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0,  0,
                   0xd2, 0x1f, 0x49, 0,    1,  0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 19, 0}));
  EXPECT_TRUE(client.privatePort);
}

TEST_F(ConnectWire, OfACallerWithoutTheEntitlementGetsTheErrorReplyWith35) {
  security.answer(wire::kRequiredEntitlement, {});
  EXPECT_EQ(replyTo(support::ConnectRequest()), errorReply(35));
}

TEST_F(ConnectWire, ThatIsNotComplexGetsMinus304) {
  Bytes request = support::ConnectRequest();
  request[3] = 0;
  EXPECT_EQ(replyTo(request), errorReply(-304));
}

TEST_F(ConnectWire, OfAnyOtherSizeGetsMinus304) {
  for (const std::size_t size : {24U, 28U, 36U, 39U, 41U, 44U, 64U, 4096U}) {
    Bytes request = support::ConnectRequest();
    request.resize(size);
    Put(request, 4, static_cast<std::uint32_t>(size));
    EXPECT_EQ(replyTo(request), errorReply(-304)) << size;
  }
}

TEST_F(ConnectWire, WhoseHeaderLiesAboutItsSizeGetsMinus304) {
  for (const std::uint32_t size : {0U, 23U, 39U, 41U, 0xffffffffU}) {
    Bytes request = support::ConnectRequest();
    Put(request, 4, size);
    EXPECT_EQ(replyTo(request), errorReply(-304)) << size;
  }
}

TEST_F(ConnectWire, WithAnyOtherDescriptorCountGetsMinus304) {
  for (const std::uint32_t count : {0U, 2U, 3U, 0xffffffffU}) {
    Bytes request = support::ConnectRequest();
    Put(request, 24, count);
    EXPECT_EQ(replyTo(request), errorReply(-304)) << count;
  }
}

TEST_F(ConnectWire, WithMemoryGetsMinus304WhereverItsBytesAre) {
  for (const std::uint64_t place : {0U, 1U, 2U}) {
    for (const std::uint32_t size : {44U, 60U}) {
      Bytes request = support::ConnectRequest();
      request.resize(size);
      Put(request, 4, size);
      Put(request, 24, size == 44 ? 1U : 2U);
      for (std::size_t at = 28; at < size; at += 16) {
        Put(request, at, place);
        request[at + 11] = 1;
        Put(request, at + 12, 8U);
      }
      EXPECT_EQ(replyTo(request), errorReply(-304)) << place << ", " << size;
      request.resize(size + (size == 44 ? 8 : 16), 'm');
      EXPECT_EQ(replyTo(request), errorReply(-304)) << place << ", behind " << size;
    }
  }
}

TEST_F(ConnectWire, WithACopySendOrMakeSendDescriptorGetsMinus300) {
  for (const int disposition : {16, 18, 19, 20, 21, 0, 255}) {
    Bytes request = support::ConnectRequest();
    request[38] = static_cast<std::uint8_t>(disposition);
    EXPECT_EQ(replyTo(request), errorReply(-300)) << disposition;
    platform::ForeignCloseQueue().sync([] {});
    EXPECT_TRUE(support::IsHungUp(client.ownPort.get())) << "the right must be given back";
  }
}

TEST_F(ConnectWire, WithADescriptorOfAnotherTypeGetsMinus300) {
  for (const int type : {1, 2, 3, 255}) {
    Bytes request = support::ConnectRequest();
    request[39] = static_cast<std::uint8_t>(type);
    const Bytes reply = replyTo(request);
    // Type 1 is longer than the message has room for; every type but 0 is refused alike.
    EXPECT_EQ(reply, errorReply(-300)) << type;
  }
}

TEST_F(ConnectWire, OfAnUnknownSenderGetsMinus309) {
  const support::LauncherSocket deaf("com.example.deaf", /*passCredentials=*/false);
  // The message is sent while nobody has asked for credentials, and read by a server that has.
  support::WireClient stranger(deaf.path());
  stranger.sendConnect(support::ConnectRequest(), /*askForCredentials=*/false);
  HelperServer* other = HelperServerCreate("com.example.deaf", &RequestSubsystem());
  ASSERT_NE(other, nullptr);
  pump();
  EXPECT_EQ(stranger.takeConnectReply(), errorReply(-309));
  EXPECT_TRUE(other->clientPorts->empty());
  HelperServerDestroy(other);
}

TEST_F(ConnectWire, WithAnyOtherIdOnTheServicePortGetsMinus303) {
  for (const std::int32_t id : {4792173, 4792175, 8683549, 0, -1, INT32_MIN, INT32_MAX}) {
    Bytes request = support::ConnectRequest();
    Put(request, 20, id);
    const Bytes reply = replyTo(request);
    ASSERT_EQ(reply.size(), 36U) << id;
    EXPECT_EQ(Get<std::uint32_t>(reply, 20), static_cast<std::uint32_t>(id) + 100);
    EXPECT_EQ(Get<std::int32_t>(reply, 32), -303);
    EXPECT_TRUE(support::IsHungUp(client.ownPort.get())) << "the right must be given back";
  }
}

TEST_F(ConnectWire, WithoutAClientPortGets5) {
  const support::PortPair reply = support::MakePort();
  support::WireClient lone(launcher.path());
  lone.sendConnect();
  pump();
  (void)lone.takeConnectReply();
  // One descriptor only: it is the reply right, and the client's port is the null name.
  support::FileDescriptor sender(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const int on = 1;
  ::setsockopt(sender.get(), SOL_SOCKET, SO_PASSCRED, &on, sizeof on);
  const platform::UnixSocketAddress address(launcher.path());
  ASSERT_EQ(::connect(sender.get(), address.get(), address.size()), 0);
  ASSERT_EQ(support::SendPacket(sender.get(), support::ConnectRequest(), {reply.send.get()}), 0);
  pump();
  EXPECT_EQ(support::ReceivePacket(reply.receive.get()).bytes, errorReply(5));
}

/// Calls the stub with a message in memory: its trailer is the kernel's word on a real port.
class ConnectStub : public support::ServerFixture {
 protected:
  static std::vector<std::byte> call(std::uint32_t trailerType, std::uint32_t trailerSize,
                                     std::vector<std::byte>& request) {
    const Bytes bytes = support::ConnectRequest();
    request.assign(bytes.size() + sizeof(wire::Trailer), std::byte{0x55});
    std::memcpy(request.data(), bytes.data(), bytes.size());
    wire::Store(request.data() + 40, trailerType);
    wire::Store(request.data() + 44, trailerSize);
    std::vector<std::byte> reply(40);
    const auto header = wire::Load<wire::MessageHeader>(request.data());
    platform::PrepareReply(header, reply.data(), 40);
    ConnectSubsystem().demultiplex(header)(request.data(), reply.data());
    return reply;
  }
};

TEST_F(ConnectStub, LeavesThePreparedReplyAloneWhenTheTrailerTypeIsNotZero) {
  std::vector<std::byte> request;
  const std::vector<std::byte> reply = call(1, 52, request);
  std::vector<std::byte> prepared(40);
  platform::PrepareReply(wire::MessageHeader{.id = 4792174}, prepared.data(), 40);
  EXPECT_EQ(reply, prepared);
  EXPECT_EQ(wire::Load<std::int32_t>(reply.data() + 32), -303);
  // Kept: the error stands in the request instead.
  EXPECT_EQ(wire::Load<std::int32_t>(request.data() + 32), -309);
  EXPECT_EQ((wire::Load<std::array<std::uint8_t, 8>>(request.data() + 24)), wire::kNdrRecord);
}

TEST_F(ConnectStub, AnswersMinus309WhenTheTrailerIsTooShort) {
  for (const std::uint32_t size : {0U, 8U, 31U}) {
    std::vector<std::byte> request;
    const std::vector<std::byte> reply = call(0, size, request);
    EXPECT_EQ(wire::Load<std::int32_t>(reply.data() + 32), -309) << size;
  }
}

TEST_F(ConnectStub, TakesATrailerOf32Bytes) {
  // Long enough: the caller is judged, and refused because no such process is entitled.
  security.answer(wire::kRequiredEntitlement, {});
  std::vector<std::byte> request;
  const std::vector<std::byte> reply = call(0, 32, request);
  EXPECT_EQ(wire::Load<std::int32_t>(reply.data() + 32), 35);
}

TEST(ConnectSubsystemShape, HasOneRoutine) {
  const platform::MigSubsystem& subsystem = ConnectSubsystem();
  EXPECT_EQ(subsystem.startId, 4792174);
  EXPECT_EQ(subsystem.endId, 4792175);
  EXPECT_EQ(subsystem.maxReplySize, 40U);
  ASSERT_EQ(subsystem.routines.size(), 1U);
  EXPECT_EQ(subsystem.routines[0].argumentCount, 11U);
  EXPECT_EQ(subsystem.routines[0].maxReplySize, 40U);
  EXPECT_NE(subsystem.demultiplex({.id = 4792174}), nullptr);
  EXPECT_EQ(subsystem.demultiplex({.id = 4792173}), nullptr);
  EXPECT_EQ(subsystem.demultiplex({.id = 4792175}), nullptr);
}

}  // namespace
