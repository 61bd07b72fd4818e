// SPDX-License-Identifier: Apache-2.0
//
// The three link requests over real ports, on fake directory entries and a fake preferences store.
#include "Helper/Files/MobileUser.h"
#include "Tests/Fakes/FakeDirectoryEntries.h"
#include "Tests/Fakes/FakePreferencesStore.h"
#include "Tests/Files/PathRefusal.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using files_test::RefusalOf;
using platform::LogPriority;
using platform::PreferenceDomain;
using platform::UserScope;
using support::Bytes;
using support::Get;
using Lines = std::vector<fakes::FakeSystemLog::Line>;

constexpr char kLibrary[] = "/private/var/mobile/Library";
constexpr char kBundle[] = "/private/var/mobile/Library/Carrier Bundle.bundle";
constexpr char kBundles[] = "/private/var/mobile/Library/Carrier Bundles";
constexpr char kDomain[] = "com.zarvo.carrier";

class CarrierBundleLinks : public support::ServerFixture {
 protected:
  void SetUp() override {
    start();
    client = connect();
    for (const char* folder : {kLibrary, kBundles, "/tmp"}) entries.put(folder, S_IFDIR | 0755);
    for (const UserScope user : {UserScope::kCurrentUser, UserScope::kAnyUser}) {
      store.setValue("key", platform::PropertyList(1), {.identifier = kDomain, .user = user});
    }
  }
  std::int32_t ask(std::int32_t id, const std::vector<std::string>& texts) {
    Bytes bytes = support::Message(id, static_cast<std::uint32_t>(32 + 1024 * texts.size()));
    for (std::size_t i = 0; i < texts.size(); ++i) {
      support::PutText(bytes, 32 + 1024 * i, texts[i]);
    }
    const Bytes reply = request(*client, bytes).bytes;
    EXPECT_EQ(reply.size(), 36U);
    return Get<std::int32_t>(reply, 32);
  }
  std::int32_t setLink(const std::string& target, const std::string& path,
                       const std::string& domain = kDomain) {
    return ask(8683558, {target, path, domain});
  }
  std::int32_t createLink(const std::string& target, const std::string& path) {
    return ask(8683559, {target, path});
  }
  std::int32_t removeLink(const std::string& path, const std::string& domain = kDomain) {
    return ask(8683560, {path, domain});
  }
  /// A pending change is part of the cached copy, and goes with it.
  bool isFlushed(UserScope user = UserScope::kAnyUser) {
    return !store.copyValue("key", PreferenceDomain{.identifier = kDomain, .user = user});
  }

  fakes::FakePreferencesStore store;
  platform::ScopedReplacement<platform::PreferencesStore> storeReplacement{store};
  fakes::FakeDirectoryEntries entries;
  platform::ScopedReplacement<platform::DirectoryEntries> entriesReplacement{entries};
  std::unique_ptr<support::WireClient> client;
};

TEST_F(CarrierBundleLinks, SetReplacesALinkLogsItAndFlushesTheDomainForAnyUser) {
  ASSERT_EQ(createLink("old", kBundle), 0);
  EXPECT_EQ(setLink("new target", kBundle), 0);
  EXPECT_EQ(entries.linkAt(kBundle), "new target");
  EXPECT_TRUE(isFlushed(UserScope::kAnyUser));
  EXPECT_TRUE(isFlushed(UserScope::kCurrentUser)) << "any user means every user scope";
  EXPECT_EQ(
      log.takeLines(),
      (Lines{{LogPriority::kInfo, std::string(kBundle) + " is within allowed path " + kBundle},
             {LogPriority::kInfo,
              std::string("linkpath: ") + kBundle + ", domain: com.zarvo.carrier"}}));
}

TEST_F(CarrierBundleLinks, SetReplacesAFileAndMakesALinkWhereNothingStands) {
  EXPECT_EQ(setLink("a", kBundle), 0);
  entries.put(kBundle, S_IFREG | 0644);
  EXPECT_EQ(setLink("b", kBundle), 0);
  EXPECT_EQ(entries.linkAt(kBundle), "b");
}

TEST_F(CarrierBundleLinks, SetOnADirectoryAnswers8AndTouchesNothing) {
  entries.put(kBundle, S_IFDIR | 0755);
  EXPECT_EQ(setLink("target", kBundle), 8);
  EXPECT_EQ(entries.changes(), 0);
  EXPECT_FALSE(isFlushed());
  EXPECT_EQ(log.takeLines(),
            (Lines{{LogPriority::kError, std::string("Cannot remove symlink: ") + kBundle}}));
}

