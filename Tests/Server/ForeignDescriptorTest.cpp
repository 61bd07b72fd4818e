// SPDX-License-Identifier: Apache-2.0
//
// Descriptors whose close would wait, in every place where a client can put one. A server that
// waits for them answers nobody, and these tests do not end.
#include <fcntl.h>
#include <sys/socket.h>

#include <vector>

#include "Helper/Platform/UnixSocketAddress.h"
#include "Tests/Support/LingeringSocket.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using support::Bytes;
using support::Get;
using support::LingeringSocket;
using support::Put;

class ForeignDescriptor : public support::ServerFixture {
 protected:
  void SetUp() override {
    start();
    good = connect();
  }

  /// Sends to the service port with the given descriptors, and keeps none of them.
  void sendToService(const Bytes& bytes, const std::vector<int>& descriptors) {
    const support::FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    const int on = 1;
    ASSERT_EQ(::setsockopt(socket.get(), SOL_SOCKET, SO_PASSCRED, &on, sizeof on), 0);
    const platform::UnixSocketAddress address(launcher.path());
    ASSERT_EQ(::connect(socket.get(), address.get(), address.size()), 0);
    ASSERT_EQ(support::SendPacket(socket.get(), bytes, descriptors), 0);
    slow.leave();
  }
  void expectGoodClientIsServed() {
    EXPECT_EQ(request(*good, support::Message(8683551, 24)).bytes.size(), 36U);
  }
  /// An end of a port in which a packet lies that carries the slow descriptor.
  support::PortPair portWithSlowDescriptorInside() {
    support::PortPair port = support::MakePort();
    EXPECT_EQ(support::SendPacket(port.receive.get(), {}), 0) << "an empty one before it";
    EXPECT_EQ(support::SendPacket(port.receive.get(), {}, {slow.get()}), 0);
    return port;
  }

  LingeringSocket slow;
  std::unique_ptr<support::WireClient> good;
};

TEST_F(ForeignDescriptor, BesideThoseOfAConnectKeepsNobodyWaiting) {
  support::PortPair reply = support::MakePort();
  support::PortPair own = support::MakePort();
  sendToService(support::ConnectRequest(), {reply.send.get(), own.send.get(), slow.get()});
  pump();
  EXPECT_EQ(support::ReceivePacket(reply.receive.get()).bytes.size(), 40U);
  expectGoodClientIsServed();
}

TEST_F(ForeignDescriptor, LastOfAsManyAsTravelKeepsNobodyWaiting) {
  const support::FileDescriptor file(::open("/dev/null", O_RDONLY | O_CLOEXEC));
  std::vector<int> descriptors(252, file.get());
  descriptors.push_back(slow.get());
  sendToService(Bytes(23), descriptors);
  pump();
  expectGoodClientIsServed();
}

TEST_F(ForeignDescriptor, InPlaceOfAReplyRightKeepsNobodyWaiting) {
  sendToService(support::ConnectRequest(), {slow.get()});
  pump();
  expectGoodClientIsServed();
}

TEST_F(ForeignDescriptor, InPlaceOfTheClientsPortKeepsNobodyWaiting) {
  support::PortPair reply = support::MakePort();
  sendToService(support::ConnectRequest(), {reply.send.get(), slow.get()});
  pump();
  expectGoodClientIsServed();
}

TEST_F(ForeignDescriptor, InPlaceOfMemoryKeepsNobodyWaiting) {
  Bytes bytes(568);
  Put(bytes, 0, 0x80000000U);
  Put(bytes, 4, 568U);
  Put(bytes, 20, 8683555);
  Put(bytes, 24, 1U);
  Put(bytes, 28, std::uint64_t{1});
  bytes[39] = 1;
  Put(bytes, 40, 64U);
  ASSERT_EQ(support::SendPacket(good->privatePort.get(), bytes, {slow.get()}), 0);
  slow.leave();
  pump();
  EXPECT_EQ(Get<std::int32_t>(support::ReceivePacket(good->privatePort.get()).bytes, 32), -304);
  expectGoodClientIsServed();
}

TEST_F(ForeignDescriptor, InsideAReplyRightKeepsNobodyWaiting) {
  support::PortPair reply = portWithSlowDescriptorInside();
  support::PortPair own = support::MakePort();
  sendToService(support::ConnectRequest(), {reply.send.get(), own.send.get()});
  reply.send.reset();
  pump();
  expectGoodClientIsServed();
}

TEST_F(ForeignDescriptor, InsideTheClientsPortKeepsNobodyWaiting) {
  support::PortPair reply = support::MakePort();
  support::PortPair own = portWithSlowDescriptorInside();
  sendToService(support::ConnectRequest(), {reply.send.get(), own.send.get()});
  own.send.reset();
  pump();
  EXPECT_EQ(Get<std::int32_t>(support::ReceivePacket(reply.receive.get()).bytes, 32), 5);
  expectGoodClientIsServed();
}

TEST_F(ForeignDescriptor, UnreadWhenItsClientLeavesKeepsNobodyWaiting) {
  const auto leaving = connect();
  // One request is served at each turn, and the client's death is heard in the first.
  for (int index = 0; index < 8; ++index) {
    ASSERT_EQ(support::SendPacket(leaving->privatePort.get(), support::Message(8683551, 24)), 0);
  }
  ASSERT_EQ(support::SendPacket(leaving->privatePort.get(), Bytes(23), {slow.get()}), 0);
  slow.leave();
  leaving->privatePort.reset();
  leaving->ownPort.reset();
  pump();
  expectGoodClientIsServed();
}

}  // namespace
