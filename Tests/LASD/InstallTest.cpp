// SPDX-License-Identifier: Apache-2.0
//
// The installation of one database: every step, every way to fail, and what is left then.
#include <signal.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include <filesystem>
#include <string>

#include "Helper/Platform/UnixSocketAddress.h"
#include "Tests/LASD/UpdaterFixture.h"

namespace {

using lasd_test::Dictionary;
using lasd_test::Entry;
using platform::PropertyList;
using enum LASDDatabaseType;
using Names = std::set<std::string>;

const std::string kUrl = "https://host/path/gsm.db.gz";

class Install : public lasd_test::UpdaterFixture {
 protected:
  /// Installs `url` for gsm, whose table entry says version 7 and this URL.
  bool install(const std::string& url, LASDDatabaseType type = kGsm) {
    enter(Entry("7", url));
    bool installed = false;
    onQueue([&] { installed = updater->installDatabase(url, type); });
    return installed;
  }
  /// Makes `entry` the table's dictionary of gsm.
  void enter(const PropertyList& entry) {
    record("gsm", entry);
    onQueue([&] { (void)updater->loadVersions("com.zarvo.lasd", true, BitOf(kGsm)); });
    store.setValue("gsm", std::nullopt, domain);
    ASSERT_TRUE(store.synchronize(domain));
    (void)store.takeSynchronized();
    (void)lines();
  }
  [[nodiscard]] Names names() const {
    Names found;
    for (const auto& entry : std::filesystem::directory_iterator(folder.at("LASD"))) {
      found.insert(entry.path().filename());
    }
    return found;
  }
  [[nodiscard]] std::string path(const std::string& name) const { return at(name); }
  /// The lines of a whole fetch of `url`.
  static Lines fetched(const std::string& url, const std::string& content) {
    return {"Fetching URL " + url, "URL retrieved " + url + ", size: " +
                                       std::to_string(support::Gzip(content).size()) + " \n"};
  }
  static Lines joined(Lines first, const Lines& second) {
    first.insert(first.end(), second.begin(), second.end());
    return first;
  }
};

TEST_F(Install, MakesTheDirectoryAndPutsTheUncompressedFileThere) {
  putDatabase(kUrl, "content");
  EXPECT_TRUE(install(kUrl));
  EXPECT_EQ(folder.permissions("LASD"), 0755U);
  EXPECT_EQ(names(), Names{"gsm.db"});
  EXPECT_EQ(text("gsm.db"), "content");
  EXPECT_EQ(lines(), joined(fetched(kUrl, "content"),
                            {"uncompressing to " + path("gsm.db.tmp") + "\n",
                             "Moving " + path("gsm.db.tmp") + " to " + path("gsm.db") + "\n",
                             "Downloaded gsm database version 7 successfully\n"}));
}

TEST_F(Install, FetchesOverWifiAlone) {
  putDatabase(kUrl, "content");
  EXPECT_TRUE(install(kUrl));
  ASSERT_EQ(web.transfers().size(), 1U);
  EXPECT_FALSE(web.transfers()[0].allowsCellular);
}

TEST_F(Install, RemovesTheOldFileBeforeTheNewOneComes) {
  putDatabase(kUrl, "new");
  folder.folder("LASD");
  folder.file("LASD/gsm.db", "old");
  EXPECT_TRUE(install(kUrl));
  EXPECT_EQ(text("gsm.db"), "new");
  EXPECT_EQ(lines(), joined(fetched(kUrl, "new"),
                            {"uncompressing to " + path("gsm.db.tmp") + "\n",
                             "Removed old database " + path("gsm.db") + "\n",
                             "Moving " + path("gsm.db.tmp") + " to " + path("gsm.db") + "\n",
                             "Downloaded gsm database version 7 successfully\n"}));
}

TEST_F(Install, RecordsTheWholeEntryAndSynchronizesOnce) {
  putDatabase(kUrl, "content");
  const PropertyList entry =
      Dictionary({{"Version", "7"}, {"ContentURL", kUrl}, {"Other", PropertyList::Array{1, "a"}}});
  enter(entry);
  bool installed = false;
  onQueue([&] { installed = updater->installDatabase(kUrl, kGsm); });
  EXPECT_TRUE(installed);
  EXPECT_EQ(recorded("gsm"), entry);
  EXPECT_EQ(
      store.takeSynchronized(),
      (std::vector<fakes::FakePreferencesStore::Domain>{
          {"com.zarvo.lasd", platform::UserScope::kCurrentUser, platform::HostScope::kAnyHost}}));
}

TEST_F(Install, OfAnEntryWithoutAVersionTextSaysNone) {
  putDatabase(kUrl, "content");
  enter(Dictionary({{"Version", 7}, {"ContentURL", kUrl}}));
  onQueue([&] { EXPECT_TRUE(updater->installDatabase(kUrl, kGsm)); });
  EXPECT_EQ(lines().back(), "Downloaded gsm database version  successfully\n");
}

TEST_F(Install, NamesTheFileAfterTheLastComponentUpToTheFirstGz) {
  for (const auto& [url, name] :
       {std::pair{"https://host/a/b/cdma.db.gz", "cdma.db"},
        {"https://host/a.gz.v2", "a"},
        {"https://host/a.gzip", "a"},
        {"https://host/plain", "plain"},
        {"https://host/x.gz/y.bin", "y.bin"},
        {"https://host/a.GZ", "a.GZ"},
        {"https://host/f?name=/../../etc/passwd", "passwd"},
        {"https://host/..%2f..%2fetc%2fpasswd.gz", "..%2f..%2fetc%2fpasswd"},
        {"https://host/...", "..."}}) {
    putDatabase(url, name);
    EXPECT_TRUE(install(url)) << url;
    EXPECT_EQ(text(name), name) << url;
    std::filesystem::remove(at(name));
  }
}

TEST_F(Install, OfANameThatMeansADirectoryTouchesNothingOutside) {
  folder.folder("LASD");
  folder.file("beside", "beside");
  for (const auto& [url, name, temporary] : {std::tuple{"https://host/..", "..", "...tmp"},
                                             {"https://host/...gz", "..", "...tmp"},
                                             {"https://host/.", ".", "..tmp"},
                                             {"https://host/..gz", ".", "..tmp"},
                                             {"https://host/", "", ".tmp"},
                                             {"https://host/.gz", "", ".tmp"}}) {
    putDatabase(url, "content");
    EXPECT_FALSE(install(url)) << url;
    EXPECT_EQ(lines().back(),
              "Failed to remove the previous download at location " + path(name) + "\n");
    EXPECT_EQ(names(), Names{temporary}) << "below the directory, as any temporary file";
    EXPECT_EQ(folder.names(), (Names{"LASD", "beside"}));
    EXPECT_FALSE(recorded("gsm"));
    std::filesystem::remove(at(temporary));
  }
}

TEST_F(Install, OfAUrlWithoutASlashFailsWithoutAWord) {
  // No URL without a slash can be fetched, so the web itself must think otherwise.
  struct Anything final : vlu::Http::HttpTransport {
    bool accepts(const std::string& /*url*/) override { return true; }
    std::shared_ptr<vlu::Http::HttpResponse> retrieve(
        const vlu::Http::Transfer& /*transfer*/) override {
      return std::make_shared<vlu::Http::HttpResponse>(
          vlu::Http::ErrorType::kSuccess, 200, support::Gzip("content"),
          vlu::Http::HeaderMap{{"Content-Type", "application/gzip"}});
    }
  } anything;
  const platform::ScopedReplacement<vlu::Http::HttpTransport> replacement(anything);
  EXPECT_FALSE(install("gsm.db.gz"));
  EXPECT_EQ(lines(), fetched("gsm.db.gz", "content"));
  EXPECT_EQ(names(), Names{});
}

TEST_F(Install, OfAnotherSchemeFailsAsAnyFailedFetch) {
  for (const char* url : {"ftp://host/gsm.db.gz", "file:///etc/passwd", "/etc/passwd", "gsm.gz"}) {
    EXPECT_FALSE(install(url));
    EXPECT_EQ(lines(), (Lines{std::string("Fetching URL ") + url,
                              std::string("Cannot create HTTP request for URL ") + url,
                              std::string("cannot download file ") + url +
                                  ". Either Wifi is turned OFF or not Wifi attached\n"}));
  }
}

TEST_F(Install, OfAFailedFetchLeavesTheOldFileAndItsRecord) {
  folder.folder("LASD");
  folder.file("LASD/gsm.db", "old");
  const std::string last =
      "cannot download file " + kUrl + ". Either Wifi is turned OFF or not Wifi attached\n";
  for (const int status : {304, 404, 500}) {
    web.put(kUrl, status, support::Gzip("new"), {{"Content-Type", "application/gzip"}});
    EXPECT_FALSE(install(kUrl)) << status;
    EXPECT_EQ(lines().back(), last);
  }
  web.fail(kUrl, vlu::Http::ErrorType::kConnectionLost, 200);
  EXPECT_FALSE(install(kUrl)) << "lost in the middle";
  EXPECT_EQ(lines().back(), last);
  web.loseWifi();
  EXPECT_FALSE(install(kUrl)) << "cellular alone";
  EXPECT_EQ(lines().back(), last);
  EXPECT_EQ(names(), Names{"gsm.db"});
  EXPECT_EQ(text("gsm.db"), "old");
  EXPECT_TRUE(store.takeSynchronized().empty());
}

TEST_F(Install, OfWhatIsNotGzipLeavesTheOldFile) {
  folder.folder("LASD");
  folder.file("LASD/gsm.db", "old");
  const std::string commit = "Failed to commit the data to file for " + path("gsm.db.tmp") + "\n";
  std::vector<std::uint8_t> broken = support::Gzip("content");
  broken.resize(broken.size() - 1);
  web.put(kUrl, 200, broken, {{"Content-Type", "application/gzip"}});
  EXPECT_FALSE(install(kUrl));
  Lines found = lines();
  ASSERT_GE(found.size(), 2U);
  EXPECT_EQ(found[found.size() - 2],
            "Could not uncompress HTTP response to " + path("gsm.db.tmp") + "!\n");
  EXPECT_EQ(found.back(), commit);
  web.put(kUrl, 200, support::Gzip("content"), {});
  EXPECT_FALSE(install(kUrl));
  EXPECT_EQ(lines().back(), commit);
  EXPECT_EQ(names(), Names{"gsm.db"});
  EXPECT_EQ(text("gsm.db"), "old");
  EXPECT_TRUE(store.takeSynchronized().empty());
}

TEST_F(Install, OfANameTooLongForAFileFails) {
  const std::string url = "https://host/" + std::string(300, 'n') + ".gz";
  putDatabase(url, "content");
  EXPECT_FALSE(install(url));
  EXPECT_EQ(lines().back(),
            "Failed to commit the data to file for " + path(std::string(300, 'n') + ".tmp") + "\n");
}

TEST_F(Install, ReplacesWhatAnEarlierAttemptLeft) {
  putDatabase(kUrl, "new");
  folder.folder("LASD");
  folder.file("LASD/gsm.db.tmp", "a longer text from an attempt that was killed");
  EXPECT_TRUE(install(kUrl));
  EXPECT_EQ(text("gsm.db"), "new");
  EXPECT_EQ(names(), Names{"gsm.db"});
}

TEST_F(Install, DoesNotWriteThroughALinkOrASecondName) {
  putDatabase(kUrl, "new");
  folder.folder("LASD");
  folder.file("precious", "precious");
  folder.link("LASD/gsm.db.tmp", folder.at("precious"));
  EXPECT_TRUE(install(kUrl));
  EXPECT_EQ(folder.text("precious"), "precious");
  EXPECT_EQ(text("gsm.db"), "new");
  std::filesystem::create_hard_link(folder.at("precious"), at("gsm.db.tmp"));
  EXPECT_TRUE(install(kUrl));
  EXPECT_EQ(folder.text("precious"), "precious");
}

TEST_F(Install, DoesNotWaitForAFifo) {
  putDatabase(kUrl, "new");
  folder.folder("LASD");
  folder.fifo("LASD/gsm.db.tmp");
  folder.fifo("LASD/gsm.db");
  EXPECT_TRUE(install(kUrl));
  EXPECT_EQ(text("gsm.db"), "new");
}

TEST_F(Install, ReplacesALinkUnderTheFinalNameAndNotWhatItPointsTo) {
  putDatabase(kUrl, "new");
  folder.folder("LASD");
  folder.file("precious", "precious");
  folder.link("LASD/gsm.db", folder.at("precious"));
  EXPECT_TRUE(install(kUrl));
  EXPECT_EQ(folder.text("precious"), "precious");
  EXPECT_TRUE(std::filesystem::is_regular_file(std::filesystem::symlink_status(at("gsm.db"))));
  std::filesystem::remove(at("gsm.db"));
  folder.link("LASD/gsm.db", folder.at("absent"));
  EXPECT_TRUE(install(kUrl)) << "a link to nothing is not seen, and replaced by the rename";
  EXPECT_EQ(folder.text("absent"), "(absent)");
}

TEST_F(Install, FailsWhereADirectoryStandsUnderTheTemporaryName) {
  putDatabase(kUrl, "new");
  folder.folder("LASD");
  folder.folder("LASD/gsm.db.tmp");
  EXPECT_FALSE(install(kUrl));
  const Lines found = lines();
  ASSERT_GE(found.size(), 2U);
  EXPECT_EQ(found[found.size() - 2],
            "Cannot open output file " + path("gsm.db.tmp") + ": Is a directory\n");
  EXPECT_EQ(found.back(), "Failed to commit the data to file for " + path("gsm.db.tmp") + "\n");
  EXPECT_EQ(names(), Names{"gsm.db.tmp"});
}

TEST_F(Install, FailsWhereTheOldFileCannotBeRemovedAndLeavesTheTemporaryOne) {
  putDatabase(kUrl, "new");
  folder.folder("LASD");
  folder.folder("LASD/gsm.db");
  folder.file("LASD/gsm.db/occupant", "");
  EXPECT_FALSE(install(kUrl));
  EXPECT_EQ(lines().back(),
            "Failed to remove the previous download at location " + path("gsm.db") + "\n");
  EXPECT_EQ(names(), (Names{"gsm.db", "gsm.db.tmp"}));
  EXPECT_FALSE(recorded("gsm"));
}

TEST_F(Install, ReplacesAnEmptyDirectoryUnderTheFinalName) {
  putDatabase(kUrl, "new");
  folder.folder("LASD");
  folder.folder("LASD/gsm.db");
  EXPECT_TRUE(install(kUrl));
  EXPECT_EQ(text("gsm.db"), "new");
}

/// A log in which one line triggers something, at the moment of that line.
class Tripwire final : public platform::SystemLog {
 public:
  Tripwire(platform::SystemLog& next, std::string beginning, std::function<void()> action)
      : next_(next), beginning_(std::move(beginning)), action_(std::move(action)) {}
  void write(platform::LogPriority priority, std::string_view text) override {
    next_.write(priority, text);
    if (text.starts_with(beginning_)) action_();
  }