TEST_F(CarrierBundleLinks, SetElsewhereAnswers8EvenInTheBundlesDirectory) {
  for (const std::string path :
       {"/etc/passwd", "/tmp/update.tcbk", "/private/var/mobile/Library/Carrier Bundles/x"}) {
    EXPECT_EQ(setLink("target", path), 8);
    EXPECT_EQ(log.takeLines(), (Lines{{LogPriority::kError, "Cannot remove symlink: " + path}}));
  }
  EXPECT_EQ(entries.changes(), 0);
  EXPECT_FALSE(isFlushed());
}

TEST_F(CarrierBundleLinks, SetWithoutADomainMakesTheLinkShowsItAndFlushesNothing) {
  EXPECT_EQ(setLink("target", kBundle, ""), 0);
  EXPECT_EQ(entries.linkAt(kBundle), "target");
  EXPECT_FALSE(isFlushed());
  const Lines lines = log.takeLines();
  ASSERT_EQ(lines.size(), 2U);
  EXPECT_EQ(lines[1], (fakes::FakeSystemLog::Line{
                          LogPriority::kInfo, std::string("linkpath: ") + kBundle + ", domain: "}));
}

TEST_F(CarrierBundleLinks, SetThatCannotLinkAnswers5LogsNoLinkAndFlushesNothing) {
  entries.put(kBundle, S_IFREG | 0644);
  entries.refuseLinks();
  EXPECT_EQ(setLink("target", kBundle), 5);
  EXPECT_FALSE(entries.contains(kBundle)) << "what stood there is gone; there is no way back";
  EXPECT_FALSE(isFlushed());
  EXPECT_EQ(
      log.takeLines(),
      (Lines{{LogPriority::kInfo, std::string(kBundle) + " is within allowed path " + kBundle}}));
}

TEST_F(CarrierBundleLinks, SetWithADomainThatIsNotUtf8MakesTheLinkAndFlushesNothing) {
  EXPECT_EQ(setLink("target", kBundle, "\xff"), 0);
  EXPECT_EQ(entries.linkAt(kBundle), "target");
  EXPECT_FALSE(isFlushed());
  const Lines lines = log.takeLines();
  ASSERT_EQ(lines.size(), 2U);
  EXPECT_EQ(lines[1],
            (fakes::FakeSystemLog::Line{LogPriority::kInfo,
                                        std::string("linkpath: ") + kBundle + ", domain: \xff"}));
}

TEST_F(CarrierBundleLinks, SetDoesNotExamineTheTarget) {
  for (const std::string target : {"relative", "/absent", "../..", "/etc/shadow"}) {
    EXPECT_EQ(setLink(target, kBundle), 0);
    EXPECT_EQ(entries.linkAt(kBundle), target);
  }
}

TEST_F(CarrierBundleLinks, CreateAsksNobodyAndLogsNothing) {
  EXPECT_EQ(createLink("/etc/shadow", "/tmp/anywhere"), 0);
  EXPECT_EQ(entries.linkAt("/tmp/anywhere"), "/etc/shadow");
  EXPECT_EQ(createLink("other", "/tmp/anywhere"), 0) << "replaces a link";
  EXPECT_EQ(entries.linkAt("/tmp/anywhere"), "other");
  EXPECT_TRUE(log.takeLines().empty());
  EXPECT_FALSE(isFlushed());
}

