// SPDX-License-Identifier: Apache-2.0
//
// The preferences store on files: what stands on disk, and what it makes of files that others left
// there. One thread.
#include "Helper/Platform/Linux/PreferenceFiles.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <functional>
#include <iterator>
#include <span>

#include "Tests/Fakes/FakeSystemLog.h"
#include "Tests/Preferences/TemporaryFolder.h"
#include "Tests/Support/LiveAllocations.h"

namespace {

using platform::HostScope;
using platform::LogPriority;
using platform::PreferenceDomain;
using platform::PreferenceFiles;
using platform::PropertyList;
using platform::UserScope;
using preferences_test::NamesIn;
using preferences_test::ReadFile;
using preferences_test::WriteFile;
namespace fs = std::filesystem;

std::string XmlWith(std::string_view value) {
  return "<plist version=\"1.0\"><dict><key>key</key><string>" + std::string(value) +
         "</string><key>other</key><true/></dict></plist>";
}

mode_t ModeOf(const fs::path& path) {
  struct stat status {};
  return ::stat(path.c_str(), &status) == 0 ? status.st_mode & 07777 : 0;
}

constexpr std::size_t kManyTexts = 50'000;

// Small in a file, where equal texts stand once, and large in memory.
PropertyList ManyTexts() { return PropertyList::Array(kManyTexts, "a text that is allocated"); }

class PreferenceFilesTest : public testing::Test {
 protected:
  [[nodiscard]] PreferenceFiles store() const { return PreferenceFiles(temporary.roots()); }

  // What a store that has seen nothing yet finds.
  [[nodiscard]] std::optional<PropertyList> stored(const std::string& key) const {
    return PreferenceFiles(temporary.roots()).copyValue(key, domain);
  }

  // Whether a fresh store can set `key` and finds it again.
  [[nodiscard]] bool canWrite() const {
    PreferenceFiles fresh(temporary.roots());
    fresh.setValue("written", "yes", domain);
    return fresh.synchronize(domain) && stored("written") == PropertyList("yes");
  }

