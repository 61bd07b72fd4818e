// SPDX-License-Identifier: Apache-2.0
//
// What message ports of any kind keep to, run on those in memory and on those of sockets. One
// thread.
#include <gtest/gtest.h>

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Helper/Platform/Linux/MessagePortSocket.h"
#include "Helper/Shared/Interface/OneWayMessage.h"
#include "Tests/Fakes/FakeMessagePorts.h"
#include "Tests/Files/FolderForTest.h"
#include "Tests/MessagePort/PublishedPort.h"

namespace {

using Message = fakes::FakeMessagePorts::Message;

constexpr char kName[] = "com.zarvo.Halvec.lasd";

class MemoryPorts {
 public:
  platform::MessagePorts& service() { return ports_; }
  void publish(const std::string& name) { ports_.publish(name); }
  void retract(const std::string& name) { ports_.retract(name); }
  std::optional<Message> take(const std::string& name) {
    if (ports_.isEmpty(name)) return std::nullopt;
    return ports_.take(name);
  }

 private:
  fakes::FakeMessagePorts ports_;
};

class SocketPorts {
 public:
  platform::MessagePorts& service() { return ports_; }
  void publish(const std::string& name) {
    published_[name] = std::make_unique<message_port_test::PublishedPort>(folder_.at(name));
  }
  void retract(const std::string& name) { published_.erase(name); }
  std::optional<Message> take(const std::string& name) {
    const std::vector<std::byte> datagram = published_.at(name)->take();
    if (datagram.empty()) return std::nullopt;
    const auto message = wire::DecodeOneWay(datagram);
    EXPECT_TRUE(message);
    return Message{message->id, {message->payload.begin(), message->payload.end()}};
  }

 private:
  files_test::FolderForTest folder_;
  platform::MessagePortSockets ports_{folder_.at("")};
  std::map<std::string, std::unique_ptr<message_port_test::PublishedPort>> published_;
};

std::vector<std::byte> Bytes(std::size_t count) {
  std::vector<std::byte> bytes(count);
  for (std::size_t at = 0; at < count; ++at) bytes[at] = static_cast<std::byte>(at % 251);
  return bytes;
}

template <class Ports>
class MessagePortContract : public testing::Test {
 protected:
  Ports ports;
};

class PortNames {
 public:
  template <class Ports>
  static std::string GetName(int) {
    return std::is_same_v<Ports, MemoryPorts> ? "Memory" : "Sockets";
  }
};

using Implementations = testing::Types<MemoryPorts, SocketPorts>;
TYPED_TEST_SUITE(MessagePortContract, Implementations, PortNames);

TYPED_TEST(MessagePortContract, HasNoHandleToANameThatNobodyPublished) {
  EXPECT_EQ(this->ports.service().createRemote(kName), nullptr);
  this->ports.publish("com.zarvo.other");
  EXPECT_EQ(this->ports.service().createRemote(kName), nullptr);
}

TYPED_TEST(MessagePortContract, HasNoHandleToWhatIsNoPortName) {
  this->ports.publish(kName);
  for (const std::string& name :
       {std::string(), std::string("."), std::string(".."), std::string("../ports/") + kName,
        std::string("/") + kName, std::string(kName) + "/", std::string(200, 'n'),
        std::string(kName) + '\0'}) {
    EXPECT_EQ(this->ports.service().createRemote(name), nullptr) << name;
  }
}

TYPED_TEST(MessagePortContract, DeliversIdAndPayloadOfEveryLength) {
  this->ports.publish(kName);
  const auto remote = this->ports.service().createRemote(kName);
  ASSERT_NE(remote, nullptr);
  for (const std::size_t length : {0UL, 1UL, 2UL, 3UL, 4UL, 5UL, 1000UL, 128UL << 10}) {
    EXPECT_TRUE(remote->sendRequest(-7, Bytes(length))) << length;
    EXPECT_EQ(this->ports.take(kName), (Message{-7, Bytes(length)})) << length;
  }
  EXPECT_FALSE(this->ports.take(kName));
}

TYPED_TEST(MessagePortContract, LosesAPayloadBeyond128KiB) {
  this->ports.publish(kName);
  const auto remote = this->ports.service().createRemote(kName);
  ASSERT_NE(remote, nullptr);
  EXPECT_FALSE(remote->sendRequest(0, Bytes((128 << 10) + 1)));
  EXPECT_FALSE(this->ports.take(kName));
}

TYPED_TEST(MessagePortContract, KeepsTheOrderAcrossHandles) {
  this->ports.publish(kName);
  for (int id = 0; id < 5; ++id) {
    const auto remote = this->ports.service().createRemote(kName);
    ASSERT_NE(remote, nullptr);
    EXPECT_TRUE(remote->sendRequest(id, {}));
  }
  for (int id = 0; id < 5; ++id) EXPECT_EQ(this->ports.take(kName), (Message{id, {}}));
}

TYPED_TEST(MessagePortContract, LosesWhatAFullQueueCannotTakeAndGoesOnWhenThereIsRoom) {
  this->ports.publish(kName);
  const auto remote = this->ports.service().createRemote(kName);
  ASSERT_NE(remote, nullptr);
  int sent = 0;
  while (sent < 100'000 && remote->sendRequest(sent, {})) ++sent;
  ASSERT_GT(sent, 0);
  ASSERT_LT(sent, 100'000) << "the queue has no end";
  EXPECT_EQ(this->ports.take(kName)->id, 0);
  EXPECT_TRUE(remote->sendRequest(sent, {}));
  for (int id = 1; id <= sent; ++id) EXPECT_EQ(this->ports.take(kName)->id, id);
}

TYPED_TEST(MessagePortContract, LosesWhatIsSentToAPublisherThatHasGone) {
  this->ports.publish(kName);
  const auto remote = this->ports.service().createRemote(kName);
  ASSERT_NE(remote, nullptr);
  this->ports.retract(kName);
  EXPECT_FALSE(remote->sendRequest(0, Bytes(3)));
  EXPECT_EQ(this->ports.service().createRemote(kName), nullptr);
}

}  // namespace
