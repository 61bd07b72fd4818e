// SPDX-License-Identifier: Apache-2.0
//
// The connect exchange against literal bytes.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <fstream>
#include <string>

#include "Client/HelperClient.h"
#include "Helper/Platform/UnixSocketAddress.h"
#include "Tests/Client/FakeHelper.h"

namespace {

using fake::Beside;
using fake::Bytes;
using halvec::ClientOptions;
using halvec::Error;
using halvec::HelperClient;

ClientOptions OptionsFor(const fake::Service& service, int connectMilliseconds = 10'000) {
  ClientOptions options;
  options.servicePath = service.path();
  options.connectLimit = std::chrono::milliseconds(connectMilliseconds);
  return options;
}

/// Connects while the helper's side answers with `reply` and `descriptors`.
Error ConnectAnsweredWith(const Bytes& reply, const std::vector<int>& descriptors = {}) {
  fake::Service service;
  Beside helper([&] { fake::AnswerConnect(service.socket(), reply, descriptors); });
  return HelperClient::Connect(OptionsFor(service)).error();
}

TEST(Connect, SendsFortyBytesWithReplyRightAndOwnPort) {
  const fake::DescriptorBalance balance;
  fake::Service service;
  fake::Packet packet;
  Beside helper([&] {
    packet = fake::Receive(service.socket());
    ASSERT_EQ(packet.descriptors.size(), 2U);
    fake::Send(packet.descriptors[0].get(), fake::PlainReply(4792274, 5));
  });
  (void)HelperClient::Connect(OptionsFor(service)).error();
  helper.join();
  EXPECT_EQ(fake::ToHex(packet.bytes), fake::ToHex(fake::ConnectRequest()));
}

TEST(Connect, LetsTheKernelAttestTheSenderWithoutHelpOfTheService) {
  fake::Service service;
  fake::Packet packet;
  Beside helper([&] {
    pollfd entry{service.socket(), POLLIN, 0};
    ASSERT_EQ(::poll(&entry, 1, 10'000), 1);
    // Asked for only after the message was queued: shows what the sender's own socket asked for.
    const int on = 1;
    ASSERT_EQ(::setsockopt(service.socket(), SOL_SOCKET, SO_PASSCRED, &on, sizeof on), 0);
    packet = fake::Receive(service.socket());
    packet.descriptors.clear();
    service.close();
  });
  EXPECT_TRUE(HelperClient::Connect(OptionsFor(service)).error().failed());
  helper.join();
  EXPECT_EQ(packet.senderPid, ::getpid());
}

TEST(Connect, HoldsThePrivatePortAndItsOwnPort) {
  const fake::DescriptorBalance balance;
  fake::Service service;
  fake::Connection connection;
  Beside helper([&] { connection = fake::Accept(service.socket()); });
  auto client = HelperClient::Connect(OptionsFor(service));
  helper.join();
  ASSERT_TRUE(client) << client.error().describe();
  EXPECT_TRUE(client->isConnected());
  EXPECT_GE(client->descriptor(), 0);
  pollfd ownPort{connection.clientPort.get(), POLLIN, 0};
  EXPECT_EQ(::poll(&ownPort, 1, 0), 0) << "nothing may arrive on the client's own port";
}

TEST(Connect, HangsUpItsOwnPortAtTheEnd) {
  fake::Service service;
  fake::Connection connection;
  Beside helper([&] { connection = fake::Accept(service.socket()); });
  {
    auto client = HelperClient::Connect(OptionsFor(service));
    helper.join();
    ASSERT_TRUE(client);
  }
  pollfd ownPort{connection.clientPort.get(), 0, 0};
  ASSERT_EQ(::poll(&ownPort, 1, 0), 1);
  EXPECT_NE(ownPort.revents & POLLHUP, 0);
}

TEST(Connect, ReportsRefusalForCode35) {
  const fake::DescriptorBalance balance;
  const Error error = ConnectAnsweredWith(fake::PlainReply(4792274, 35));
  EXPECT_EQ(error, (Error{HVMH_REFUSED, 35, 0}));
}

TEST(Connect, ReportsAnyOtherCodeAsTheHelpersAnswer) {
  const fake::DescriptorBalance balance;
  EXPECT_EQ(ConnectAnsweredWith(fake::PlainReply(4792274, -309)),
            (Error{HVMH_RETURN_CODE, -309, 0}));
  EXPECT_EQ(ConnectAnsweredWith(fake::PlainReply(4792274, 5)), (Error{HVMH_RETURN_CODE, 5, 0}));
}

TEST(Connect, RefusesIllFormedAnswers) {
  const fake::DescriptorBalance balance;
  const Error violation{HVMH_PROTOCOL_VIOLATION};
  const Bytes good = fake::ConnectReply();
  const auto port = fake::MakePair(SOCK_SEQPACKET);
  const int right = port.second.get();
  const auto changed = [&](std::size_t offset, std::uint8_t value) {
    Bytes bytes = good;
    bytes.at(offset) = value;
    return bytes;
  };
  EXPECT_EQ(ConnectAnsweredWith(fake::PlainReply(4792274, 0)), violation)
      << "success without a port";
  EXPECT_EQ(ConnectAnsweredWith(fake::PlainReply(4792275, 35)), violation) << "another id";
  EXPECT_EQ(ConnectAnsweredWith(Bytes(12, 0)), violation) << "shorter than a reply";
  EXPECT_EQ(ConnectAnsweredWith(good), violation) << "no descriptor";
  EXPECT_EQ(ConnectAnsweredWith(changed(4, 41), {right}), violation) << "wrong size field";
  EXPECT_EQ(ConnectAnsweredWith(changed(24, 2), {right}), violation) << "two descriptors announced";
  EXPECT_EQ(ConnectAnsweredWith(changed(38, 17), {right}), violation) << "move-send";
  EXPECT_EQ(ConnectAnsweredWith(changed(39, 1), {right}), violation) << "out-of-line descriptor";
  EXPECT_EQ(ConnectAnsweredWith(good + Bytes(4, 0), {right}), violation) << "longer than it says";
  const auto stream = fake::MakePair(SOCK_STREAM);
  EXPECT_EQ(ConnectAnsweredWith(good, {stream.second.get()}), violation) << "a stream socket";
  const auto memory = fake::MakeMemory({1}, 0);
  EXPECT_EQ(ConnectAnsweredWith(good, {memory.get()}), violation) << "a file";
}

TEST(Connect, ClosesDescriptorsThatTheAnswerDoesNotAnnounce) {
  const fake::DescriptorBalance balance;
  const auto port = fake::MakePair(SOCK_SEQPACKET);
  const int right = port.second.get();
  EXPECT_FALSE(ConnectAnsweredWith(fake::ConnectReply(), {right, right}).failed());
  EXPECT_FALSE(ConnectAnsweredWith(fake::ConnectReply(), {right, right, right, right}).failed());
}

TEST(Connect, BeginsAgainWhenTheHelperLeavesBeforeItAnswers) {
  const fake::DescriptorBalance balance;
  fake::Service service;
  fake::Connection connection;
  Beside helper([&] {
    (void)fake::Receive(service.socket());  // the rights close unanswered
    (void)fake::Receive(service.socket());
    connection = fake::Accept(service.socket());
  });
  const auto client = HelperClient::Connect(OptionsFor(service));
  EXPECT_TRUE(client) << client.error().describe();
}

TEST(Connect, GivesUpOnAHelperThatAlwaysLeaves) {
  const fake::DescriptorBalance balance;
  fake::Service service;
  int received = 0;
  Beside helper([&] {
    for (; received < 10; ++received) (void)fake::Receive(service.socket());
  });
  const Error error = HelperClient::Connect(OptionsFor(service)).error();
  helper.join();
  EXPECT_EQ(error, Error{HVMH_HELPER_GONE});
  EXPECT_EQ(received, 10);
}

TEST(Connect, IgnoresEmptyPacketsOnTheReplyPort) {
  fake::Service service;
  fake::Connection connection;
  Beside helper([&] {
    fake::Packet packet = fake::Receive(service.socket());
    ASSERT_EQ(packet.descriptors.size(), 2U);
    auto [receiveRight, sendRight] = fake::MakePair(SOCK_SEQPACKET);
    fake::Send(packet.descriptors[0].get(), {});
    fake::Send(packet.descriptors[0].get(), {});
    fake::Send(packet.descriptors[0].get(), fake::ConnectReply(), {sendRight.get()});
    // The reply port hangs up with an empty packet, then the answer, still in its queue.
    packet.descriptors[0].reset();
    connection = {std::move(packet.descriptors[1]), std::move(receiveRight), std::move(sendRight)};
  });
  const auto client = HelperClient::Connect(OptionsFor(service));
  EXPECT_TRUE(client) << client.error().describe();
}

TEST(Connect, SaysNotRunningWithoutASocketOrAHolder) {
  const fake::DescriptorBalance balance;
  fake::Service service;
  ClientOptions nowhere = OptionsFor(service);
  nowhere.servicePath += ".absent";
  EXPECT_EQ(HelperClient::Connect(nowhere).error(), (Error{HVMH_NOT_RUNNING, 0, ENOENT}));
  service.close();
  EXPECT_EQ(HelperClient::Connect(OptionsFor(service)).error(),
            (Error{HVMH_NOT_RUNNING, 0, ECONNREFUSED}));
}

TEST(Connect, SaysAccessDeniedForASocketThatIsNotForThisUser) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root can take another user's place";
  fake::Service service;
  ASSERT_EQ(::chmod(service.path().c_str(), 0600), 0);
  const std::string folder = service.path().substr(0, service.path().rfind('/'));
  ASSERT_EQ(::chmod(folder.c_str(), 0755), 0);
  Error error;
  Beside other([&] {
    // The raw call changes the user of this thread alone.
    ASSERT_EQ(::syscall(SYS_setresuid, -1, 65534, -1), 0);
    error = HelperClient::Connect(OptionsFor(service)).error();
  });
  other.join();
  EXPECT_EQ(error, (Error{HVMH_ACCESS_DENIED, 0, EACCES}));
}

TEST(Connect, RefusesPathsThatNoSocketCanHave) {
  ClientOptions options;
  options.servicePath = "";
  EXPECT_EQ(HelperClient::Connect(options).error(), Error{HVMH_INVALID_ARGUMENT});
  options.servicePath = std::string(108, 'a');
  EXPECT_EQ(HelperClient::Connect(options).error(), Error{HVMH_INVALID_ARGUMENT});
  options.servicePath = std::string("a\0b", 3);
  EXPECT_EQ(HelperClient::Connect(options).error(), Error{HVMH_INVALID_ARGUMENT});
}

TEST(Connect, TimesOutOnAServiceThatDoesNotAnswer) {
  const fake::DescriptorBalance balance;
  fake::Service service;
  EXPECT_EQ(HelperClient::Connect(OptionsFor(service, 30)).error(), Error{HVMH_TIMED_OUT});
}

/// Fills the queue of the service with other senders' messages.
int FillQueue(const fake::Service& service) {
  const platform::UnixSocketAddress address(service.path());
  int sent = 0;
  for (;; ++sent) {
    const fake::FileDescriptor sender(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    if (::sendto(sender.get(), "x", 1, MSG_DONTWAIT, address.get(), address.size()) != 1) {
      return sent;
    }
  }
}

TEST(Connect, TimesOutWhileTheQueueOfTheServiceStaysFull) {
  const fake::DescriptorBalance balance;
  fake::Service service;
  ASSERT_GT(FillQueue(service), 0);
  EXPECT_EQ(HelperClient::Connect(OptionsFor(service, 30)).error(), Error{HVMH_TIMED_OUT});
}

#ifdef SYS_poll
constexpr long kPollNumber = SYS_poll;
#else
constexpr long kPollNumber = SYS_ppoll;
#endif

/// Spins until the thread waits in poll(2).
void AwaitPoll(pid_t thread) {
  const std::string path = "/proc/self/task/" + std::to_string(thread) + "/syscall";
  for (;;) {
    std::ifstream file(path);
    std::string number;
    file >> number;
    if (number == std::to_string(kPollNumber)) return;
    std::this_thread::yield();
  }
}

TEST(Connect, GoesOnWhenTheQueueOfTheServiceHasRoomAgain) {
  std::ifstream probe("/proc/self/syscall");
  std::string word;
  if (!(probe >> word)) GTEST_SKIP() << "this kernel does not tell what a thread waits for";
  fake::Service service;
  const int queued = FillQueue(service);
  std::atomic<pid_t> thread{0};
  Error error{HVMH_SYSTEM_ERROR};
  Beside connecting([&] {
    thread = static_cast<pid_t>(::syscall(SYS_gettid));
    error = HelperClient::Connect(OptionsFor(service)).error();
  });
  while (thread == 0) std::this_thread::yield();
  AwaitPoll(thread);
  for (int index = 0; index < queued; ++index) {
    EXPECT_EQ(fake::Receive(service.socket()).bytes, fake::Text("x"));
  }
  const fake::Connection connection = fake::Accept(service.socket());
  connecting.join();
  EXPECT_FALSE(error.failed()) << error.describe();
}

}  // namespace