  preferences_test::TemporaryFolder temporary;
  fakes::FakeSystemLog log;
  platform::ScopedReplacement<platform::SystemLog> logReplacement{log};
  const PreferenceDomain domain{"com.zarvo.carrier"};
  const fs::path folder = temporary.path() / "user/Library/Preferences";
  const fs::path file = folder / "com.zarvo.carrier.plist";
};

TEST_F(PreferenceFilesTest, PutsTheFileWhereItBelongsAndClosesItToOthers) {
  ASSERT_TRUE(canWrite());
  EXPECT_EQ(NamesIn(folder), std::set<std::string>{"com.zarvo.carrier.plist"});
  EXPECT_EQ(ModeOf(file), 0600U);
  EXPECT_EQ(ModeOf(folder), 0700U);
  EXPECT_TRUE(ReadFile(file).starts_with("bplist00"));
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(PreferenceFilesTest, PutsHostValuesBesideAndEverybodysValuesWhereEverybodyReads) {
  PreferenceFiles files = store();
  for (const PreferenceDomain& other :
       {PreferenceDomain{"com.zarvo.a", UserScope::kCurrentUser, HostScope::kCurrentHost},
        PreferenceDomain{"com.zarvo.b", UserScope::kAnyUser, HostScope::kCurrentHost},
        PreferenceDomain{"com.zarvo.c", UserScope::kAnyUser, HostScope::kAnyHost},
        PreferenceDomain{"../d", UserScope::kCurrentUser, HostScope::kAnyHost}}) {
    files.setValue("key", 1, other);
    EXPECT_TRUE(files.synchronize(other));
  }
  const fs::path everybodys = temporary.path() / "Library/Preferences";
  EXPECT_TRUE(fs::exists(folder / "ByHost/com.zarvo.a.cafe0123.plist"));
  EXPECT_TRUE(fs::exists(everybodys / "ByHost/com.zarvo.b.cafe0123.plist"));
  EXPECT_EQ(ModeOf(everybodys / "com.zarvo.c.plist"), 0644U);
  EXPECT_TRUE(fs::exists(folder / "%2E.%2Fd.plist"));
}

TEST_F(PreferenceFilesTest, MakesNoFolderJustToRead) {
  EXPECT_FALSE(stored("key"));
  PreferenceFiles files = store();
  EXPECT_TRUE(files.synchronizeApp("com.zarvo.carrier"));
  files.setValue("key", std::nullopt, domain);
  EXPECT_TRUE(files.synchronize(domain));
  EXPECT_FALSE(fs::exists(temporary.path() / "user"));
}

TEST_F(PreferenceFilesTest, ReadsXmlAndKeepsItsOtherKeys) {
  WriteFile(file, XmlWith("from another program"));
  EXPECT_EQ(stored("key"), PropertyList("from another program"));
  ASSERT_TRUE(canWrite());
  EXPECT_EQ(stored("key"), PropertyList("from another program"));
  EXPECT_EQ(stored("other"), PropertyList(true));
}

TEST_F(PreferenceFilesTest, KeepsModeAndOwnerOfTheFile) {
  WriteFile(file, XmlWith("value"));
  ASSERT_EQ(::chmod(file.c_str(), 0640), 0);
  const bool isRoot = ::geteuid() == 0;
  if (isRoot) {
    ASSERT_EQ(::chown(file.c_str(), 501, 502), 0);
  }
  ASSERT_TRUE(canWrite());
  struct stat status {};
  ASSERT_EQ(::stat(file.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0640U);
  if (isRoot) {
    EXPECT_EQ(status.st_uid, 501U);
    EXPECT_EQ(status.st_gid, 502U);
  }
}

TEST_F(PreferenceFilesTest, WritesNothingWhenNothingChanges) {
  PreferenceFiles files = store();
  files.setValue("key", PropertyList::Array{1, "a"}, domain);
  ASSERT_TRUE(files.synchronize(domain));
  const auto before = platform::StampOfPreferenceFile(file);
  files.setValue("key", PropertyList::Array{1, "a"}, domain);
  files.setValue("missing", std::nullopt, domain);
  EXPECT_TRUE(files.synchronize(domain));
  PreferenceFiles other = store();
  other.setValue("key", PropertyList::Array{1, "a"}, domain);
  EXPECT_TRUE(other.synchronize(domain));
  EXPECT_EQ(platform::StampOfPreferenceFile(file), before);
  files.setValue("key", PropertyList::Array{true, "a"}, domain);
  EXPECT_TRUE(files.synchronize(domain));
  EXPECT_FALSE(platform::StampOfPreferenceFile(file) == before);
}

TEST_F(PreferenceFilesTest, SeesEveryChangeOfAnotherProgramHoweverQuick) {
  // Same length, same file, within one tick of the clock that stamps files.
  PreferenceFiles files = store();
  for (int i = 100; i < 400; ++i) {
    const std::string value = std::to_string(i);
    WriteFile(file, XmlWith(value));
    ASSERT_TRUE(files.synchronize(domain));
    ASSERT_EQ(files.copyValue("key", domain), PropertyList(value));
  }
}

TEST_F(PreferenceFilesTest, SeesThatTheFileIsGone) {
  PreferenceFiles files = store();
  files.setValue("key", 1, domain);
  ASSERT_TRUE(files.synchronize(domain));
  fs::remove_all(temporary.path() / "user");
  EXPECT_TRUE(files.synchronize(domain));
  EXPECT_FALSE(files.copyValue("key", domain));
  files.setValue("key", 1, domain);
  EXPECT_TRUE(files.synchronize(domain));
  EXPECT_EQ(stored("key"), PropertyList(1));
}

TEST_F(PreferenceFilesTest, ReadsThroughASymbolicLink) {
  const fs::path target = temporary.path() / "bundle/carrier.plist";
  WriteFile(target, XmlWith("linked"));
  fs::create_directories(folder);
  fs::create_symlink(target, file);
  PreferenceFiles files = store();
  EXPECT_EQ(files.copyValue("key", domain), PropertyList("linked"));
  WriteFile(target, XmlWith("another"));
  EXPECT_TRUE(files.synchronize(domain));
  EXPECT_EQ(files.copyValue("key", domain), PropertyList("another"));
}

TEST_F(PreferenceFilesTest, ReplacesASymbolicLinkAndLeavesItsTargetAlone) {
  const fs::path target = temporary.path() / "bundle/carrier.plist";
  WriteFile(target, XmlWith("linked"));
  fs::create_directories(folder);
  fs::create_symlink(target, file);
  ASSERT_TRUE(canWrite());
  EXPECT_TRUE(fs::is_regular_file(fs::symlink_status(file)));
  EXPECT_EQ(ModeOf(file), 0600U);
  EXPECT_EQ(stored("key"), PropertyList("linked"));
  EXPECT_EQ(ReadFile(target), XmlWith("linked"));
}

TEST_F(PreferenceFilesTest, TakesALinkToNowhereForAnEmptyDomain) {
  fs::create_directories(folder);
  fs::create_symlink(temporary.path() / "nowhere", file);
  EXPECT_FALSE(stored("key"));
  ASSERT_TRUE(canWrite());
  EXPECT_FALSE(fs::exists(temporary.path() / "nowhere"));
  fs::remove(file);
  fs::create_symlink(file, file);
  EXPECT_FALSE(stored("key"));
  EXPECT_TRUE(canWrite());
}

TEST_F(PreferenceFilesTest, LogsACorruptFileOnceAndReadsItAsEmpty) {
  WriteFile(file, "this is no property list");
  PreferenceFiles files = store();
  for (int i = 0; i < 3; ++i) {
    EXPECT_TRUE(files.synchronize(domain));
    EXPECT_FALSE(files.copyValue("key", domain));
  }
  const auto lines = log.takeLines();
  ASSERT_EQ(lines.size(), 1U);
  EXPECT_EQ(lines[0].first, LogPriority::kError);
  EXPECT_EQ(lines[0].second.find("Preferences file " + file.string() + " is corrupt: "), 0U);
}

TEST_F(PreferenceFilesTest, KeepsACorruptFileAsideWhenItIsWritten) {
  WriteFile(file, "first");
  ASSERT_TRUE(canWrite());
  EXPECT_EQ(ReadFile(folder / "com.zarvo.carrier.plist.corrupt-1"), "first");
  for (int i = 2; i <= 9; ++i) {
    WriteFile(file, "again " + std::to_string(i));
    ASSERT_TRUE(canWrite());
  }
  EXPECT_EQ(NamesIn(folder),
            (std::set<std::string>{"com.zarvo.carrier.plist", "com.zarvo.carrier.plist.corrupt-1",
                                   "com.zarvo.carrier.plist.corrupt-2",
                                   "com.zarvo.carrier.plist.corrupt-3",
                                   "com.zarvo.carrier.plist.corrupt-4"}));
  EXPECT_EQ(ReadFile(folder / "com.zarvo.carrier.plist.corrupt-1"), "first");
  EXPECT_EQ(ReadFile(folder / "com.zarvo.carrier.plist.corrupt-4"), "again 4");
}

TEST_F(PreferenceFilesTest, TakesEmptyTornAndForeignFilesForCorrupt) {
  const std::string good = XmlWith("value");
  for (const std::string& text :
       {std::string(), good.substr(0, good.size() / 2), std::string(4096, '\0'),
        std::string("<plist version=\"1.0\"><array/></plist>"),
        std::string(platform::StoredPreferenceLimits().bytes + 1, ' ')}) {
    fs::remove_all(folder);
    WriteFile(file, text);
    EXPECT_FALSE(stored("key"));
    EXPECT_TRUE(canWrite());
    EXPECT_EQ(fs::file_size(folder / "com.zarvo.carrier.plist.corrupt-1"), text.size());
  }
}

TEST_F(PreferenceFilesTest, WaitsForNoFifoAndOpensNoDevice) {
  fs::create_directories(folder);
  ASSERT_EQ(::mkfifo(file.c_str(), 0600), 0);
  EXPECT_FALSE(stored("key"));
  EXPECT_TRUE(canWrite());
  fs::remove(file);
  fs::create_symlink("/dev/zero", file);
  EXPECT_FALSE(stored("key"));
  EXPECT_TRUE(canWrite());
  fs::remove(file);
  fs::create_directory(file);
  WriteFile(file / "inside", "kept");
  EXPECT_FALSE(stored("key"));
  EXPECT_TRUE(canWrite());
  EXPECT_EQ(ReadFile(folder / "com.zarvo.carrier.plist.corrupt-3/inside"), "kept");
}

TEST_F(PreferenceFilesTest, HasNothingToRemoveWhereNoRegularFileStands) {
  fs::create_directories(folder);
  const std::vector<std::function<void()>> obstacles{
      [&] { ASSERT_EQ(::mkfifo(file.c_str(), 0600), 0); },
      [&] { ASSERT_EQ(::mknod(file.c_str(), S_IFSOCK | 0600, 0), 0); },
      [&] { fs::create_symlink("/dev/zero", file); },
      [&] { fs::create_symlink(file, file); },
      [&] { fs::create_symlink("/dev/null/nowhere", file); },
      [&] { fs::create_directory(file); },
  };
  for (const auto& putInPlace : obstacles) {
    putInPlace();
    ASSERT_TRUE(fs::exists(fs::symlink_status(file)));
    PreferenceFiles files = store();
    files.setValue("key", std::nullopt, domain);
    EXPECT_TRUE(files.synchronize(domain));
    EXPECT_FALSE(files.copyValue("other", domain));
    for (const auto& [priority, line] : log.takeLines()) {
      EXPECT_EQ(line.find("Preferences file " + file.string() + " is corrupt: "), 0U) << line;
    }
    EXPECT_TRUE(files.synchronize(domain));
    EXPECT_TRUE(log.takeLines().empty());
    fs::remove(file);
  }
}

TEST_F(PreferenceFilesTest, RemovesWhatADeadWriterLeftBehind) {
  WriteFile(folder / ".com.zarvo.carrier.plist.tmp", "half");
  ASSERT_TRUE(canWrite());
  EXPECT_EQ(NamesIn(folder), std::set<std::string>{"com.zarvo.carrier.plist"});
}

TEST_F(PreferenceFilesTest, StoresAValueAtTheDepthLimitAndDropsADeeperOne) {
  const auto nested = [](std::size_t count) {
    PropertyList value{PropertyList::Array{}};
    while (--count > 0) {
      PropertyList::Array outer;
      outer.push_back(std::move(value));
      value = PropertyList(std::move(outer));
    }
    return value;
  };
  const std::size_t deepest = platform::PropertyListLimits{}.depth;
  PreferenceFiles files = store();
  files.setValue("key", nested(deepest), domain);
  EXPECT_TRUE(files.synchronize(domain));
  EXPECT_EQ(stored("key"), nested(deepest));
  EXPECT_TRUE(log.takeLines().empty());

  files.setValue("key", nested(deepest + 1), domain);
  EXPECT_FALSE(files.synchronize(domain));
  EXPECT_EQ(log.takeLines().size(), 1U);
  EXPECT_EQ(files.copyValue("key", domain), nested(deepest));
  files.setValue("key", "shallow", domain);
  EXPECT_TRUE(files.synchronize(domain));
}

TEST_F(PreferenceFilesTest, StoresEveryValueThatIsAsLargeAsAValueMayBe) {
  const platform::PropertyListLimits limits;
  const auto most = platform::SerializeBinary(PropertyList::Array(limits.nodes - 1, true));
  const auto longest = platform::SerializeBinary(PropertyList::Data(limits.bytes - 64));
  ASSERT_TRUE(most && longest);
  // All of it ASCII but for one letter: twice as long in the binary form.
  const std::string_view head = "<plist version=\"1.0\"><string>\xC3\xA9";
  const std::string_view tail = "</string></plist>";
  std::string text(head);
  text.resize(limits.bytes - tail.size(), 'a');
  text += tail;
  for (const auto bytes : {std::span(*most), std::span(*longest), std::as_bytes(std::span(text))}) {
    const auto value = platform::ParsePropertyList(bytes);
    ASSERT_TRUE(value);
    fs::remove_all(folder);
    PreferenceFiles files = store();
    const std::string key(255, 'k');
    files.setValue(key, value, domain);
    EXPECT_TRUE(files.synchronize(domain));
    EXPECT_TRUE(stored(key) == value);
  }
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(PreferenceFilesTest, DropsAChangeThatWouldOutgrowTheFile) {
  PreferenceFiles files = store();
  files.setValue("small", 1, domain);
  ASSERT_TRUE(files.synchronize(domain));
  files.setValue("large", PropertyList::Data(platform::StoredPreferenceLimits().bytes), domain);
  EXPECT_FALSE(files.synchronize(domain));
  EXPECT_EQ(log.takeLines().size(), 1U);
  EXPECT_TRUE(files.synchronize(domain));
  EXPECT_EQ(stored("small"), PropertyList(1));
  EXPECT_FALSE(stored("large"));
}

TEST_F(PreferenceFilesTest, ServesALargeFileAgainAndAgain) {
  PreferenceFiles files = store();
  const PropertyList large(PropertyList::Data(std::size_t{4} << 20, std::byte{1}));
  files.setValue("large", large, domain);
  ASSERT_TRUE(files.synchronize(domain));
  for (int i = 0; i < 3; ++i) EXPECT_EQ(files.copyValue("large", domain), large);
  files.setValue("small", 1, domain);
  ASSERT_TRUE(files.synchronize(domain));
  EXPECT_EQ(stored("large"), large);
}

TEST_F(PreferenceFilesTest, KeepsNoLargeDomainInMemoryOnceItIsWritten) {
  PreferenceFiles files = store();
  const PropertyList large = ManyTexts();
  const std::ptrdiff_t before = support::LiveAllocations();
  for (int i = 0; i < 8; ++i) {
    const PreferenceDomain each{"com.zarvo." + std::to_string(i)};
    files.setValue("large", large, each);
    ASSERT_TRUE(files.synchronize(each));
  }
  EXPECT_LT(support::LiveAllocations() - before, std::ptrdiff_t{kManyTexts});
}

TEST_F(PreferenceFilesTest, KeepsOneLargeDomainAtMostForTheCopyThatFollows) {
  for (int i = 0; i < 8; ++i) {
    PreferenceFiles files = store();
    const PreferenceDomain each{"com.zarvo." + std::to_string(i)};
    files.setValue("large", ManyTexts(), each);
    ASSERT_TRUE(files.synchronize(each));
  }
  PreferenceFiles files = store();
  const std::ptrdiff_t before = support::LiveAllocations();
  for (int i = 0; i < 8; ++i) {
    ASSERT_TRUE(files.synchronize(PreferenceDomain{"com.zarvo." + std::to_string(i)}));
  }
  EXPECT_LT(support::LiveAllocations() - before, std::ptrdiff_t{2} * kManyTexts);
  EXPECT_EQ(files.copyValue("large", {"com.zarvo.7"}), ManyTexts());
  EXPECT_LT(support::LiveAllocations() - before, std::ptrdiff_t{kManyTexts});
}

TEST_F(PreferenceFilesTest, RemembersManyDomains) {
  PreferenceFiles files = store();
  for (int i = 0; i < 200; ++i) files.setValue("key", i, {"com.zarvo." + std::to_string(i)});
  for (int i = 0; i < 200; ++i) {
    EXPECT_EQ(files.copyValue("key", {"com.zarvo." + std::to_string(i)}), PropertyList(i));
  }
  for (int i = 0; i < 200; ++i) {
    EXPECT_TRUE(files.synchronize(PreferenceDomain{"com.zarvo." + std::to_string(i)}));
  }
  for (int i = 0; i < 200; ++i) {
    EXPECT_EQ(files.copyValue("key", {"com.zarvo." + std::to_string(i)}), PropertyList(i));
  }
}

TEST_F(PreferenceFilesTest, HasNothingForAUserWithoutAHome) {
  PreferenceFiles files({"", temporary.path(), "host"});
  EXPECT_FALSE(files.copyValue("key", domain));
  files.setValue("key", 1, domain);
  EXPECT_FALSE(files.synchronize(domain));
  EXPECT_EQ(log.takeLines().size(), 1U);
  EXPECT_EQ(files.copyValue("key", domain), PropertyList(1));
}

TEST_F(PreferenceFilesTest, DropsAChangeWhenTooMuchAlreadyWaitsToBeWritten) {
  PreferenceFiles files({"", temporary.path(), "host"});
  const PropertyList large(PropertyList::Data(std::size_t{15} << 20, std::byte{1}));
  for (int i = 0; i < 8; ++i) {
    const PreferenceDomain each{"com.zarvo." + std::to_string(i)};
    files.setValue("large", large, each);
    EXPECT_FALSE(files.synchronize(each));
    const bool waits = i < 4;
    EXPECT_EQ(files.copyValue("large", each).has_value(), waits) << i;
    const auto lines = log.takeLines();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].second.ends_with("; the change is dropped"), !waits) << lines[0].second;
  }
  const PreferenceDomain first{"com.zarvo.0"};
  EXPECT_EQ(files.copyValue("large", first), large);
  files.setValue("large", std::nullopt, first);
  files.setValue("small", 1, domain);
  EXPECT_FALSE(files.synchronize(domain));
  EXPECT_EQ(files.copyValue("small", domain), PropertyList(1)) << "there is room again";
}

TEST(SystemPreferenceRoots, FollowTheUserDatabase) {
  const platform::PreferenceRoots roots = platform::SystemPreferenceRoots();
  passwd entry{};
  passwd* found = nullptr;
  std::vector<char> buffer(65'536);
  ASSERT_EQ(::getpwuid_r(::geteuid(), &entry, buffer.data(), buffer.size(), &found), 0);
  if (found == nullptr) GTEST_SKIP() << "this user is not in the user database";
  EXPECT_EQ(roots.currentUser, std::string(found->pw_dir) + "/Library/Preferences");
  EXPECT_EQ(roots.anyUser, "/Library/Preferences");
  EXPECT_FALSE(roots.host.empty());
}

}  // namespace
