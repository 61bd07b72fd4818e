// SPDX-License-Identifier: Apache-2.0
//
// The preferences store where writing fails: no space, no permission, a writer that does not let
// go. The old file stays, nothing else is left behind, and the next attempt may succeed. One thread
// unless a test says otherwise.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <sys/file.h>
#include <sys/mount.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <thread>

#include "Helper/Platform/Linux/PreferenceFiles.h"
#include "Tests/Fakes/FakeSystemLog.h"
#include "Tests/Preferences/TemporaryFolder.h"

namespace {

using platform::FileDescriptor;
using platform::LogPriority;
using platform::PreferenceDomain;
using platform::PreferenceFiles;
using platform::PropertyList;
using preferences_test::NamesIn;
using preferences_test::ReadFile;
using preferences_test::WriteFile;
namespace fs = std::filesystem;

class PreferenceFault : public testing::Test {
 protected:
  [[nodiscard]] PreferenceFiles store(std::chrono::milliseconds patience) const {
    return PreferenceFiles(temporary.roots(), patience);
  }

  // One line at error level that says which file and why.
  void expectComplaint(std::string_view why) {
    const auto lines = log.takeLines();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].first, LogPriority::kError);
    EXPECT_EQ(lines[0].second.find("Cannot store preferences in " + file.string() + ": "), 0U);
    EXPECT_NE(lines[0].second.find(why), std::string::npos) << lines[0].second;
  }

  preferences_test::TemporaryFolder temporary;
  fakes::FakeSystemLog log;
  platform::ScopedReplacement<platform::SystemLog> logReplacement{log};
  const PreferenceDomain domain{"com.zarvo.carrier"};
  const fs::path folder = temporary.path() / "user/Library/Preferences";
  const fs::path file = folder / "com.zarvo.carrier.plist";
  const fs::path lockFile = folder / ".com.zarvo.carrier.plist.lock";
};

TEST_F(PreferenceFault, GivesUpOnAWriterThatDoesNotLetGo) {
  PreferenceFiles files = store(std::chrono::milliseconds(5));
  files.setValue("key", "old", domain);
  ASSERT_TRUE(files.synchronize(domain));
  const std::string before = ReadFile(file);

  FileDescriptor other(::open(lockFile.c_str(), O_RDWR | O_CLOEXEC));
  ASSERT_EQ(::flock(other.get(), LOCK_EX), 0);
  files.setValue("key", "new", domain);
  EXPECT_FALSE(files.synchronize(domain));
  expectComplaint("wait for the lock");
  EXPECT_EQ(ReadFile(file), before);
  EXPECT_EQ(files.copyValue("key", domain), PropertyList("new"));  // still pending

  other.reset();
  EXPECT_TRUE(files.synchronize(domain));
  EXPECT_TRUE(fs::exists(lockFile));
  EXPECT_EQ(PreferenceFiles(temporary.roots()).copyValue("key", domain), PropertyList("new"));
}

TEST_F(PreferenceFault, ReadsWhileAnotherWriterHoldsTheLock) {
  PreferenceFiles files = store(std::chrono::milliseconds(5));
  files.setValue("key", "old", domain);
  ASSERT_TRUE(files.synchronize(domain));
  const FileDescriptor other(::open(lockFile.c_str(), O_RDWR | O_CLOEXEC));
  ASSERT_EQ(::flock(other.get(), LOCK_EX), 0);
  PreferenceFiles fresh = store(std::chrono::milliseconds(5));
  EXPECT_TRUE(fresh.synchronize(domain));
  EXPECT_EQ(fresh.copyValue("key", domain), PropertyList("old"));
}

TEST_F(PreferenceFault, WaitsForAWriterThatLetsGo) {
  PreferenceFiles files = store(std::chrono::minutes(1));
  files.setValue("key", 1, domain);
  ASSERT_TRUE(files.synchronize(domain));
  FileDescriptor other(::open(lockFile.c_str(), O_RDWR | O_CLOEXEC));
  ASSERT_EQ(::flock(other.get(), LOCK_EX), 0);
  files.setValue("key", 2, domain);
  std::thread writer([&] { EXPECT_TRUE(files.synchronize(domain)); });
  other.reset();
  writer.join();
  EXPECT_EQ(PreferenceFiles(temporary.roots()).copyValue("key", domain), PropertyList(2));
}

TEST_F(PreferenceFault, LosesNoKeyAmongContendingStores) {
  constexpr int kStores = 4;
  constexpr int kRounds = 15;
  std::vector<std::thread> writers;
  writers.reserve(kStores);
  for (int i = 0; i < kStores; ++i) {
    writers.emplace_back([this, i] {
      PreferenceFiles files = store(std::chrono::minutes(1));
      for (int round = 0; round < kRounds; ++round) {
        files.setValue(std::to_string(i) + "/" + std::to_string(round), round, domain);
        EXPECT_TRUE(files.synchronize(domain));
      }
    });
  }
  for (std::thread& writer : writers) writer.join();
  PreferenceFiles fresh(temporary.roots());
  for (int i = 0; i < kStores; ++i) {
    for (int round = 0; round < kRounds; ++round) {
      EXPECT_EQ(fresh.copyValue(std::to_string(i) + "/" + std::to_string(round), domain),
                PropertyList(round));
    }
  }
  EXPECT_EQ(NamesIn(folder), std::set<std::string>{"com.zarvo.carrier.plist"});
}

