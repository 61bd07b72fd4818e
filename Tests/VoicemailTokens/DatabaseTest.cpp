// SPDX-License-Identifier: Apache-2.0
//
// The token database where things go wrong: files of others, links, damage, locks, no space, a file
// system that cannot be written. One thread; what needs mounts runs in a name space of its own.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <fstream>
#include <sstream>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Linux/VoicemailTokenDatabase.h"
#include "Tests/Fakes/FakeSystemLog.h"
#include "Tests/VoicemailTokens/TokenFolder.h"

namespace {

using platform::LogPriority;
using platform::SqliteLibrary;
using platform::SqliteStatement;
using platform::SqliteStatus;
using platform::VoicemailTokenDatabase;
namespace fs = std::filesystem;

void WriteFile(const fs::path& path, const std::string& text) {
  std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
}

std::string ReadFile(const fs::path& path) {
  std::ostringstream text;
  text << std::ifstream(path, std::ios::binary).rdbuf();
  return text.str();
}

mode_t ModeOf(const fs::path& path) {
  struct stat status {};
  return ::lstat(path.c_str(), &status) == 0 ? status.st_mode & 07777 : 0;
}

/// Another process's view of the database.
class Other {
 public:
  explicit Other(const std::string& path)
      : database_(*SqliteLibrary::Load(failure_), path, std::chrono::milliseconds(0), status_) {}
  bool execute(const char* statements) { return database_.execute(statements).ok(); }
  std::optional<std::string> ask(const char* statement) {
    SqliteStatus status;
    std::optional<std::string> answer;
    SqliteStatement prepared(database_, statement, status);
    if (status.ok()) status = prepared.run({}, &answer);
    return status.ok() ? answer : std::nullopt;
  }

 private:
  std::string failure_;
  SqliteStatus status_;
  platform::SqliteDatabase database_;
};

class VoicemailTokenDatabaseTest : public testing::Test {
 protected:
  [[nodiscard]] VoicemailTokenDatabase store() const {
    return VoicemailTokenDatabase(file, std::chrono::milliseconds(1));
  }
  void expectSilence() { EXPECT_TRUE(log.takeLines().empty()); }
  /// One line at error priority that contains each of these.
  void expectComplaint(const std::vector<std::string>& parts) {
    const auto lines = log.takeLines();
    ASSERT_EQ(lines.size(), 1U) << (lines.size() > 1 ? lines[1].second : "");
    EXPECT_EQ(lines[0].first, LogPriority::kError);
    EXPECT_EQ(lines[0].second.find("Voicemail token store " + file), 0U) << lines[0].second;
    for (const std::string& part : parts) {
      EXPECT_NE(lines[0].second.find(part), std::string::npos) << lines[0].second;
    }
  }
  /// Mounts a file system on the store's folder, seen by this process alone. False, with the test
  /// skipped, where that is not permitted.
  bool mountFolder(const char* options) {
    fs::create_directories(folder.folder());
    if (::unshare(CLONE_NEWNS) == 0 &&
        ::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
        ::mount("tokens", folder.folder().c_str(), "tmpfs", 0, options) == 0) {
      mounted_ = true;
      return true;
    }
    return false;
  }
  bool remountFolder(unsigned long flags) const {
    return ::mount(nullptr, folder.folder().c_str(), nullptr, MS_REMOUNT | flags, nullptr) == 0;
  }
  void TearDown() override {
    if (mounted_) (void)::umount2(folder.folder().c_str(), MNT_DETACH);
  }

  token_test::TokenFolder folder;
  const std::string file = folder.file();
  fakes::FakeSystemLog log;
  platform::ScopedReplacement<platform::SystemLog> logReplacement{log};

