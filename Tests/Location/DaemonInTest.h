// SPDX-License-Identifier: Apache-2.0
//
// The telephony daemon's side in literal bytes: publishes the connection port in a folder of its
// own, takes connections and says over them what the test wants. One thread: what is said before
// the call is there when the call waits. Shares no code with the framework's provider.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <optional>
#include <string>
#include <utility>

#include "Tests/Files/FolderForTest.h"
#include "Tests/MessagePort/PublishedPort.h"
#include "Tests/Support/WireClient.h"

namespace location_test {

/// A one-way message: header, length, payload, padding.
inline support::Bytes OneWay(std::int32_t id, const support::Bytes& payload) {
  support::Bytes bytes(28 + (payload.size() + 3) / 4 * 4);
  support::Put(bytes, 4, static_cast<std::uint32_t>(bytes.size()));
  support::Put(bytes, 20, id);
  support::Put(bytes, 24, static_cast<std::uint32_t>(payload.size()));
  std::copy(payload.begin(), payload.end(), bytes.begin() + 28);
  return bytes;
}

inline support::Bytes Answer(std::int32_t domain, std::int32_t code) {
  support::Bytes payload(8);
  support::Put(payload, 0, domain);
  support::Put(payload, 4, code);
  return OneWay(5501101, payload);
}

class DaemonInTest {
 public:
  DaemonInTest() { publish(); }

  [[nodiscard]] std::string portsDirectory() const { return folder_.at(""); }
  void publish() { port_.emplace(folder_.at("com.zarvo.Halvec.connection")); }
  void retract() { port_.reset(); }
  /// As a daemon that was killed: the socket's file stays.
  void die() {
    connection_.reset();
    port_->abandon();
  }

  /// Takes the oldest connection request; empty when none waits.
  support::Bytes takeConnection() {
    support::Packet packet = support::ReceivePacket(port_->get());
    EXPECT_EQ(packet.descriptors.size(), packet.bytes.empty() ? 0U : 1U);
    if (packet.descriptors.size() == 1) connection_ = std::move(packet.descriptors.front());
    return packet.bytes;
  }
  void say(const support::Bytes& packet) const {
    EXPECT_EQ(support::SendPacket(connection_.get(), packet), 0);
  }
  [[nodiscard]] support::Bytes hear() const {
    return support::ReceivePacket(connection_.get()).bytes;
  }
  void close() { connection_.reset(); }
  [[nodiscard]] int connection() const { return connection_.get(); }
  [[nodiscard]] int port() const { return port_->get(); }
  [[nodiscard]] std::string portPath() const { return folder_.at("com.zarvo.Halvec.connection"); }
  [[nodiscard]] const files_test::FolderForTest& folder() const { return folder_; }

 private:
  files_test::FolderForTest folder_;
  std::optional<message_port_test::PublishedPort> port_;
  support::FileDescriptor connection_;
};

}  // namespace location_test
