// SPDX-License-Identifier: Apache-2.0
//
// The mobile user: looked up once, and what the absence of each part means.
#include "Helper/Files/MobileUser.h"

#include <gtest/gtest.h>

#include <string>
#include <thread>
#include <vector>

#include "Helper/Platform/BundleIdentifiers.h"
#include "Helper/Platform/MobileUserRecord.h"
#include "Tests/Fakes/FakeUserDatabase.h"

namespace {

class MobileUser : public ::testing::Test {
 protected:
  fakes::FakeUserDatabase database;
  platform::ScopedReplacement<platform::UserDatabase> replacement{database};
  platform::MobileUserRecord record;
};

TEST_F(MobileUser, IsWhatTheDatabaseSaysOfTheNameMobile) {
  database.setHome("mobile", "/var/mobile");
  database.setIds("mobile", {.user = 501, .group = 502});
  EXPECT_STREQ(record.directory(), "/var/mobile");
  EXPECT_EQ(record.uid(), 501U);
  EXPECT_EQ(record.gid(), 502U);
}

TEST_F(MobileUser, IsLookedUpOnceAndKeepsItsPointer) {
  database.setHome("mobile", "/var/mobile");
  const char* first = record.directory();
  database.setHome("mobile", "/elsewhere");
  EXPECT_EQ(record.directory(), first);
  EXPECT_STREQ(first, "/var/mobile");
  (void)record.uid();
  (void)record.gid();
  EXPECT_EQ(database.homeQuestions(), 1);
  EXPECT_EQ(database.idQuestions(), 1);
}

TEST_F(MobileUser, IsLookedUpOnceByManyThreads) {
  database.setHome("mobile", "/var/mobile");
  database.setIds("mobile", {.user = 7, .group = 8});
  std::vector<std::thread> threads;
  threads.reserve(8);
  for (int i = 0; i < 8; ++i) {
    threads.emplace_back([this] {
      EXPECT_EQ(record.uid(), 7U);
      EXPECT_STREQ(record.directory(), "/var/mobile");
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(database.homeQuestions(), 1);
}

TEST_F(MobileUser, WithoutARecordHasNoHomeAndTheIdsOfRootForGood) {
  EXPECT_EQ(record.directory(), nullptr);
  EXPECT_EQ(record.uid(), 0U);
  EXPECT_EQ(record.gid(), 0U);
  database.setHome("mobile", "/var/mobile");
  database.setIds("mobile", {.user = 501, .group = 501});
  EXPECT_EQ(record.directory(), nullptr) << "a failed look-up is not repeated";
  EXPECT_EQ(record.uid(), 0U);
}

TEST_F(MobileUser, MayHaveIdsWithoutAHome) {
  database.setIds("mobile", {.user = 501, .group = 501});
  EXPECT_EQ(record.directory(), nullptr);
  EXPECT_EQ(record.uid(), 501U);
}

TEST(MobileUserFunctions, AnswerTheSameEveryTime) {
  EXPECT_EQ(GetMobileUserDirectory(), GetMobileUserDirectory());
  EXPECT_EQ(GetMobileUserUID(), platform::MobileUser().uid());
  EXPECT_EQ(GetMobileUserGID(), platform::MobileUser().gid());
}

TEST(UserDatabase, KnowsRootsHomeAndIds) {
  auto& database = platform::DefaultProvider<platform::UserDatabase>();
  const auto home = database.homeDirectory(platform::String("root"));
  ASSERT_TRUE(home);
  EXPECT_EQ(home->utf8(), "/root");
  const auto ids = database.ids("root");
  ASSERT_TRUE(ids);
  EXPECT_EQ(ids->user, 0U);
  EXPECT_EQ(ids->group, 0U);
}

TEST(UserDatabase, KnowsNothingOfAStranger) {
  auto& database = platform::DefaultProvider<platform::UserDatabase>();
  EXPECT_FALSE(database.homeDirectory(platform::String("no-such-user-here")));
  EXPECT_FALSE(database.ids("no-such-user-here"));
}

TEST(ExportedConstants, HaveTheirValues) {
  EXPECT_EQ(kCarrierBundleId.utf8(), "com.zarvo.carrier");
  EXPECT_EQ(kOperatorBundleId.utf8(), "com.zarvo.operator");
  EXPECT_EQ(kBootstrapBundleId.utf8(), "com.zarvo.carrier.bootstrap");
  EXPECT_EQ(kDefaultBundleId.utf8(), "com.zarvo.carrier.default");
  EXPECT_STREQ(kPlistExtension, ".plist");
  EXPECT_STREQ(kUserCBDir, "/Library/Carrier Bundles/");
  EXPECT_EQ(kVLPostponementInfoICCID.utf8(), "IntegratedCircuitCardIdentity");
  EXPECT_EQ(kVLPostponementInfoIMSI.utf8(), "InternationalMobileSubscriberIdentity");
  EXPECT_EQ(kVLPostponementInfoCarrierID.utf8(), "CarrierID");
}

}  // namespace