 private:
  bool mounted_ = false;
};

TEST_F(VoicemailTokenDatabaseTest, OpensNothingBeforeItsFirstOperation) {
  const VoicemailTokenDatabase unused = store();
  EXPECT_FALSE(fs::exists(folder.folder()));
}

TEST_F(VoicemailTokenDatabaseTest, IsClosedToEverybodyElseWhateverTheMask) {
  const mode_t mask = ::umask(0);
  VoicemailTokenDatabase tokens = store();
  tokens.setCurrentToken("token");
  ::umask(mask);
  EXPECT_EQ(ModeOf(folder.folder()), 0700U);
  for (const std::string& name : folder.names()) {
    EXPECT_EQ(ModeOf(folder.folder() / name), 0600U) << name;
  }
  EXPECT_EQ(folder.names(), (std::set<std::string>{"tokens.db", "tokens.db-shm", "tokens.db-wal"}));
  expectSilence();
}

TEST_F(VoicemailTokenDatabaseTest, ClosesAFolderAndAFileThatWereOpenToOthers) {
  store().setCurrentToken("token");
  ::chmod(folder.folder().c_str(), 0755);
  ::chmod(file.c_str(), 0644);
  EXPECT_EQ(store().copyCurrentToken(), "token");
  EXPECT_EQ(ModeOf(folder.folder()), 0700U);
  EXPECT_EQ(ModeOf(file), 0600U);
}

TEST_F(VoicemailTokenDatabaseTest, KeepsWritesDurableInAWriteAheadLog) {
  VoicemailTokenDatabase tokens = store();
  tokens.setCurrentToken("token");
  Other other(file);
  EXPECT_EQ(other.ask("PRAGMA journal_mode;"), "wal");
}

TEST_F(VoicemailTokenDatabaseTest, DoesNotFollowALinkInItsPlace) {
  const fs::path elsewhere = folder.path() / "elsewhere";
  WriteFile(elsewhere, "");
  fs::create_directories(folder.folder());
  fs::create_symlink(elsewhere, file);
  VoicemailTokenDatabase tokens = store();
  tokens.setCurrentToken("token");
  expectComplaint({"cannot set the current token", "not a regular file"});
  EXPECT_EQ(fs::file_size(elsewhere), 0U);
}

TEST_F(VoicemailTokenDatabaseTest, DoesNotFollowALinkInTheFoldersPlace) {
  const fs::path elsewhere = folder.path() / "elsewhere";
  fs::create_directories(elsewhere);
  fs::create_symlink(elsewhere, folder.folder());
  EXPECT_FALSE(store().copyCurrentToken());
  expectComplaint({"cannot copy the current token", "open the folder"});
  EXPECT_TRUE(fs::is_empty(elsewhere));
}

TEST_F(VoicemailTokenDatabaseTest, DoesNotUseAFolderOrAFileOfSomebodyElse) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root can give files away";
  store().setCurrentToken("token");
  ASSERT_EQ(::chown(file.c_str(), 65534, 65534), 0);
  EXPECT_FALSE(store().copyCurrentToken());
  expectComplaint({"Operation not permitted"});
  ASSERT_EQ(::chown(file.c_str(), 0, 0), 0);
  ASSERT_EQ(::chown(folder.folder().c_str(), 65534, 65534), 0);
  EXPECT_FALSE(store().copyCurrentToken());
  expectComplaint({"open the folder", "Operation not permitted"});
}

TEST_F(VoicemailTokenDatabaseTest, DoesNotOpenAFifoInItsPlace) {
  fs::create_directories(folder.folder());
  ASSERT_EQ(::mkfifo(file.c_str(), 0600), 0);
  EXPECT_FALSE(store().copyToken("key"));
  expectComplaint({"cannot copy a token", "not a regular file"});
}