 private:
  platform::SystemLog& next_;
  const std::string beginning_;
  const std::function<void()> action_;
};

TEST_F(Install, FailsWhereTheFileCannotBeMovedAndRecordsNothing) {
  putDatabase(kUrl, "new");
  folder.folder("LASD");
  folder.file("LASD/gsm.db", "old");
  Tripwire tripwire(log, "Moving ", [&] { std::filesystem::remove(at("gsm.db.tmp")); });
  const platform::ScopedReplacement<platform::SystemLog> replacement(tripwire);
  EXPECT_FALSE(install(kUrl));
  EXPECT_EQ(lines().back(), "Could not rename " + path("gsm.db.tmp") + " to " + path("gsm.db") +
                                ": No such file or directory\n");
  EXPECT_EQ(names(), Names{}) << "the old file had gone before";
  EXPECT_TRUE(store.takeSynchronized().empty());
}

TEST_F(Install, OfAVersionThatCannotBeRecordedFailsAndLeavesTheNewFile) {
  putDatabase(kUrl, "new");
  enter(Entry("7", kUrl));
  store.setWritable(false);
  onQueue([&] { EXPECT_FALSE(updater->installDatabase(kUrl, kGsm)); });
  EXPECT_EQ(text("gsm.db"), "new");
  EXPECT_EQ(lines().back(), "Moving " + path("gsm.db.tmp") + " to " + path("gsm.db") + "\n");
}

TEST_F(Install, OfAnUnknownTypeInstallsTheFileAndRecordsNothing) {
  putDatabase(kUrl, "new");
  EXPECT_FALSE(install(kUrl, LASDDatabaseType{32}));
  EXPECT_EQ(text("gsm.db"), "new");
  EXPECT_EQ(lines().back(), "Moving " + path("gsm.db.tmp") + " to " + path("gsm.db") + "\n");
  EXPECT_TRUE(store.takeSynchronized().empty());
}

TEST_F(Install, FailsWhereTheDirectoryIsAFileOrALinkToNothing) {
  putDatabase(kUrl, "new");
  const std::string line = "Cannot create " + folder.at("LASD") + " errno set to File exists\n";
  folder.file("LASD", "a file");
  EXPECT_FALSE(install(kUrl));
  EXPECT_EQ(lines(), Lines{line});
  std::filesystem::remove(folder.at("LASD"));
  folder.link("LASD", folder.at("absent"));
  EXPECT_FALSE(install(kUrl));
  EXPECT_EQ(lines(), Lines{line});
  EXPECT_TRUE(web.transfers().empty()) << "nothing is fetched for nothing";
}

TEST_F(Install, FailsWhereTheDirectorysParentIsMissing) {
  const auto orphan = LASDUpdater::make_shared_ptr(new LASDUpdater(folder.at("no/LASD")));
  std::binary_semaphore done(0);
  orphan->post([&] {
    EXPECT_FALSE(orphan->installDatabase(kUrl, kGsm));
    done.release();
  });
  done.acquire();
  EXPECT_EQ(lines(), Lines{"Cannot create " + folder.at("no/LASD") +
                           " errno set to No such file or directory\n"});
}

TEST_F(Install, GoesOnWhereTheDirectoryCannotBeLookedAt) {
  putDatabase(kUrl, "new");
  folder.link("LASD", folder.at("LASD"));  // a link to itself: an error other than absence
  EXPECT_FALSE(install(kUrl));
  EXPECT_EQ(lines().back(), "Failed to commit the data to file for " + path("gsm.db.tmp") + "\n");
}

TEST_F(Install, TakesASocketForADirectoryUntilItWrites) {
  // Its type has the directory's bit.
  putDatabase(kUrl, "new");
  const platform::FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const platform::UnixSocketAddress address(folder.at("LASD"));
  ASSERT_EQ(::bind(socket.get(), address.get(), address.size()), 0);
  EXPECT_FALSE(install(kUrl));
  EXPECT_EQ(lines().back(), "Failed to commit the data to file for " + path("gsm.db.tmp") + "\n");
}

TEST_F(Install, FollowsALinkToADirectory) {
  putDatabase(kUrl, "new");
  folder.folder("elsewhere");
  folder.link("LASD", folder.at("elsewhere"));
  EXPECT_TRUE(install(kUrl));
  EXPECT_EQ(folder.text("elsewhere/gsm.db"), "new");
}

/// No file of this process may grow beyond `bytes`, as on a disk that is full.
class FileSizeLimit {
 public:
  explicit FileSizeLimit(rlim_t bytes) : previousAction_(::signal(SIGXFSZ, SIG_IGN)) {
    EXPECT_EQ(::getrlimit(RLIMIT_FSIZE, &previous_), 0);
    const rlimit limit{.rlim_cur = bytes, .rlim_max = previous_.rlim_max};
    EXPECT_EQ(::setrlimit(RLIMIT_FSIZE, &limit), 0);
  }
  ~FileSizeLimit() {
    (void)::setrlimit(RLIMIT_FSIZE, &previous_);
    (void)::signal(SIGXFSZ, previousAction_);
  }
  FileSizeLimit(const FileSizeLimit&) = delete;
  FileSizeLimit& operator=(const FileSizeLimit&) = delete;