TEST_F(PreferenceFault, WritesThroughNoLinkAtItsOwnNames) {
  WriteFile(temporary.path() / "victim", "untouched");
  fs::create_directories(folder);
  fs::create_symlink(temporary.path() / "victim", folder / ".com.zarvo.carrier.plist.tmp");
  PreferenceFiles files = store(std::chrono::milliseconds(5));
  files.setValue("key", 1, domain);
  EXPECT_TRUE(files.synchronize(domain));
  fs::create_symlink(temporary.path() / "victim", folder / ".com.zarvo.lock.plist.lock");
  files.setValue("key", 1, {"com.zarvo.lock"});
  EXPECT_FALSE(files.synchronize(PreferenceDomain{"com.zarvo.lock"}));
  EXPECT_EQ(ReadFile(temporary.path() / "victim"), "untouched");
}

TEST_F(PreferenceFault, FailsWhereAFileStandsInTheFoldersPlace) {
  WriteFile(temporary.path() / "user/Library", "no folder");
  PreferenceFiles files = store(std::chrono::milliseconds(5));
  EXPECT_FALSE(files.copyValue("key", domain));
  files.setValue("key", 1, domain);
  EXPECT_FALSE(files.synchronize(domain));
  expectComplaint("open the folder");
  fs::remove(temporary.path() / "user/Library");
  EXPECT_TRUE(files.synchronize(domain));
}

TEST_F(PreferenceFault, KeepsTheOthersValuesWhenTheyCannotBeRead) {
  WriteFile(file, "<plist><dict><key>theirs</key><true/></dict></plist>");
  ASSERT_EQ(::chmod(file.c_str(), 0), 0);
  // The superuser may read every file, so this test is somebody else.
  constexpr uid_t kNobody = 65'534;
  const uid_t user = ::geteuid();
  if (user == 0) {
    for (const auto& path : {temporary.path(), folder, file}) {
      ASSERT_EQ(::chown(path.c_str(), kNobody, kNobody), 0);
    }
    ASSERT_EQ(::seteuid(kNobody), 0);
  }
  PreferenceFiles files = store(std::chrono::milliseconds(5));
  files.setValue("mine", 1, domain);
  EXPECT_FALSE(files.synchronize(domain));
  EXPECT_EQ(log.takeLines().size(), 2U);  // cannot be read, and so cannot be written
  EXPECT_EQ(::chmod(file.c_str(), 0600), 0);
  EXPECT_TRUE(files.synchronize(domain));
  EXPECT_EQ(files.copyValue("theirs", domain), PropertyList(true));
  EXPECT_EQ(files.copyValue("mine", domain), PropertyList(1));
  ASSERT_EQ(::seteuid(user), 0);
}

// A file system of 64 KiB under the temporary folder, in a mount name space of this test's own.
class PreferenceFullDisk : public PreferenceFault {
 protected:
  void SetUp() override {
    if (::unshare(CLONE_NEWNS) != 0 ||
        ::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
        ::mount("tmpfs", temporary.path().c_str(), "tmpfs", 0, "size=64k") != 0) {
      GTEST_SKIP() << "cannot mount a small file system: " << ::strerrordesc_np(errno);
    }
    mounted_ = true;
  }
  void TearDown() override {
    if (mounted_) ::umount2(temporary.path().c_str(), MNT_DETACH);
  }

 private:
  bool mounted_ = false;
};

TEST_F(PreferenceFullDisk, KeepsTheOldFileAndLeavesNothingBehind) {
  PreferenceFiles files = store(std::chrono::milliseconds(5));
  files.setValue("key", "old", domain);
  ASSERT_TRUE(files.synchronize(domain));
  const std::string before = ReadFile(file);
  files.setValue("key", PropertyList::Data(100'000, std::byte{1}), domain);
  for (int attempt = 0; attempt < 3; ++attempt) {
    EXPECT_FALSE(files.synchronize(domain));
    expectComplaint("No space left on device");
    EXPECT_EQ(ReadFile(file), before);
    EXPECT_EQ(NamesIn(folder), std::set<std::string>{"com.zarvo.carrier.plist"});
  }
  files.setValue("key", "new", domain);
  EXPECT_TRUE(files.synchronize(domain));
  EXPECT_EQ(PreferenceFiles(temporary.roots()).copyValue("key", domain), PropertyList("new"));
}

TEST_F(PreferenceFullDisk, FailsOnAReadOnlyFileSystemAndRecovers) {
  PreferenceFiles files = store(std::chrono::milliseconds(5));
  files.setValue("key", "old", domain);
  ASSERT_TRUE(files.synchronize(domain));
  ASSERT_EQ(::mount(nullptr, temporary.path().c_str(), nullptr, MS_REMOUNT | MS_RDONLY, nullptr),
            0);
  files.setValue("key", "new", domain);
  EXPECT_FALSE(files.synchronize(domain));
  expectComplaint("Read-only file system");
  EXPECT_EQ(PreferenceFiles(temporary.roots()).copyValue("key", domain), PropertyList("old"));
  ASSERT_EQ(::mount(nullptr, temporary.path().c_str(), nullptr, MS_REMOUNT, nullptr), 0);
  EXPECT_TRUE(files.synchronize(domain));
  EXPECT_EQ(PreferenceFiles(temporary.roots()).copyValue("key", domain), PropertyList("new"));
}

}  // namespace
