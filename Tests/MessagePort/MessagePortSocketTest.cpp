// SPDX-License-Identifier: Apache-2.0
//
// The bytes of a one-way message, and what is nobody's port. One thread.
#include <gtest/gtest.h>

#include <initializer_list>
#include <string>
#include <vector>

#include "Helper/Platform/Linux/MessagePortSocket.h"
#include "Helper/Shared/Interface/OneWayMessage.h"
#include "Tests/Files/FolderForTest.h"
#include "Tests/MessagePort/PublishedPort.h"

namespace {

using message_port_test::PublishedPort;
using Datagram = std::vector<std::byte>;

Datagram Literal(std::initializer_list<int> values) {
  Datagram bytes;
  for (const int value : values) bytes.push_back(static_cast<std::byte>(value));
  return bytes;
}

class MessagePortSocket : public testing::Test {
 protected:
  files_test::FolderForTest folder;
  platform::MessagePortSockets ports{folder.at("")};
};

TEST_F(MessagePortSocket, SendsHeaderLengthPayloadAndZerosUpToAMultipleOfFour) {
  const PublishedPort port(folder.at("port"));
  const auto remote = ports.createRemote("port");
  ASSERT_NE(remote, nullptr);
  ASSERT_TRUE(remote->sendRequest(0x01020304, Literal({0xaa, 0xbb, 0xcc, 0xdd, 0xee})));
  EXPECT_EQ(port.take(), Literal({0,    0,    0,    0,    36,   0, 0, 0,  // bits, size
                                  0,    0,    0,    0,    0,    0, 0, 0,  // ports
                                  0,    0,    0,    0,    4,    3, 2, 1,  // voucher, id
                                  5,    0,    0,    0,                    // length
                                  0xaa, 0xbb, 0xcc, 0xdd, 0xee, 0, 0, 0}));
  ASSERT_TRUE(remote->sendRequest(0, {}));
  Datagram empty(28);
  empty[4] = std::byte{28};
  EXPECT_EQ(port.take(), empty);
}

TEST_F(MessagePortSocket, IsNotReachedThroughASymbolicLink) {
  const PublishedPort port(folder.at("port"));
  folder.link("link", folder.at("port"));
  EXPECT_EQ(ports.createRemote("link"), nullptr);
}

TEST_F(MessagePortSocket, IsNeitherAFileNorAFolderNorAFifo) {
  folder.file("file", "text");
  folder.folder("folder");
  folder.fifo("fifo");
  for (const char* name : {"file", "folder", "fifo"}) {
    EXPECT_EQ(ports.createRemote(name), nullptr) << name;
  }
}

TEST_F(MessagePortSocket, IsNotTheFileThatAKilledPublisherLeft) {
  PublishedPort port(folder.at("port"));
  port.abandon();
  EXPECT_EQ(ports.createRemote("port"), nullptr);
}

TEST_F(MessagePortSocket, IsNoSocketOfAnotherType) {
  const PublishedPort port(folder.at("port"), SOCK_SEQPACKET);
  EXPECT_EQ(ports.createRemote("port"), nullptr);
}

TEST(OneWayMessage, IsReadBackExactly) {
  const Datagram payload = Literal({1, 2, 3});
  const Datagram datagram = wire::EncodeOneWay({.id = 9, .payload = payload});
  const auto message = wire::DecodeOneWay(datagram);
  ASSERT_TRUE(message);
  EXPECT_EQ(message->id, 9);
  EXPECT_EQ(Datagram(message->payload.begin(), message->payload.end()), payload);
}

TEST(OneWayMessage, IsRefusedWhenItsLengthsDisagree) {
  const Datagram good = wire::EncodeOneWay({.id = 9, .payload = Literal({1, 2, 3})});
  for (std::size_t length = 0; length < good.size(); ++length) {
    EXPECT_FALSE(wire::DecodeOneWay(std::span(good).first(length))) << length;
  }
  for (const int length : {0, 5, 255}) {
    Datagram bytes = good;
    bytes[24] = static_cast<std::byte>(length);
    EXPECT_FALSE(wire::DecodeOneWay(bytes)) << length;
  }
  Datagram longer = good;
  longer.resize(longer.size() + 4);
  EXPECT_FALSE(wire::DecodeOneWay(longer));
  Datagram complex = good;
  complex[3] = std::byte{0x80};
  EXPECT_FALSE(wire::DecodeOneWay(complex));
  Datagram huge = good;
  for (std::size_t at = 24; at < 28; ++at) huge[at] = std::byte{0xff};
  EXPECT_FALSE(wire::DecodeOneWay(huge));
}

}  // namespace
