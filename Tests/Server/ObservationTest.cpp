// SPDX-License-Identifier: Apache-2.0
//
// What an observer of the server receives, over a real socket, on a manual clock. One thread.
#include "Helper/Platform/UnixSocketAddress.h"
#include "Helper/Shared/Server/Observation.h"

#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <optional>

#include "Helper/Platform/PropertyList.h"
#include "Helper/Platform/RunLoopCore.h"
#include "Helper/Platform/WorkQueue.h"
#include "Tests/Support/DescriptorLimit.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using platform::FileDescriptor;
using platform::PropertyList;

class ObservationTest : public support::ServerFixture {
 protected:
  void SetUp() override {
    std::string name = (std::filesystem::temp_directory_path() / "observer-XXXXXX").string();
    ASSERT_NE(::mkdtemp(name.data()), nullptr);
    folder = name;
    start();
    server->observation = Observation::Open(*server, path());
    ASSERT_NE(server->observation, nullptr);
  }
  void TearDown() override {
    if (!folder.empty()) std::filesystem::remove_all(folder);
  }

  [[nodiscard]] std::string path() const { return (folder / "observer").string(); }

  [[nodiscard]] FileDescriptor callObserverSocket() const {
    FileDescriptor socket(::socket(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0));
    const platform::UnixSocketAddress address(path());
    EXPECT_EQ(::connect(socket.get(), address.get(), address.size()), 0);
    return socket;
  }
  [[nodiscard]] FileDescriptor connectObserver() {
    FileDescriptor socket = callObserverSocket();
    pumpAll();
    return socket;
  }

  /// Observers are served without counting as handled sources.
  void pumpAll() {
    for (int turn = 0; turn < 20; ++turn) (void)loop.run(0);
  }

  [[nodiscard]] static std::optional<PropertyList> take(const FileDescriptor& observer) {
    std::vector<std::byte> packet(1 << 18);
    const ssize_t size = ::recv(observer.get(), packet.data(), packet.size(), MSG_DONTWAIT);
    if (size <= 0) return std::nullopt;
    packet.resize(static_cast<std::size_t>(size));
    return platform::ParsePropertyList(packet);
  }

  [[nodiscard]] static std::int64_t integer(const PropertyList& list, std::string_view key) {
    const PropertyList* value = list.find(key);
    return value ? value->integer().value_or(-1) : -1;
  }
  [[nodiscard]] static std::string text(const PropertyList& list, std::string_view key) {
    const PropertyList* value = list.find(key);
    return value && value->string() ? *value->string() : "absent";
  }
  [[nodiscard]] static double real(const PropertyList& list, std::string_view key) {
    const PropertyList* value = list.find(key);
    return value ? value->real().value_or(-1) : -1;
  }

  std::filesystem::path folder;
};

constexpr std::int32_t kClearVoicemailToken = 8683551;

TEST_F(ObservationTest, ShowsAnIdleServerAsEmpty) {
  const auto status = take(connectObserver());
  ASSERT_TRUE(status);
  EXPECT_EQ(integer(*status, "Process"), ::getpid());
  EXPECT_EQ(integer(*status, "ClientCount"), 0);
  EXPECT_TRUE(status->find("Clients")->array()->empty());
  EXPECT_TRUE(status->find("WorkTokens")->array()->empty());
  EXPECT_EQ(status->find("IdleExitInSeconds"), nullptr);
}

TEST_F(ObservationTest, ShowsEachClientWithItsRequests) {
  const auto client = connect();
  clock.advance(std::chrono::seconds(3));
  (void)request(*client, support::Message(1, 24));
  (void)request(*client, support::Message(8683571, 24));
  const auto status = take(connectObserver());
  ASSERT_TRUE(status);
  ASSERT_EQ(status->find("Clients")->array()->size(), 1U);
  const PropertyList& entry = status->find("Clients")->array()->front();
  EXPECT_EQ(integer(entry, "Process"), ::getpid());
  EXPECT_EQ(integer(entry, "User"), ::getuid());
  EXPECT_EQ(real(entry, "ConnectedSeconds"), 3.0);
  EXPECT_EQ(integer(entry, "Requests"), 2);
  EXPECT_EQ(text(entry, "LastRequest"), "CopyPropertyListFile");
  EXPECT_EQ(integer(entry, "LastCode"), MIG_BAD_ARGUMENTS);
}