 private:
  sighandler_t previousAction_;
  rlimit previous_{};
};

TEST_F(Install, OfMoreThanFitsLeavesNothingNew) {
  putDatabase(kUrl, std::string(100'000, 'n'));
  folder.folder("LASD");
  folder.file("LASD/gsm.db", "old");
  bool installed = true;
  {
    const FileSizeLimit limit(50'000);
    installed = install(kUrl);
  }
  EXPECT_FALSE(installed);
  EXPECT_EQ(lines().back(), "Failed to commit the data to file for " + path("gsm.db.tmp") + "\n");
  EXPECT_EQ(names(), Names{"gsm.db"});
  EXPECT_EQ(text("gsm.db"), "old");
  EXPECT_TRUE(store.takeSynchronized().empty());
}

class Update : public Install {
 protected:
  void update(LASDDatabaseType type) {
    onQueue([&] { updater->updateDatabase(type); });
  }
};

TEST_F(Update, TellsOfAnInstalledDatabaseWithItsType) {
  putDatabase(kUrl, "new");
  enter(Entry("7", kUrl));
  update(kGsm);
  EXPECT_EQ(notification(),
            Dictionary({{"Notification", "com.zarvo.lasd.UpdateAvailable"}, {"DBType", "gsm"}}));
  EXPECT_TRUE(isSilent());
}

TEST_F(Update, TellsOfAFailedInstallWithoutItsType) {
  enter(Entry("7", kUrl));
  update(kGsm);
  EXPECT_EQ(notification(), Dictionary({{"Notification", "com.zarvo.lasd.UpdateFailed"}}));
  EXPECT_TRUE(isSilent());
}

TEST_F(Update, WithoutAnEntryIsOneLineAndNoNotification) {
  update(kGsm);
  EXPECT_EQ(lines(), Lines{"Could not find gsm database URL"});
  EXPECT_TRUE(updater->versionTable().empty()) << "no entry is made";
  EXPECT_TRUE(isSilent());
}

TEST_F(Update, WithoutAUrlIsOneLineAndNoNotification) {
  for (const PropertyList& entry :
       {Entry("7", ""), Dictionary({{"Version", "7"}}), Dictionary({{"ContentURL", 7}}),
        Dictionary({{"ContentURL", PropertyList::Array{kUrl}}}), PropertyList(7)}) {
    enter(entry);
    update(kGsm);
    EXPECT_EQ(lines(), Lines{"URL for gsm database is empty\n"});
    EXPECT_TRUE(isSilent());
  }
  EXPECT_TRUE(web.transfers().empty());
}

}  // namespace
