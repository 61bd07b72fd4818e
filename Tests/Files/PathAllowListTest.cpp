// SPDX-License-Identifier: Apache-2.0
//
// What the two predicates write to the log. The home is the one that this system's user database
// gives, so the tests use the absolute half and read the home's own directory.
#include "Helper/Files/PathAllowList.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "Helper/Files/MobileUser.h"
#include "Tests/Fakes/FakeDirectoryEntries.h"
#include "Tests/Fakes/FakeSystemLog.h"
#include "Tests/Files/PathRefusal.h"

namespace {

using files_test::kSystemBundles;
using files_test::RefusalOf;
using files_test::UserBundles;
using platform::LogPriority;
using Lines = std::vector<fakes::FakeSystemLog::Line>;

constexpr char kBundle[] = "/private/var/mobile/Library/Carrier Bundle.bundle";

class PathAllowList : public ::testing::Test {
 protected:
  fakes::FakeSystemLog log;
  platform::ScopedReplacement<platform::SystemLog> logReplacement{log};
  fakes::FakeDirectoryEntries entries;
  platform::ScopedReplacement<platform::DirectoryEntries> entriesReplacement{entries};
};

TEST_F(PathAllowList, LogsTheEntryThatAllowsALink) {
  EXPECT_TRUE(IsAllowedLinkPath(kBundle));
  EXPECT_EQ(
      log.takeLines(),
      (Lines{{LogPriority::kInfo, std::string(kBundle) + " is within allowed path " + kBundle}}));
}

TEST_F(PathAllowList, LogsNothingWhenItRefusesALink) {
  EXPECT_FALSE(IsAllowedLinkPath("/etc/passwd"));
  entries.put(kBundle, S_IFDIR | 0755);
  EXPECT_FALSE(IsAllowedLinkPath(kBundle));
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(PathAllowList, AllowsALinkWhereAFileOrLinkStands) {
  for (const mode_t type : {S_IFREG, S_IFLNK}) {
    entries.put(kBundle, type | 0644);
    EXPECT_TRUE(IsAllowedLinkPath(kBundle));
  }
}

TEST_F(PathAllowList, LogsTheDirectoryThatAllowsAPath) {
  EXPECT_TRUE(IsAllowedPath((UserBundles() + "x").c_str()));
  EXPECT_TRUE(IsAllowedPath("/private/var/mobile/Library/Carrier BundlesX"));
  EXPECT_EQ(
      log.takeLines(),
      (Lines{{LogPriority::kInfo, "Allowing path " + UserBundles() + "x within " + UserBundles()},
             {LogPriority::kInfo,
              "Allowing path /private/var/mobile/Library/Carrier BundlesX within "
              "/private/var/mobile/Library/Carrier Bundles"}}));
}

TEST_F(PathAllowList, LogsTheEntryThatAllowsAPath) {
  EXPECT_TRUE(IsAllowedPath(kBundle));
  EXPECT_EQ(
      log.takeLines(),
      (Lines{{LogPriority::kInfo, std::string(kBundle) + " is within allowed path " + kBundle}}));
}

TEST_F(PathAllowList, LogsThreeErrorLinesWhenItRefusesAPath) {
  EXPECT_FALSE(IsAllowedPath("/etc/passwd"));
  EXPECT_EQ(log.takeLines(), RefusalOf("/etc/passwd"));
  EXPECT_FALSE(IsAllowedPath(""));
  EXPECT_EQ(log.takeLines(), RefusalOf(""));
}

TEST_F(PathAllowList, LogsTheSameThreeLinesWhenItAllowsAPackage) {
  EXPECT_TRUE(IsAllowedPath("/tmp/update.tcbk"));
  EXPECT_EQ(log.takeLines(), RefusalOf("/tmp/update.tcbk"));
}

TEST_F(PathAllowList, ChangesNothingOnDisk) {
  (void)IsAllowedPath("/tmp/update.tcbk");
  (void)IsAllowedLinkPath(kBundle);
  EXPECT_EQ(entries.changes(), 0);
}

}  // namespace
