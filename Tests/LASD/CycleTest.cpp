// SPDX-License-Identifier: Apache-2.0
//
// A whole check: its order, its work tokens, its notifications.
#include <filesystem>
#include <mutex>
#include <string>
#include <vector>

#include "Helper/LASD/LASDNotification.h"
#include "Tests/LASD/UpdaterFixture.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using lasd_test::Dictionary;
using lasd_test::Entry;
using platform::PropertyList;

const std::vector<std::string> kOrder{"gsm", "umts", "cdma", "lte", "scdma"};

std::string UrlOf(const std::string& type) { return "https://host/" + type + ".db.gz"; }

PropertyList Named(const std::string& name) {
  return Dictionary({{"Notification", "com.zarvo.lasd." + name}});
}
PropertyList Available(const std::string& type) {
  return Dictionary({{"Notification", "com.zarvo.lasd.UpdateAvailable"}, {"DBType", type}});
}

/// Message ports that look at something whenever a handle is made, which is before each send.
class WatchedPorts final : public platform::MessagePorts {
 public:
  WatchedPorts(platform::MessagePorts& next, std::function<void()> look)
      : next_(next), look_(std::move(look)) {}
  std::unique_ptr<platform::RemoteMessagePort> createRemote(const std::string& name) override {
    look_();
    return next_.createRemote(name);
  }

 private:
  platform::MessagePorts& next_;
  const std::function<void()> look_;
};

class Check : public lasd_test::UpdaterFixture {
 protected:
  Check() { server->runLoop = &loop; }
  ~Check() override {
    settle();
    HelperServerDestroy(server);
  }

  /// Runs one check from start to end.
  void check(std::uint32_t mask) {
    updater->checkForUpdates(server, mask);
    settle();
  }
  [[nodiscard]] std::uint32_t busyMask() {
    const std::lock_guard guard(server->lock);
    return server->busyMask;
  }
  [[nodiscard]] bool idleTimerIsArmed() {
    const std::lock_guard guard(server->lock);
    return server->idleTimer != nullptr;
  }
  /// A manifest with all five types at `version`, and their databases.
  void offerAll(const std::string& version) {
    PropertyList::Dictionary manifest;
    for (const std::string& type : kOrder) {
      manifest.set(type, Entry(version, UrlOf(type)));
      putDatabase(UrlOf(type), type + " " + version);
    }
    putManifest(PropertyList(manifest));
  }
  [[nodiscard]] std::vector<std::string> retrieved() {
    std::vector<std::string> urls;
    for (const auto& transfer : web.transfers()) urls.push_back(transfer.url);
    return urls;
  }

  fakes::ManualClock clock;
  platform::RunLoop loop{clock};
  platform::ScopedCurrentRunLoop current{loop};
  support::LauncherSocket launcher{wire::kServiceName};
  HelperServer* const server = HelperServerCreate(wire::kServiceName, &RequestSubsystem());
};

TEST_F(Check, InstallsAllFiveInOrderAndTellsOfEach) {
  offerAll("1");
  check(31);
  std::vector<std::string> urls{kLASDManifestURL};
  for (const std::string& type : kOrder) urls.push_back(UrlOf(type));
  EXPECT_EQ(retrieved(), urls);
  for (const std::string& type : kOrder) {
    EXPECT_EQ(notification(), Available(type));
    EXPECT_EQ(text(type + ".db"), type + " 1");
    EXPECT_EQ(recorded(type), Entry("1", UrlOf(type)));
  }
  EXPECT_TRUE(isSilent()) << "no summary at the end";
  const Lines found = lines();
  EXPECT_EQ(found.at(0), "Trying to see if update available for mask 1f");
  EXPECT_EQ(found.at(1), "Reading local resource com.zarvo.lasd\n");
  EXPECT_EQ(found.back(), "Downloaded scdma database version 1 successfully\n");
}

TEST_F(Check, OfWhatIsCurrentTellsOnceThatNothingIsToDo) {
  offerAll("1");
  check(31);
  for (std::size_t type = 0; type < kOrder.size(); ++type) (void)notification();
  (void)lines();
  check(31);
  EXPECT_EQ(notification(), Named("NoUpdateRequired"));
  EXPECT_TRUE(isSilent());
  EXPECT_EQ(lines().back(), "No update required for any databases\n");
  EXPECT_EQ(retrieved().size(), 7U);
}