TEST_F(VoicemailTokenDatabaseTest, SetsAFileThatIsNoDatabaseAsideAndBeginsAnew) {
  fs::create_directories(folder.folder());
  const std::string rubbish(10'000, 'r');
  WriteFile(file, rubbish);
  VoicemailTokenDatabase tokens = store();
  tokens.setCurrentToken("token");
  expectComplaint({"is damaged", "kept as " + file + ".corrupt-1, begun anew"});
  EXPECT_EQ(tokens.copyCurrentToken(), "token");
  EXPECT_EQ(ReadFile(file + ".corrupt-1"), rubbish);
  expectSilence();
}

TEST_F(VoicemailTokenDatabaseTest, FindsDamageInsideTheDatabaseWhenItOpensIt) {
  {
    VoicemailTokenDatabase tokens = store();
    for (int number = 0; number < 200; ++number) {
      tokens.setToken("key" + std::to_string(number), std::string(200, 't'));
    }
  }
  std::string content = ReadFile(file);
  ASSERT_GT(content.size(), std::size_t{5} * 4096);
  // The page of some table, its header and the pointers behind it.
  std::fill_n(content.begin() + std::ptrdiff_t{4} * 4096, 512, '\x5a');
  WriteFile(file, content);
  VoicemailTokenDatabase tokens = store();
  EXPECT_FALSE(tokens.copyToken("key7"));
  expectComplaint({"is damaged", ".corrupt-1, begun anew"});
  tokens.setToken("key7", "again");
  EXPECT_EQ(tokens.copyToken("key7"), "again");
  EXPECT_EQ(ReadFile(file + ".corrupt-1"), content);
}

TEST_F(VoicemailTokenDatabaseTest, FindsDamageThatHappensWhileItIsOpen) {
  VoicemailTokenDatabase tokens = store();
  tokens.setCurrentToken("token");
  // So that it has to read again.
  ASSERT_TRUE(Other(file).execute("CREATE TABLE other (x); PRAGMA wal_checkpoint(TRUNCATE);"));
  const std::string rubbish(ReadFile(file).size(), 'r');
  // In place: the file stays the one that is open.
  std::fstream(file, std::ios::binary | std::ios::in | std::ios::out) << rubbish;
  EXPECT_FALSE(tokens.copyCurrentToken());
  expectComplaint({"is damaged", "kept as " + file + ".corrupt-1, begun anew"});
  tokens.setCurrentToken("new");
  EXPECT_EQ(tokens.copyCurrentToken(), "new");
  EXPECT_EQ(ReadFile(file + ".corrupt-1"), rubbish);
  expectSilence();
}

TEST_F(VoicemailTokenDatabaseTest, KeepsFourDamagedFilesAndTheirLogsAtMost) {
  fs::create_directories(folder.folder());
  for (int number = 1; number <= 6; ++number) {
    WriteFile(file, std::string(5000, static_cast<char>('0' + number)));
    if (number == 2) WriteFile(file + "-wal", "log of the second");
    store().setCurrentToken("token");
    (void)log.takeLines();
    for (const char* suffix : {"", "-wal", "-shm"}) fs::remove(file + suffix);
  }
  EXPECT_EQ(ReadFile(file + ".corrupt-1").front(), '1');
  EXPECT_EQ(ReadFile(file + ".corrupt-2").front(), '2');
  EXPECT_EQ(ReadFile(file + ".corrupt-2-wal"), "log of the second");
  EXPECT_EQ(ReadFile(file + ".corrupt-4").front(), '6');
  EXPECT_EQ(folder.names().size(), 5U);
}

TEST_F(VoicemailTokenDatabaseTest, ReadsButDoesNotWriteWhileAnotherProcessWrites) {
  VoicemailTokenDatabase tokens = store();
  tokens.setCurrentToken("old");
  {
    Other other(file);
    ASSERT_TRUE(other.execute("BEGIN IMMEDIATE;"));
    tokens.setCurrentToken("new");
    expectComplaint({"cannot set the current token", "locked"});
    EXPECT_EQ(tokens.copyCurrentToken(), "old");
    expectSilence();
  }
  tokens.setCurrentToken("new");
  EXPECT_EQ(tokens.copyCurrentToken(), "new");
  expectSilence();
}

TEST_F(VoicemailTokenDatabaseTest, AnswersNothingWhileAnotherProcessKeepsItForItself) {
  store().setCurrentToken("old");
  VoicemailTokenDatabase tokens = store();
  {
    Other other(file);
    ASSERT_TRUE(other.execute("PRAGMA locking_mode = EXCLUSIVE; BEGIN EXCLUSIVE;"));
    EXPECT_FALSE(tokens.copyCurrentToken());
    expectComplaint({"cannot copy the current token", "locked"});
  }
  EXPECT_EQ(tokens.copyCurrentToken(), "old");
}

TEST_F(VoicemailTokenDatabaseTest, RemovesTheRecordsOfTheVoicemailService) {
  VoicemailTokenDatabase tokens = store();
  tokens.setToken("key", "token");
  Other other(file);
  ASSERT_TRUE(other.execute("INSERT INTO record (content) VALUES (x'00'), (x'01');"));
  tokens.removeAllRecords();
  EXPECT_EQ(other.ask("SELECT count(*) FROM record;"), "0");
  EXPECT_EQ(tokens.copyToken("key"), "token");
}

TEST_F(VoicemailTokenDatabaseTest, LeavesNoTraceOfATokenThatWasCleared) {
  const std::string secret = "a token that nobody shall find again";
  VoicemailTokenDatabase tokens = store();
  tokens.setCurrentToken(secret);
  tokens.setCurrentToken(std::nullopt);
  for (const std::string& name : folder.names()) {
    EXPECT_EQ(ReadFile(folder.folder() / name).find(secret), std::string::npos) << name;
  }
}

TEST_F(VoicemailTokenDatabaseTest, NamesNoTokenInTheLog) {
  VoicemailTokenDatabase tokens = store();
  tokens.setCurrentToken("old");
  Other other(file);
  ASSERT_TRUE(other.execute("BEGIN IMMEDIATE;"));
  tokens.setCurrentToken("secret token");
  tokens.setToken("secret key", "secret token");
  for (const auto& line : log.takeLines()) {
    EXPECT_EQ(line.second.find("secret"), std::string::npos) << line.second;
  }
}

TEST_F(VoicemailTokenDatabaseTest, KeepsTheOldTokenWhenTheFileSystemIsFull) {
  if (!mountFolder("size=256k,mode=0700")) GTEST_SKIP() << "cannot mount: " << ::strerror(errno);
  VoicemailTokenDatabase tokens = store();
  tokens.setCurrentToken("old");
  expectSilence();
  {
    const platform::FileDescriptor filler(
        ::open((folder.folder() / "filler").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
    const std::string block(4096, 'f');
    while (::write(filler.get(), block.data(), block.size()) > 0) {
    }
  }
  tokens.setCurrentToken(std::string(20'000, 'n'));
  expectComplaint({"cannot set the current token", "full"});
  fs::remove(folder.folder() / "filler");
  EXPECT_EQ(tokens.copyCurrentToken(), "old");
  tokens.setCurrentToken("new");
  EXPECT_EQ(tokens.copyCurrentToken(), "new");
  expectSilence();
}

TEST_F(VoicemailTokenDatabaseTest, CannotBeMadeOnAFullFileSystemButLater) {
  if (!mountFolder("size=16k,mode=0700")) GTEST_SKIP() << "cannot mount: " << ::strerror(errno);
  VoicemailTokenDatabase tokens = store();
  tokens.setCurrentToken("token");
  EXPECT_EQ(log.takeLines().size(), 1U);
  EXPECT_FALSE(tokens.copyCurrentToken());
  (void)log.takeLines();
  ASSERT_EQ(::mount(nullptr, folder.folder().c_str(), nullptr, MS_REMOUNT, "size=1m"), 0);
  tokens.setCurrentToken("token");
  EXPECT_EQ(tokens.copyCurrentToken(), "token");
  expectSilence();
}

TEST_F(VoicemailTokenDatabaseTest, IsReadWhereItCannotBeWritten) {
  if (!mountFolder("size=1m,mode=0700")) GTEST_SKIP() << "cannot mount: " << ::strerror(errno);
  store().setCurrentToken("old");
  ASSERT_TRUE(remountFolder(MS_RDONLY));
  VoicemailTokenDatabase tokens = store();
  EXPECT_EQ(tokens.copyCurrentToken(), "old") << "after an orderly end, without a log";
  expectSilence();
  tokens.setCurrentToken("new");
  expectComplaint({"cannot set the current token", "readonly"});
  EXPECT_EQ(tokens.copyCurrentToken(), "old");
  ASSERT_TRUE(remountFolder(0));
  tokens.setCurrentToken("new");
  (void)log.takeLines();
  tokens.setCurrentToken("newer");
  EXPECT_EQ(tokens.copyCurrentToken(), "newer") << "once it can be written again";
  expectSilence();
}

TEST_F(VoicemailTokenDatabaseTest, IsMissedWhereItCannotBeMade) {
  if (!mountFolder("size=1m,mode=0700")) GTEST_SKIP() << "cannot mount: " << ::strerror(errno);
  ASSERT_TRUE(remountFolder(MS_RDONLY));
  EXPECT_FALSE(store().copyCurrentToken());
  expectComplaint({"cannot copy the current token", "create the file", "Read-only"});
}

}  // namespace
