// SPDX-License-Identifier: Apache-2.0
//
// The helper's death, silence, and what a client may do afterwards.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <pthread.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <csignal>

#include <atomic>
#include <fstream>
#include <string>

#include "Tests/Client/ConnectedClient.h"

namespace {

using fake::Beside;
using fake::ConnectedClient;
using fake::PlainReply;

constexpr std::uint32_t kClearReply = 0x848083;

hvmh_status Clear(ConnectedClient& client) {
  return hvmh_clear_voicemail_token(client.get(), nullptr);
}

/// The helper's process is gone: the kernel closes everything that it held.
void Die(ConnectedClient& client) { client.helperSide = {}; }

TEST(HelperDeath, IsSeenBetweenRequests) {
  const fake::DescriptorBalance balance;
  ConnectedClient client;
  EXPECT_TRUE(hvmh_client_is_connected(client.get()));
  pollfd watched{hvmh_client_descriptor(client.get()), POLLIN, 0};
  EXPECT_EQ(::poll(&watched, 1, 0), 0) << "quiet while the helper lives";
  Die(client);
  EXPECT_FALSE(hvmh_client_is_connected(client.get()));
  ASSERT_EQ(::poll(&watched, 1, 0), 1);
  EXPECT_NE(watched.revents & POLLHUP, 0);
}

TEST(HelperDeath, EndsARequestThatWasNeverSent) {
  const fake::DescriptorBalance balance;
  ConnectedClient client;
  Die(client);
  EXPECT_EQ(Clear(client), HVMH_HELPER_GONE);
  EXPECT_EQ(Clear(client), HVMH_NOT_CONNECTED) << "the connection is closed";
  EXPECT_EQ(hvmh_client_descriptor(client.get()), -1);
  EXPECT_FALSE(hvmh_client_is_connected(client.get()));
}

TEST(HelperDeath, EndsARequestThatTheHelperHadRead) {
  const fake::DescriptorBalance balance;
  ConnectedClient client;
  Beside helper([&] {
    EXPECT_EQ(client.request().bytes.size(), 24U);
    Die(client);
  });
  EXPECT_EQ(Clear(client), HVMH_HELPER_GONE);
}

/// Waits for a request without reading it.
void AwaitRequest(ConnectedClient& client) {
  pollfd entry{client.helperSide.privatePort.get(), POLLIN, 0};
  EXPECT_EQ(::poll(&entry, 1, 10'000), 1);
}

TEST(HelperDeath, EndsARequestThatTheHelperHadNotRead) {
  const fake::DescriptorBalance balance;
  ConnectedClient client;
  Beside helper([&] {
    AwaitRequest(client);
    Die(client);
  });
  EXPECT_EQ(Clear(client), HVMH_HELPER_GONE);
}

TEST(HelperDeath, DoesNotLoseAReplyThatWasSentBefore) {
  ConnectedClient client;
  Beside helper([&] {
    (void)client.request();
    client.willAnswer(PlainReply(kClearReply, 8));
    Die(client);
  });
  hvmh_error error;
  EXPECT_EQ(hvmh_clear_voicemail_token(client.get(), &error), HVMH_RETURN_CODE);
  EXPECT_EQ(error.return_code, 8);
}

TEST(Reconnect, BringsANewConnectionOnDemand) {
  const fake::DescriptorBalance balance;
  ConnectedClient client;
  Die(client);
  EXPECT_EQ(Clear(client), HVMH_HELPER_GONE);
  {
    Beside helper([&] { client.helperSide = fake::Accept(client.service.socket()); });
    EXPECT_EQ(hvmh_client_reconnect(client.get(), nullptr), HVMH_OK);
  }
  client.willAnswer(PlainReply(kClearReply, 0));
  EXPECT_EQ(Clear(client), HVMH_OK);
}

/// The next instance of the helper: takes a connect and answers one request with 0.
void ServeOnce(ConnectedClient& client) {
  client.helperSide = fake::Accept(client.service.socket());
  EXPECT_EQ(client.request().bytes.size(), 24U);
  client.willAnswer(PlainReply(kClearReply, 0));
}

TEST(Reconnect, HappensByItselfForARequestThatWasNeverSent) {
  const fake::DescriptorBalance balance;
  ConnectedClient client({.reconnect = true});
  Die(client);
  Beside helper([&] { ServeOnce(client); });
  EXPECT_EQ(Clear(client), HVMH_OK);
}

TEST(Reconnect, HappensByItselfForARequestThatWasNeverRead) {
  const fake::DescriptorBalance balance;
  ConnectedClient client({.reconnect = true});
  Beside helper([&] {
    AwaitRequest(client);
    Die(client);
    ServeOnce(client);
  });
  EXPECT_EQ(Clear(client), HVMH_OK);
}

TEST(Reconnect, NeverRepeatsARequestThatTheHelperHadRead) {
  const fake::DescriptorBalance balance;
  ConnectedClient client({.reconnect = true});
  Beside helper([&] {
    (void)client.request();
    Die(client);
  });
  EXPECT_EQ(Clear(client), HVMH_HELPER_GONE);
  helper.join();
  pollfd entry{client.service.socket(), POLLIN, 0};
  EXPECT_EQ(::poll(&entry, 1, 0), 0) << "no second connect was sent";
}

TEST(Reconnect, HappensOncePerRequest) {
  const fake::DescriptorBalance balance;
  ConnectedClient client({.reconnect = true});
  Die(client);
  Beside helper([&] {
    client.helperSide = fake::Accept(client.service.socket());
    AwaitRequest(client);
    Die(client);
  });
  EXPECT_EQ(Clear(client), HVMH_HELPER_GONE);
}

TEST(Reconnect, RepeatsDataInMemoryAsWell) {
  const fake::DescriptorBalance balance;
  ConnectedClient client({.reconnect = true});
  Die(client);
  const fake::Bytes value(300000, 0x33);
  Beside helper([&] {
    client.helperSide = fake::Accept(client.service.socket());
    const fake::Packet packet = client.request();
    ASSERT_EQ(packet.descriptors.size(), 1U);
    fake::Bytes content(value.size());
    EXPECT_EQ(::pread(packet.descriptors[0].get(), content.data(), content.size(), 0), 300000);
    EXPECT_TRUE(content == value);
    client.willAnswer(PlainReply(0x848087, 0));
  });
  EXPECT_EQ(hvmh_set_preference_value(client.get(), "d", "k", value.data(), value.size(), nullptr),
            HVMH_OK);
}

TEST(Reconnect, ReportsThatTheServiceIsNotRunning) {
  ConnectedClient client({.reconnect = true});
  Die(client);
  client.service.close();
  EXPECT_EQ(Clear(client), HVMH_NOT_RUNNING);
}

TEST(RequestLimit, EndsTheWaitForASilentHelperAndTheConnection) {
  const fake::DescriptorBalance balance;
  ConnectedClient client({.requestMilliseconds = 20});
  EXPECT_EQ(Clear(client), HVMH_TIMED_OUT);
  // A reply that comes now can no longer be taken for that of a later request.
  EXPECT_EQ(Clear(client), HVMH_NOT_CONNECTED);
  pollfd ownPort{client.helperSide.clientPort.get(), 0, 0};
  ASSERT_EQ(::poll(&ownPort, 1, 0), 1);
  EXPECT_NE(ownPort.revents & POLLHUP, 0) << "the helper learns that this client is gone";
}

TEST(RequestLimit, HoldsOnAPortThatDoesNotBlock) {
  const fake::DescriptorBalance balance;
  ConnectedClient client({.requestMilliseconds = 20});
  const int flags = ::fcntl(client.helperSide.sendRight.get(), F_GETFL);
  ASSERT_EQ(::fcntl(client.helperSide.sendRight.get(), F_SETFL, flags | O_NONBLOCK), 0);
  EXPECT_EQ(Clear(client), HVMH_TIMED_OUT);
}

TEST(RequestLimit, DoesNotDisturbARequestOnAPortThatDoesNotBlock) {
  ConnectedClient client;
  const int flags = ::fcntl(client.helperSide.sendRight.get(), F_GETFL);
  ASSERT_EQ(::fcntl(client.helperSide.sendRight.get(), F_SETFL, flags | O_NONBLOCK), 0);
  Beside helper([&] {
    (void)client.request();
    client.willAnswer(PlainReply(kClearReply, 0));
  });
  EXPECT_EQ(Clear(client), HVMH_OK);
}

TEST(RequestLimit, EndsTheWaitForAHelperThatOnlySendsEmptyPackets) {
  ConnectedClient client({.requestMilliseconds = 20});
  for (int count = 0; count < 50; ++count) client.willAnswer({});
  EXPECT_EQ(Clear(client), HVMH_TIMED_OUT);
}

TEST(RequestLimit, OfZeroWaitsWithoutEnd) {
  ConnectedClient client({.requestMilliseconds = 0});
  timeval limit{1, 1};
  socklen_t size = sizeof limit;
  ASSERT_EQ(::getsockopt(client.helperSide.sendRight.get(), SOL_SOCKET, SO_RCVTIMEO, &limit, &size),
            0);
  EXPECT_EQ(limit.tv_sec, 0);
  EXPECT_EQ(limit.tv_usec, 0);
  Beside helper([&] {
    (void)client.request();
    client.willAnswer(PlainReply(kClearReply, 0));
  });
  EXPECT_EQ(Clear(client), HVMH_OK);
}

std::atomic<int> signalsSeen{0};

TEST(Signals, DoNotEndARequest) {
  struct sigaction action {};
  struct sigaction before {};
  action.sa_handler = [](int) { ++signalsSeen; };  // without SA_RESTART
  ASSERT_EQ(::sigaction(SIGUSR1, &action, &before), 0);
  ConnectedClient client;
  const pthread_t caller = ::pthread_self();
  {
    Beside helper([&] {
      (void)client.request();
      // Each is delivered before the next is sent, wherever the caller is waiting by then.
      for (int count = 1; count <= 20; ++count) {
        EXPECT_EQ(::pthread_kill(caller, SIGUSR1), 0);
        while (signalsSeen < count) std::this_thread::yield();
      }
      client.willAnswer(PlainReply(kClearReply, 0));
    });
    EXPECT_EQ(Clear(client), HVMH_OK);
  }
  EXPECT_EQ(signalsSeen, 20);
  ASSERT_EQ(::sigaction(SIGUSR1, &before, nullptr), 0);
}

}  // namespace