TEST_F(Check, TakesARecordThatCouldNotBeWrittenForOneUntilTheProcessEnds) {
  offerAll("1");
  store.setWritable(false);
  check(8);
  EXPECT_EQ(notification(), Named("UpdateFailed"));
  EXPECT_EQ(text("gsm.db"), "gsm 1") << "the file is there";
  (void)lines();
  check(8);
  EXPECT_EQ(notification(), Named("NoUpdateRequired"));
  EXPECT_TRUE(isSilent());
  EXPECT_EQ(lines().at(4), "gsm version 1 matches server version\n");
  EXPECT_EQ(retrieved(),
            (std::vector<std::string>{kLASDManifestURL, UrlOf("gsm"), kLASDManifestURL}));
  EXPECT_FALSE(written("gsm"));
  store.setWritable(true);
  check(9);
  EXPECT_EQ(notification(), Available("umts"));
  EXPECT_TRUE(isSilent());
  EXPECT_EQ(written("gsm"), Entry("1", UrlOf("gsm"))) << "together with the next record";
}

TEST_F(Check, OfNoTypeStillFetchesTheManifest) {
  offerAll("1");
  for (const std::uint32_t mask : {0U, 32U, 0xFFFFFFE0U}) {
    check(mask);
    EXPECT_EQ(notification(), Named("NoUpdateRequired")) << mask;
    EXPECT_EQ(lines().back(), "No update required for any databases\n");
  }
  EXPECT_EQ(retrieved(), std::vector<std::string>(3, kLASDManifestURL));
  EXPECT_FALSE(std::filesystem::exists(folder.at("LASD")));
}

TEST_F(Check, LogsTheMaskInHexadecimal) {
  putManifest(Dictionary({}));
  check(0xDEADBEE0);
  EXPECT_EQ(lines().at(0), "Trying to see if update available for mask deadbee0");
}

TEST_F(Check, WithoutTheManifestTellsOnceOfAFailure) {
  check(31);
  EXPECT_EQ(notification(), Named("UpdateFailed"));
  EXPECT_TRUE(isSilent());
  EXPECT_EQ(lines().back(),
            std::string("Could not fetch data from source ") + kLASDManifestURL + "\n");
}

TEST_F(Check, OfAnUnreadableManifestTellsThatNothingIsToDo) {
  putManifestBytes("nonsense");
  check(31);
  EXPECT_EQ(notification(), Named("NoUpdateRequired"));
  EXPECT_TRUE(isSilent());
}

TEST_F(Check, GoesOnAfterAFailedInstall) {
  offerAll("1");
  web.fail(UrlOf("cdma"), vlu::Http::ErrorType::kConnectionLost);
  check(8 | 2 | 16);
  EXPECT_EQ(notification(), Available("gsm"));
  EXPECT_EQ(notification(), Named("UpdateFailed"));
  EXPECT_EQ(notification(), Available("scdma"));
  EXPECT_TRUE(isSilent());
  EXPECT_FALSE(recorded("cdma"));
}

TEST_F(Check, IsSilentAboutATypeWithoutAUrl) {
  putManifest(Dictionary({{"gsm", Dictionary({{"Version", "1"}})}}));
  check(31);
  EXPECT_TRUE(isSilent());
  EXPECT_EQ(lines().back(), "URL for gsm database is empty\n");
}

TEST_F(Check, TriesAgainWhatFailedBefore) {
  putManifest(Dictionary({{"gsm", Entry("1", UrlOf("gsm"))}}));
  check(8);
  EXPECT_EQ(notification(), Named("UpdateFailed"));
  putDatabase(UrlOf("gsm"), "gsm 1");
  check(8);
  EXPECT_EQ(notification(), Available("gsm"));
}

TEST_F(Check, InstallsWithoutAnybodyToTell) {
  ports.retract(lasd_test::kPort);
  offerAll("1");
  check(31);
  for (const std::string& type : kOrder) EXPECT_EQ(text(type + ".db"), type + " 1");
  EXPECT_EQ(busyMask(), 0U);
  ports.publish(lasd_test::kPort);
  EXPECT_TRUE(isSilent());
}

TEST_F(Check, RollsADatabaseBack) {
  offerAll("3");
  check(31);
  for (std::size_t type = 0; type < kOrder.size(); ++type) (void)notification();
  offerAll("2");
  check(4);
  EXPECT_EQ(notification(), Available("lte"));
  EXPECT_EQ(text("lte.db"), "lte 2");
  EXPECT_EQ(text("gsm.db"), "gsm 3") << "not asked for";
}