TEST_F(ObservationTest, ForgetsAClientThatIsGone) {
  connect().reset();
  pump();
  const auto status = take(connectObserver());
  ASSERT_TRUE(status);
  EXPECT_EQ(integer(*status, "ClientCount"), 0);
  EXPECT_EQ(real(*status, "IdleExitInSeconds"), kIdleSeconds);
}

TEST_F(ObservationTest, ShowsWorkTokensWithOwnerAndAge) {
  const std::uint32_t first = HelperServerAcquireWorkToken(server);
  clock.advance(std::chrono::seconds(2));
  platform::WorkQueue queue("test.queue");
  queue.sync([&] { (void)HelperServerAcquireWorkToken(server); });
  clock.advance(std::chrono::seconds(1));
  auto status = take(connectObserver());
  ASSERT_TRUE(status);
  const auto& tokens = *status->find("WorkTokens")->array();
  ASSERT_EQ(tokens.size(), 2U);
  EXPECT_EQ(integer(tokens[0], "Token"), 1);
  EXPECT_EQ(text(tokens[0], "Owner"), "main thread");
  EXPECT_EQ(real(tokens[0], "AgeSeconds"), 3.0);
  EXPECT_EQ(integer(tokens[1], "Token"), 2);
  EXPECT_EQ(text(tokens[1], "Owner"), "test.queue");
  EXPECT_EQ(real(tokens[1], "AgeSeconds"), 1.0);
  EXPECT_TRUE(HelperServerReleaseWorkToken(server, first));
  status = take(connectObserver());
  ASSERT_TRUE(status);
  EXPECT_EQ(status->find("WorkTokens")->array()->size(), 1U);
}

TEST_F(ObservationTest, SendsAnEventForEachMessageRefusedConnectsIncluded) {
  const FileDescriptor observer = connectObserver();
  ASSERT_TRUE(take(observer));
  const auto client = connect();
  (void)request(*client, support::Message(kClearVoicemailToken, 28));
  HandleProcessExit(::getpid());  // the grant is remembered by process
  security.withholdTask();
  support::WireClient stranger(launcher.path());
  stranger.sendConnect();
  pump();

  auto event = take(observer);
  ASSERT_TRUE(event);
  EXPECT_EQ(text(*event, "Request"), "connect");
  EXPECT_EQ(integer(*event, "Code"), KERN_SUCCESS);
  event = take(observer);
  ASSERT_TRUE(event);
  EXPECT_EQ(text(*event, "Request"), "ClearVoicemailToken");
  EXPECT_EQ(integer(*event, "Id"), kClearVoicemailToken);
  EXPECT_EQ(integer(*event, "Process"), ::getpid());
  EXPECT_EQ(integer(*event, "User"), ::getuid());
  EXPECT_EQ(integer(*event, "Code"), MIG_BAD_ARGUMENTS);
  EXPECT_TRUE(event->find("Time")->date());
  EXPECT_TRUE(event->find("Microseconds")->integer());
  event = take(observer);
  ASSERT_TRUE(event);
  EXPECT_EQ(text(*event, "Request"), "connect");
  EXPECT_EQ(integer(*event, "Code"), KERN_INVALID_SECURITY);
  EXPECT_FALSE(take(observer));
}

TEST_F(ObservationTest, EndsAnObserverThatAsksForSomething) {
  const FileDescriptor observer = connectObserver();
  ASSERT_TRUE(take(observer));
  ASSERT_EQ(::send(observer.get(), "x", 1, MSG_NOSIGNAL), 1);
  pumpAll();
  EXPECT_TRUE(support::IsHungUp(observer.get()));
}

TEST_F(ObservationTest, DropsAnObserverThatDoesNotReadAndServesOn) {
  const FileDescriptor observer = connectObserver();
  const auto client = connect();
  for (int number = 0; number < 2000; ++number) {
    ASSERT_FALSE(request(*client, support::Message(1, 24)).bytes.empty());
  }
  EXPECT_TRUE(support::IsHungUp(observer.get()));
}

