// SPDX-License-Identifier: Apache-2.0
//
// The rules about paths against a list typed by hand.
#include "Helper/Platform/PathRules.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <string>
#include <vector>

namespace {

using platform::FindWithin;
using platform::PathRule;
using platform::PathRules;
using platform::PathVerdict;

const std::vector<std::string> kEntries{
    "/home/m/Library/Preferences/com.zarvo.carrier.plist",
    "/home/m/Library/Preferences/com.zarvo.carrier.plist",
    "/home/m/Library/Preferences/com.zarvo.operator.plist",
    "/home/m/Library/Preferences/com.zarvo.carrier.default.plist",
    "/home/m/Library/Preferences/com.zarvo.carrier.bootstrap.plist",
    "/home/m/Library/Carrier Bundle.bundle",
    "/home/m/Library/Carrier2Bundle.bundle",
    "/home/m/Library/Operator Bundle.bundle",
    "/home/m/Library/CarrierDefault.bundle",
    "/home/m/Library/CarrierBootstrap.bundle",
    "/private/var/mobile/Library/Preferences/com.zarvo.carrier.plist",
    "/private/var/mobile/Library/Preferences/com.zarvo.carrier_2.plist",
    "/private/var/mobile/Library/Preferences/com.zarvo.operator.plist",
    "/private/var/mobile/Library/Preferences/com.zarvo.carrier.default.plist",
    "/private/var/mobile/Library/Preferences/com.zarvo.carrier.bootstrap.plist",
    "/private/var/mobile/Library/Carrier Bundle.bundle",
    "/private/var/mobile/Library/Carrier2Bundle.bundle",
    "/private/var/mobile/Library/Operator Bundle.bundle",
    "/private/var/mobile/Library/CarrierDefault.bundle",
    "/private/var/mobile/Library/CarrierBootstrap.bundle"};

class PathRule_ : public ::testing::Test {
 protected:
  PathVerdict link(const std::string& path) {
    return rules.judgeLink(path.c_str(), [this](const char*) { return mode; });
  }
  PathVerdict judge(const std::string& path) {
    return rules.judge(path.c_str(), [this](const char*) {
      ++questions;
      return mode;
    });
  }
  PathRules rules{"/home/m"};
  std::optional<mode_t> mode;
  int questions = 0;
};
using LinkPath = PathRule_;
using Path = PathRule_;

TEST_F(LinkPath, ListHoldsItsTwentyEntriesInOrder) {
  EXPECT_EQ((std::vector<std::string>(rules.entries().begin(), rules.entries().end())), kEntries);
}

TEST_F(LinkPath, IsAllowedForEveryEntryAndNamesIt) {
  for (const std::string& entry : kEntries) {
    const PathVerdict verdict = link(entry);
    EXPECT_TRUE(verdict.allowed) << entry;
    EXPECT_EQ(verdict.rule, PathRule::kFixedEntry);
    EXPECT_EQ(verdict.place, entry);
  }
}

TEST_F(LinkPath, OfTheSecondCarrierIsAllowedInTheAbsoluteHalfOnly) {
  EXPECT_TRUE(link("/private/var/mobile/Library/Preferences/com.zarvo.carrier_2.plist").allowed);
  EXPECT_FALSE(link("/home/m/Library/Preferences/com.zarvo.carrier_2.plist").allowed);
  const PathRules absolute("/private/var/mobile");
  EXPECT_TRUE(absolute
                  .judgeLink("/private/var/mobile/Library/Preferences/com.zarvo.carrier_2.plist",
                             [](const char*) { return std::nullopt; })
                  .allowed);
}

TEST_F(LinkPath, MustBeExactlyTheEntry) {
  for (const char* path :
       {"/private/var/mobile/Library/Carrier Bundle.bundle/",
        "/private/var/mobile/Library/Carrier Bundle.bundle/x",
        "/private/var/mobile/Library//Carrier Bundle.bundle",
        "/private/var/mobile/Library/./Carrier Bundle.bundle",
        "/private/var/mobile/Library/carrier bundle.bundle",
        "/private/var/mobile/Library/Carrier Bundle.bundl", "", "/", "Carrier Bundle.bundle"}) {
    const PathVerdict verdict = link(path);
    EXPECT_FALSE(verdict.allowed) << path;
    EXPECT_EQ(verdict.rule, PathRule::kUnlisted) << path;
  }
}

TEST_F(LinkPath, IsRefusedWhereADirectoryOrFifoStands) {
  for (const mode_t type : {S_IFDIR, S_IFIFO}) {
    mode = type | 0777;
    const PathVerdict verdict = link(kEntries[15]);
    EXPECT_FALSE(verdict.allowed);
    EXPECT_EQ(verdict.rule, PathRule::kOccupied);
  }
}

TEST_F(LinkPath, IsAllowedWhereAnyOtherTypeStands) {
  for (const mode_t type : {S_IFREG, S_IFLNK, S_IFSOCK, S_IFBLK, S_IFCHR}) {
    mode = type;
    EXPECT_TRUE(link(kEntries[15]).allowed) << std::oct << type;
  }
}

TEST_F(LinkPath, ComparesAtMost1024Bytes) {
  const std::string home(1100, 'h');
  const PathRules longRules(home);
  const auto nothing = [](const char*) { return std::nullopt; };
  EXPECT_TRUE(longRules.judgeLink(home.c_str(), nothing).allowed);
  EXPECT_TRUE(longRules.judgeLink(home.substr(0, 1024).c_str(), nothing).allowed);
  EXPECT_FALSE(longRules.judgeLink(home.substr(0, 1023).c_str(), nothing).allowed);
}

TEST_F(Path, InTheUserBundlesIsAllowedWithItsSlashOnly) {
  for (const char* path : {"/home/m/Library/Carrier Bundles/", "/home/m/Library/Carrier Bundles/a",
                           "/home/m/Library/Carrier Bundles/../../.ssh"}) {
    const PathVerdict verdict = judge(path);
    EXPECT_TRUE(verdict.allowed) << path;
    EXPECT_EQ(verdict.rule, PathRule::kUserBundles);
    EXPECT_STREQ(verdict.place, "/home/m/Library/Carrier Bundles/");
    EXPECT_FALSE(verdict.reachedPackageRule);
  }
  EXPECT_FALSE(judge("/home/m/Library/Carrier Bundles").allowed);
  EXPECT_FALSE(judge("/home/m/Library/Carrier BundlesX").allowed);
  EXPECT_FALSE(judge("x/home/m/Library/Carrier Bundles/a").allowed) << "not at the start";
}

TEST_F(Path, InTheSystemBundlesIsAllowedWithoutASlash) {
  for (const char* path : {"/private/var/mobile/Library/Carrier Bundles",
                           "/private/var/mobile/Library/Carrier BundlesX",
                           "/private/var/mobile/Library/Carrier Bundles/a/b"}) {
    const PathVerdict verdict = judge(path);
    EXPECT_TRUE(verdict.allowed) << path;
    EXPECT_EQ(verdict.rule, PathRule::kSystemBundles);
    EXPECT_STREQ(verdict.place, "/private/var/mobile/Library/Carrier Bundles");
  }
  EXPECT_FALSE(judge("/private/var/mobile/Library/Carrier Bundle").allowed);
}

TEST_F(Path, OfTheUserBundlesWithoutSlashIsAllowedWhenTheHomeIsTheSystemOne) {
  const PathRules absolute("/private/var/mobile");
  const auto nothing = [](const char*) { return std::nullopt; };
  EXPECT_EQ(absolute.judge("/private/var/mobile/Library/Carrier Bundles", nothing).rule,
            PathRule::kSystemBundles);
  EXPECT_EQ(absolute.judge("/private/var/mobile/Library/Carrier Bundles/", nothing).rule,
            PathRule::kUserBundles)
      << "the user directory is asked first";
}

TEST_F(Path, InABundlesDirectoryIsNotLookedAtOnDisk) {
  mode = S_IFDIR;
  EXPECT_TRUE(judge("/home/m/Library/Carrier Bundles/a").allowed);
  EXPECT_EQ(questions, 0);
  (void)judge("/tmp/a.tcbk");
  EXPECT_EQ(questions, 1);
}

TEST_F(Path, OnTheListIsAllowed) {
  for (const std::string& entry : kEntries) {
    const PathVerdict verdict = judge(entry);
    EXPECT_TRUE(verdict.allowed);
    EXPECT_EQ(verdict.rule, PathRule::kFixedEntry);
    EXPECT_FALSE(verdict.reachedPackageRule);
  }
}

TEST_F(Path, OfAPackageBelowTmpIsAllowedByTextAlone) {
  for (const char* path : {"/tmp/update.tcbk", "/tmp.tcbk", "/tmpdir/x.tcbk", "/tmp/.tcbk",
                           "/tmp/../private/etc/x.tcbk"}) {
    const PathVerdict verdict = judge(path);
    EXPECT_TRUE(verdict.allowed) << path;
    EXPECT_EQ(verdict.rule, PathRule::kPackage);
    EXPECT_TRUE(verdict.reachedPackageRule);
  }
}

TEST_F(Path, OfNoPackageIsRefused) {
  for (const char* path :
       {"/tmp/a.tcbk/b.tcbk", "/tmp/x.TCBK", "/var/tmp/x.tcbk", "/tmp/x.tcbk/", "/tmp/x.tcbkk",
        "/tmp", "/tmp/", "/tmp/tcbk", "tmp/x.tcbk", " /tmp/x.tcbk", "/etc/passwd", ""}) {
    const PathVerdict verdict = judge(path);
    EXPECT_FALSE(verdict.allowed) << path;
    EXPECT_EQ(verdict.rule, PathRule::kUnlisted);
    EXPECT_TRUE(verdict.reachedPackageRule);
  }
}

TEST_F(Path, OfAPackageIsAllowedEvenWhereADirectoryStands) {
  mode = S_IFDIR | 0755;
  EXPECT_TRUE(judge("/tmp/update.tcbk").allowed);
  EXPECT_EQ(judge("/tmp/update").rule, PathRule::kOccupied);
}

TEST_F(Path, IsSearchedForAPackagesNameInItsFirst1024BytesOnly) {
  const std::string inside = "/tmp/" + std::string(1014, 'x') + ".tcbk";
  ASSERT_EQ(inside.size(), 1024U);
  EXPECT_TRUE(judge(inside).allowed);
  EXPECT_FALSE(judge("/tmp/" + std::string(1015, 'x') + ".tcbk").allowed);
}

TEST(FindWithin, FindsWhatLiesEntirelyWithinTheLimit) {
  EXPECT_EQ(FindWithin("abcabc", "abc", 6), 0U);
  EXPECT_EQ(FindWithin("abcabc", "cab", 6), 2U);
  EXPECT_EQ(FindWithin("abcabc", "cab", 5), 2U);
  EXPECT_EQ(FindWithin("abcabc", "cab", 4), std::string_view::npos);
  EXPECT_EQ(FindWithin("abc", "abcd", 9), std::string_view::npos);
  EXPECT_EQ(FindWithin("", "a", 9), std::string_view::npos);
}

TEST(PathRulesOfAnEmptyHome, BeginAtTheRoot) {
  const PathRules rules("");
  const auto nothing = [](const char*) { return std::nullopt; };
  EXPECT_TRUE(rules.judge("/Library/Carrier Bundles/a", nothing).allowed);
  EXPECT_TRUE(rules.judgeLink("/Library/Preferences/com.zarvo.carrier.plist", nothing).allowed);
}

}  // namespace