TEST_F(Check, HoldsOneTokenAllTheWhileAndAnotherDuringEachUpdate) {
  offerAll("1");
  std::vector<std::uint32_t> masks;  // written by one transfer at a time, while the queue waits
  for (const std::string& type : kOrder) {
    web.answer(UrlOf(type), [&](const vlu::Http::Transfer& /*transfer*/) {
      masks.push_back(busyMask());
      return std::make_shared<vlu::Http::HttpResponse>(
          vlu::Http::ErrorType::kSuccess, 200, support::Gzip("new"),
          vlu::Http::HeaderMap{{"Content-Type", "application/gzip"}});
    });
  }
  web.answer(kLASDManifestURL,
             [&, next = platform::SerializeXml(Dictionary({{"gsm", Entry("1", UrlOf("gsm"))},
                                                           {"lte", Entry("1", UrlOf("lte"))}}))
                            .value()](const vlu::Http::Transfer& /*transfer*/) {
               masks.push_back(busyMask());
               return std::make_shared<vlu::Http::HttpResponse>(
                   vlu::Http::ErrorType::kSuccess, 200,
                   std::vector<std::uint8_t>(next.begin(), next.end()), vlu::Http::HeaderMap{});
             });
  check(31);
  EXPECT_EQ(masks, (std::vector<std::uint32_t>{1, 3, 3}));
  EXPECT_EQ(busyMask(), 0U);
  EXPECT_TRUE(idleTimerIsArmed()) << "the last token is back and nobody is connected";
}

TEST_F(Check, GivesItsTokenBackOnlyAfterItsNotification) {
  std::vector<std::uint32_t> masks;
  WatchedPorts watched(ports, [&] { masks.push_back(busyMask()); });
  const platform::ScopedReplacement<platform::MessagePorts> replacement(watched);
  check(31);
  putManifest(Dictionary({}));
  check(31);
  offerAll("1");
  check(8);
  EXPECT_EQ(masks, (std::vector<std::uint32_t>{1, 1, 3}));
  EXPECT_EQ(busyMask(), 0U);
  for (int round = 0; round < 3; ++round) (void)notification();
}

TEST_F(Check, TakesItsTokenBeforeItReturns) {
  std::binary_semaphore gate(0);
  updater->post([&] { gate.acquire(); });
  updater->checkForUpdates(server, 0);
  EXPECT_EQ(busyMask(), 1U);
  EXPECT_TRUE(web.transfers().empty()) << "the check itself waits its turn";
  updater->checkForUpdates(server, 0);
  EXPECT_EQ(busyMask(), 3U);
  gate.release();
  settle();
  EXPECT_EQ(busyMask(), 0U);
}

TEST_F(Check, BeginsWhenTheOneBeforeHasEnded) {
  offerAll("1");
  std::binary_semaphore gate(0);
  updater->post([&] { gate.acquire(); });
  updater->checkForUpdates(server, 8);
  updater->checkForUpdates(server, 8);
  gate.release();
  settle();
  EXPECT_EQ(notification(), Available("gsm"));
  EXPECT_EQ(notification(), Named("NoUpdateRequired"));
  EXPECT_EQ(retrieved(),
            (std::vector<std::string>{kLASDManifestURL, UrlOf("gsm"), kLASDManifestURL}));
}

TEST_F(Check, WithoutAServerRunsAllTheSame) {
  offerAll("1");
  updater->checkForUpdates(nullptr, 8);
  settle();
  EXPECT_EQ(notification(), Available("gsm"));
}

class Trigger : public support::ServerFixture {
 protected:
  fakes::FakePreferencesStore store;
  platform::ScopedReplacement<platform::PreferencesStore> storeReplacement{store};
  fakes::FakeMessagePorts ports;
  platform::ScopedReplacement<platform::MessagePorts> portsReplacement{ports};
  fakes::FakeHttpTransport web;
  platform::ScopedReplacement<vlu::Http::HttpTransport> webReplacement{web};
};

TEST_F(Trigger, IsAnsweredAtOnceAndStartsTheProcessesOwnUpdater) {
  start();
  ports.publish(lasd_test::kPort);
  const auto client = connect();
  std::binary_semaphore gate(0);
  lasdUpdater->post([&] { gate.acquire(); });
  support::Bytes bytes = support::Message(8683563, 36);
  support::Put(bytes, 32, 0xFFFFFFE0U);
  const support::Bytes reply = request(*client, bytes).bytes;
  ASSERT_EQ(reply.size(), 36U);
  EXPECT_EQ(support::Get<std::int32_t>(reply, 32), 0);
  EXPECT_EQ(server->busyMask, 1U) << "of the server of this connection";
  gate.release();
  const auto message = ports.take(lasd_test::kPort);
  EXPECT_EQ(platform::ParsePropertyList(message.payload), Named("UpdateFailed"));
  std::binary_semaphore ended(0);
  lasdUpdater->post([&] { ended.release(); });
  ended.acquire();
  const std::lock_guard guard(server->lock);
  EXPECT_EQ(server->busyMask, 0U);
}

TEST(LASDUpdater, IsThereBeforeMain) {
  ASSERT_NE(lasdUpdater, nullptr);
  EXPECT_EQ(lasdUpdater->queue().label(), "LASDUpdater");
}

}  // namespace