TEST_F(CarrierBundleLinks, CreateThatCannotLinkAnswers5AndLogsNothing) {
  EXPECT_EQ(createLink("target", "/absent/link"), 5);
  entries.put("/tmp/full", S_IFDIR | 0755);
  entries.put("/tmp/full/file", S_IFREG | 0644);
  EXPECT_EQ(createLink("target", "/tmp/full"), 5) << "a directory with something in it stays";
  EXPECT_TRUE(entries.contains("/tmp/full/file"));
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(CarrierBundleLinks, CreateReplacesAnEmptyDirectory) {
  entries.put("/tmp/empty", S_IFDIR | 0755);
  EXPECT_EQ(createLink("target", "/tmp/empty"), 0);
  EXPECT_EQ(entries.linkAt("/tmp/empty"), "target");
}

TEST_F(CarrierBundleLinks, RemoveFlushesThenRemovesAnAllowedPath) {
  entries.put(kBundle, S_IFLNK | 0777);
  bool flushedBefore = false;
  entries.beforeRemoval = [&] { flushedBefore = isFlushed(); };
  EXPECT_EQ(removeLink(kBundle), 0);
  EXPECT_FALSE(entries.contains(kBundle));
  EXPECT_TRUE(flushedBefore);
  EXPECT_EQ(
      log.takeLines(),
      (Lines{{LogPriority::kNotice, "Removing domain: com.zarvo.carrier\n"},
             {LogPriority::kInfo, std::string(kBundle) + " is within allowed path " + kBundle}}));
}

TEST_F(CarrierBundleLinks, RemoveOfARefusedPathStillLogsAndFlushesTheDomainThenAnswers8) {
  entries.put("/etc/passwd", S_IFREG | 0644);
  EXPECT_EQ(removeLink("/etc/passwd"), 8);
  EXPECT_TRUE(isFlushed());
  EXPECT_TRUE(entries.contains("/etc/passwd"));
  Lines expected{{LogPriority::kNotice, "Removing domain: com.zarvo.carrier\n"}};
  const Lines refused = RefusalOf("/etc/passwd");
  expected.insert(expected.end(), refused.begin(), refused.end());
  EXPECT_EQ(log.takeLines(), expected);
}

TEST_F(CarrierBundleLinks, RemoveWithoutADomainLogsAndFlushesNone) {
  EXPECT_EQ(removeLink("/etc/passwd", ""), 8);
  EXPECT_FALSE(isFlushed());
  EXPECT_EQ(log.takeLines(), RefusalOf("/etc/passwd"));
}

TEST_F(CarrierBundleLinks, RemoveWithADomainThatIsNotUtf8LogsItAndFlushesNothing) {
  EXPECT_EQ(removeLink("/etc/passwd", "\xff"), 8);
  EXPECT_FALSE(isFlushed());
  EXPECT_EQ(log.takeLines().front(),
            (fakes::FakeSystemLog::Line{LogPriority::kNotice, "Removing domain: \xff\n"}));
}

TEST_F(CarrierBundleLinks, RemoveOfADirectoryWithSomethingInItAnswers5AndLeavesIt) {
  const std::string bundle = std::string(kBundles) + "/a";
  entries.put(bundle, S_IFDIR | 0755);
  entries.put(bundle + "/file", S_IFREG | 0644);
  EXPECT_EQ(removeLink(bundle, ""), 5);
  EXPECT_TRUE(entries.contains(bundle + "/file"));
  EXPECT_EQ(log.takeLines(),
            (Lines{{LogPriority::kInfo, "Allowing path " + bundle + " within " + kBundles}}));
}

TEST_F(CarrierBundleLinks, RemoveOfAMissingEntryAnswers5) { EXPECT_EQ(removeLink(kBundle, ""), 5); }

TEST_F(CarrierBundleLinks, RemoveOfAPackageBelowTmpAnswers0AfterTheThreeErrorLines) {
  entries.put("/tmp/update.tcbk", S_IFREG | 0644);
  EXPECT_EQ(removeLink("/tmp/update.tcbk", ""), 0);
  EXPECT_FALSE(entries.contains("/tmp/update.tcbk"));
  EXPECT_EQ(log.takeLines(), RefusalOf("/tmp/update.tcbk"));
}

TEST_F(CarrierBundleLinks, ReadAFieldWithoutItsZeroAsItsFirst1023Bytes) {
  const std::string full = "/tmp/" + std::string(1019, 'x');
  ASSERT_EQ(full.size(), 1024U);
  EXPECT_EQ(createLink(full, full), 0);
  EXPECT_EQ(entries.linkAt(full.substr(0, 1023)), full.substr(0, 1023));
  EXPECT_EQ(setLink(full, full, full), 8);
  EXPECT_EQ(log.takeLines(),
            (Lines{{LogPriority::kError, "Cannot remove symlink: " + full.substr(0, 1023)}}));
  EXPECT_EQ(setLink(full, kBundle, full), 0);
  EXPECT_EQ(entries.linkAt(kBundle), full.substr(0, 1023));
  EXPECT_EQ(
      log.takeLines().back(),
      (fakes::FakeSystemLog::Line{LogPriority::kInfo, std::string("linkpath: ") + kBundle +
                                                          ", domain: " + full.substr(0, 1023)}));
  EXPECT_EQ(removeLink(full, full), 8);
  Lines removal = RefusalOf(full.substr(0, 1023));
  removal.insert(removal.begin(),
                 {LogPriority::kNotice, "Removing domain: " + full.substr(0, 1023) + "\n"});
  EXPECT_EQ(log.takeLines(), removal);
}

}  // namespace