TEST_F(ObservationTest, TurnsAwayMoreObserversThanItHasRoomFor) {
  std::vector<FileDescriptor> observers;
  for (std::size_t number = 0; number < platform::ObserverChannel::kMaxObservers; ++number) {
    observers.push_back(connectObserver());
    EXPECT_TRUE(take(observers.back()));
  }
  EXPECT_FALSE(take(connectObserver()));
  observers.pop_back();
  pumpAll();
  EXPECT_TRUE(take(connectObserver()));
}

/// While no descriptor is free.
class ObservationWithoutDescriptors : public ObservationTest {
 protected:
  void SetUp() override {
#ifdef __SANITIZE_ADDRESS__
    GTEST_SKIP() << "the sanitizer of undefined behaviour needs descriptors to look at objects";
#else
    ObservationTest::SetUp();
#endif
  }

  /// How often, of 20 turns while no descriptor is free, the loop finds something to serve: once
  /// for the observer, and once because a timer was added.
  [[nodiscard]] int turnsWithoutDescriptors() {
    const support::DescriptorLimit none(0);
    int served = 0;
    for (int turn = 0; turn < 20; ++turn) {
      loop.core().collect(0);
      if (loop.core().serveOne()) ++served;
    }
    return served;
  }
};

TEST_F(ObservationWithoutDescriptors, LetsAnObserverWaitWhileNoDescriptorIsFreeAndDoesNotSpin) {
  const FileDescriptor observer = callObserverSocket();
  EXPECT_LE(turnsWithoutDescriptors(), 2) << "what cannot be taken in must not wake the loop again";
  pumpAll();
  EXPECT_FALSE(take(observer));
  clock.advance(std::chrono::seconds(1));
  pumpAll();
  EXPECT_TRUE(take(observer));
  EXPECT_TRUE(take(connectObserver())) << "the socket is watched as before";
}

TEST_F(ObservationWithoutDescriptors, LetsAnObserverWaitForMoreThanOneSecondToo) {
  const FileDescriptor observer = callObserverSocket();
  ASSERT_LE(turnsWithoutDescriptors(), 2);
  for (int second = 0; second < 3; ++second) {
    const support::DescriptorLimit none(0);
    clock.advance(std::chrono::seconds(1));
    pumpAll();
  }
  EXPECT_FALSE(take(observer));
  clock.advance(std::chrono::seconds(1));
  pumpAll();
  EXPECT_TRUE(take(observer));
}

TEST_F(ObservationWithoutDescriptors, EndsWhileAnObserverWaits) {
  const FileDescriptor observer = callObserverSocket();
  ASSERT_LE(turnsWithoutDescriptors(), 2);
  server->observation.reset();
  clock.advance(std::chrono::seconds(1));
  pumpAll();
  EXPECT_TRUE(support::IsHungUp(observer.get()));
}

TEST_F(ObservationTest, LeavesNoSocketBehind) {
  ASSERT_TRUE(std::filesystem::exists(path()));
  server->observation.reset();
  EXPECT_FALSE(std::filesystem::exists(path()));
}

TEST_F(ObservationTest, LeavesTheSocketOfItsSuccessor) {
  const auto successor =
      platform::ObserverChannel::Open(loop, path(), [] { return std::vector<std::byte>(); });
  ASSERT_NE(successor, nullptr);
  server->observation.reset();
  EXPECT_TRUE(std::filesystem::exists(path()));
}

TEST_F(ObservationTest, DoesNotDelayTheIdleExit) {
  const FileDescriptor observer = connectObserver();
  connect().reset();
  pump();
  clock.advance(std::chrono::duration<double>(kIdleSeconds));
  pumpAll();
  EXPECT_NE(server->stopRequested, 0);
}

TEST_F(ObservationTest, ListensForItsOwnUserAlone) {
  struct stat status {};
  ASSERT_EQ(::stat(path().c_str(), &status), 0);
  EXPECT_EQ(status.st_mode, static_cast<mode_t>(S_IFSOCK | S_IRUSR | S_IWUSR));
}

TEST(Observation, IsAbsentWithoutAPathOrAFolder) {
  HelperServer server;
  EXPECT_EQ(Observation::Open(server, ""), nullptr);
  EXPECT_EQ(Observation::Open(server, "/nonexistent/observer"), nullptr);
}

}  // namespace
