// SPDX-License-Identifier: Apache-2.0
//
// What the telephony daemon is told, and how.
#include "Helper/LASD/LASDNotification.h"

#include <gtest/gtest.h>

#include <string_view>

#include "Tests/Fakes/FakeMessagePorts.h"
#include "Tests/Fakes/FakeSystemLog.h"

namespace {

using platform::PropertyList;
using enum LASDNotificationKind;

constexpr char kPort[] = "com.zarvo.Halvec.lasd";

constexpr LASDDatabaseType kNoType{};

TEST(LASDDatabaseType, HasItsBitAndItsText) {
  EXPECT_STREQ(typeName(LASDDatabaseType{1}), "umts");
  EXPECT_STREQ(typeName(LASDDatabaseType{2}), "cdma");
  EXPECT_STREQ(typeName(LASDDatabaseType{4}), "lte");
  EXPECT_STREQ(typeName(LASDDatabaseType{8}), "gsm");
  EXPECT_STREQ(typeName(LASDDatabaseType{16}), "scdma");
  for (const int value : {0, 3, 5, 15, 17, 31, 32, -1}) {
    EXPECT_STREQ(typeName(LASDDatabaseType{value}), "unknown") << value;
  }
  EXPECT_EQ(BitOf(LASDDatabaseType::kScdma), 16U);
}

TEST(LASDDatabaseType, ComesGsmFirstAndThenAscending) {
  std::vector<int> order;
  for (const LASDDatabaseType type : kLASDTypesInOrder) order.push_back(static_cast<int>(type));
  EXPECT_EQ(order, (std::vector{8, 1, 2, 4, 16}));
}

TEST(LASDNotification, OfAnInstalledDatabaseNamesItsType) {
  for (const LASDDatabaseType type : kLASDTypesInOrder) {
    const PropertyList notification = makeNotification(kUpdateAvailable, type);
    ASSERT_EQ(notification.dictionary()->size(), 2U);
    EXPECT_EQ(notification.dictionary()->begin()->key, "Notification");
    EXPECT_EQ(*notification.find("Notification"), PropertyList("com.zarvo.lasd.UpdateAvailable"));
    EXPECT_EQ(*notification.find("DBType"), PropertyList(typeName(type)));
  }
}

TEST(LASDNotification, OfAnyOtherOutcomeHasTheNameAlone) {
  for (const LASDDatabaseType type : {kNoType, LASDDatabaseType::kCdma}) {
    EXPECT_EQ(makeNotification(kNoUpdateRequired, type), (PropertyList([] {
                PropertyList::Dictionary only;
                only.set("Notification", "com.zarvo.lasd.NoUpdateRequired");
                return only;
              }())));
    const PropertyList failed = makeNotification(kUpdateFailed, type);
    EXPECT_EQ(failed.dictionary()->size(), 1U);
    EXPECT_EQ(*failed.find("Notification"), PropertyList("com.zarvo.lasd.UpdateFailed"));
  }
}

TEST(LASDNotification, HasTheValuesThatTheDaemonKnows) {
  EXPECT_EQ(static_cast<std::uint32_t>(kUpdateAvailable), 0U);
  EXPECT_EQ(static_cast<std::uint32_t>(kNoUpdateRequired), 1U);
  EXPECT_EQ(static_cast<std::uint32_t>(kUpdateFailed), 2U);
}

class Sending : public testing::Test {
 protected:
  fakes::FakeMessagePorts ports;
  platform::ScopedReplacement<platform::MessagePorts> portsReplacement{ports};
  fakes::FakeSystemLog log;
  platform::ScopedReplacement<platform::SystemLog> logReplacement{log};
};

TEST_F(Sending, IsOneMessageWithId0AndABinaryPropertyList) {
  ports.publish(kPort);
  sendNotification(makeNotification(kNoUpdateRequired));
  const auto message = ports.take(kPort);
  EXPECT_EQ(message.id, 0);
  // One dictionary of one pair: the object table, the offsets, the trailer.
  constexpr std::string_view kBytes(
      "bplist00\xd1\x01\x02\\Notification_\x10\x1f"
      "com.zarvo.lasd.NoUpdateRequired"
      "\x08\x0b\x18\0\0\0\0\0\0\x01\x01\0\0\0\0\0\0\0\x03\0\0\0\0\0\0\0\0\0\0\0\0\0\0\0:",
      8 + 3 + 13 + 3 + 31 + 3 + 32);
  EXPECT_EQ(std::string_view(reinterpret_cast<const char*>(message.payload.data()),
                             message.payload.size()),
            kBytes);
  EXPECT_TRUE(ports.isEmpty(kPort));
}

TEST_F(Sending, ToNobodyIsSkippedWithoutAWord) {
  sendNotification(makeNotification(kUpdateFailed));
  ports.publish(kPort);
  EXPECT_TRUE(ports.isEmpty(kPort));
  EXPECT_TRUE(log.takeLines().empty());
}

TEST_F(Sending, ToADaemonThatDoesNotReadLosesMessagesAndDoesNotWait) {
  ports.publish(kPort);
  for (int round = 0; round < 100; ++round) sendNotification(makeNotification(kUpdateFailed));
  EXPECT_TRUE(log.takeLines().empty());
  (void)ports.take(kPort);
  sendNotification(makeNotification(kNoUpdateRequired));
  for (std::size_t waiting = 1; waiting < fakes::FakeMessagePorts::kQueueLimit; ++waiting) {
    (void)ports.take(kPort);
  }
  EXPECT_FALSE(ports.isEmpty(kPort)) << "the one that found room";
}

TEST_F(Sending, OfWhatCannotBeSerializedIsSkipped) {
  ports.publish(kPort);
  PropertyList::Dictionary notUtf8;
  notUtf8.set("Notification", "\xff");
  sendNotification(notUtf8);
  EXPECT_TRUE(ports.isEmpty(kPort));
}

}  // namespace
