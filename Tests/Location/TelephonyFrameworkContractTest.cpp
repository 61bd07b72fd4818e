// SPDX-License-Identifier: Apache-2.0
//
// What a telephony framework keeps to, run on the one in memory and on the one of sockets.
#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Helper/Platform/Linux/TelephonySockets.h"
#include "Helper/Platform/PropertyList.h"
#include "Tests/Fakes/FakeTelephonyFramework.h"
#include "Tests/Location/DaemonInTest.h"

namespace {

using platform::CivicInfoTexts;
using platform::PropertyList;
using platform::String;
using platform::TelephonyConnection;
using platform::TelephonyResult;

/// Both sides: the framework and, behind it, a daemon that the test commands.
class InMemory {
 public:
  platform::TelephonyFramework& framework() { return framework_; }
  void publish(bool published) { framework_.published = published; }
  /// Called for each connection before the call over it.
  void prepare(const TelephonyResult& answer, int notifications) {
    framework_.answer = answer;
    framework_.notificationsBeforeAnswer = notifications;
  }
  std::vector<std::string> identifiers() { return framework_.identifiers; }
  CivicInfoTexts delivered() { return framework_.delivered.back(); }

 private:
  fakes::FakeTelephonyFramework framework_;
};

class OverSockets {
 public:
  platform::TelephonyFramework& framework() { return framework_; }
  void publish(bool published) { published ? daemon_.publish() : daemon_.retract(); }
  void prepare(const TelephonyResult& answer, int notifications) {
    request_ = daemon_.takeConnection();
    for (int count = 0; count < notifications; ++count) {
      daemon_.say(location_test::OneWay(5501002, {}));
    }
    daemon_.say(location_test::Answer(answer.domain, answer.errorCode));
  }
  std::vector<std::string> identifiers() {
    std::vector<std::string> texts;
    const auto list = Parse(request_, 40);
    for (const PropertyList& text : *list->array()) texts.push_back(*text.string());
    return texts;
  }
  CivicInfoTexts delivered() {
    const auto list = Parse(daemon_.hear(), 24);
    CivicInfoTexts texts;
    std::size_t index = 0;
    for (const char* key : {"country", "state", "city", "postalCode"}) {
      const PropertyList* text = list->find(key);
      if (text) texts[index] = String::Decode(*text->string(), platform::StringEncoding::kUtf8);
      ++index;
    }
    return texts;
  }

 private:
  static std::optional<PropertyList> Parse(const support::Bytes& message, std::size_t lengthAt) {
    const auto length = support::Get<std::uint32_t>(message, lengthAt);
    return platform::ParsePropertyList(
        std::as_bytes(std::span(message)).subspan(lengthAt + 4, length));
  }

  location_test::DaemonInTest daemon_;
  platform::TelephonySockets framework_{daemon_.portsDirectory(), std::chrono::seconds(20)};
  support::Bytes request_;
};

template <class Side>
class TelephonyFrameworkContract : public ::testing::Test {
 protected:
  static void Count(TelephonyConnection* connection, void* context) {
    auto& test = *static_cast<TelephonyFrameworkContract*>(context);
    EXPECT_EQ(connection, test.connection.get());
    ++test.notifications;
  }
  bool open() {
    connection = side.framework().createConnection(Count, this);
    return connection != nullptr;
  }
  Side side;
  std::unique_ptr<TelephonyConnection> connection;
  int notifications = 0;
};

using Sides = ::testing::Types<InMemory, OverSockets>;
TYPED_TEST_SUITE(TelephonyFrameworkContract, Sides);

TYPED_TEST(TelephonyFrameworkContract, HasNoConnectionWithoutADaemon) {
  this->side.publish(false);
  EXPECT_FALSE(this->open());
  this->side.publish(true);
  EXPECT_TRUE(this->open());
}

TYPED_TEST(TelephonyFrameworkContract, DeliversTheFourTextsAndGivesTheAnswer) {
  ASSERT_TRUE(this->open());
  const TelephonyResult answer{.domain = -3, .errorCode = 1 << 30};
  this->side.prepare(answer, 0);
  const CivicInfoTexts texts{String("CH"), String("Z\xc3\xbcrich"), String(""), String("8001")};
  EXPECT_EQ(this->connection->setCivicInfo(texts), answer);
  EXPECT_EQ(this->side.delivered(), texts);
  EXPECT_EQ(this->notifications, 0);
}

TYPED_TEST(TelephonyFrameworkContract, KeepsNullApartFromEmpty) {
  ASSERT_TRUE(this->open());
  this->side.prepare({}, 0);
  const CivicInfoTexts texts{std::nullopt, String(""), std::nullopt, std::nullopt};
  EXPECT_EQ(this->connection->setCivicInfo(texts), TelephonyResult{});
  EXPECT_EQ(this->side.delivered(), texts);
}

TYPED_TEST(TelephonyFrameworkContract, RunsTheCallbackForEachNotificationBeforeTheAnswer) {
  ASSERT_TRUE(this->open());
  this->side.prepare({.domain = 0, .errorCode = 9}, 3);
  EXPECT_EQ(this->connection->setCivicInfo({}).errorCode, 9);
  EXPECT_EQ(this->notifications, 3);
}

TYPED_TEST(TelephonyFrameworkContract, NamesEachIdentifierOnceInTheOrderOfTheirAdding) {
  for (const char* text : {"b", "a", "b"}) {
    this->side.framework().addIdentifierException(String(text));
  }
  ASSERT_TRUE(this->open());
  this->side.prepare({}, 0);
  EXPECT_EQ(this->side.identifiers(), (std::vector<std::string>{"b", "a"}));
  this->side.framework().addIdentifierException(String("c"));
  ASSERT_TRUE(this->open());
  this->side.prepare({}, 0);
  EXPECT_EQ(this->side.identifiers(), (std::vector<std::string>{"b", "a", "c"}));
}

}  // namespace
