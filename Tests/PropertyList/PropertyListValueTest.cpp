// SPDX-License-Identifier: Apache-2.0
//
// The property-list value: kinds, equality, dictionaries, copies. One thread.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <thread>

#include "Tests/PropertyList/PropertyListSupport.h"

namespace {

using platform::PropertyList;
using property_list_test::DataOf;
using property_list_test::Nested;
using Kind = PropertyList::Kind;

TEST(PropertyListValue, TellsItsKind) {
  EXPECT_EQ(PropertyList(true).kind(), Kind::kBoolean);
  EXPECT_EQ(PropertyList(7).kind(), Kind::kInteger);
  EXPECT_EQ(PropertyList(std::numeric_limits<std::uint64_t>::max()).kind(), Kind::kInteger);
  EXPECT_EQ(PropertyList(7.0).kind(), Kind::kReal);
  EXPECT_EQ(PropertyList("seven").kind(), Kind::kString);
  EXPECT_EQ(PropertyList(DataOf("seven")).kind(), Kind::kData);
  EXPECT_EQ(PropertyList(PropertyList::Date{7}).kind(), Kind::kDate);
  EXPECT_EQ(PropertyList(PropertyList::Uid{7}).kind(), Kind::kUid);
  EXPECT_EQ(PropertyList(PropertyList::Array{}).kind(), Kind::kArray);
  EXPECT_EQ(PropertyList(PropertyList::Dictionary{}).kind(), Kind::kDictionary);
}

TEST(PropertyListValue, ConvertsNothingBetweenKinds) {
  const PropertyList one(1);
  EXPECT_EQ(one.integer(), 1);
  EXPECT_FALSE(one.boolean());
  EXPECT_FALSE(one.real());
  EXPECT_EQ(one.string(), nullptr);
  EXPECT_EQ(one.dictionary(), nullptr);
  EXPECT_EQ(one.find("key"), nullptr);
  EXPECT_FALSE(PropertyList(true).integer());
}

TEST(PropertyListValue, KeepsTheSignOfIntegers) {
  const PropertyList large(std::numeric_limits<std::uint64_t>::max());
  EXPECT_FALSE(large.integer());
  EXPECT_EQ(large.unsignedInteger(), std::numeric_limits<std::uint64_t>::max());
  const PropertyList negative(-1);
  EXPECT_EQ(negative.integer(), -1);
  EXPECT_FALSE(negative.unsignedInteger());
  EXPECT_FALSE(large == negative);
  EXPECT_EQ(PropertyList(std::uint64_t{5}), PropertyList(std::int8_t{5}));
}

TEST(PropertyListValue, DoesNotConfuseABooleanOrARealWithAnInteger) {
  EXPECT_FALSE(PropertyList(true) == PropertyList(1));
  EXPECT_FALSE(PropertyList(false) == PropertyList(0));
  EXPECT_FALSE(PropertyList(1.0) == PropertyList(1));
  EXPECT_FALSE(PropertyList(1.0) == PropertyList(PropertyList::Date{1.0}));
  EXPECT_FALSE(PropertyList("text") == PropertyList(DataOf("text")));
}

TEST(PropertyListValue, ComparesRealsByTheirBits) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  EXPECT_EQ(PropertyList(nan), PropertyList(nan));
  EXPECT_FALSE(PropertyList(0.0) == PropertyList(-0.0));
}

TEST(PropertyListDictionary, KeepsTheOrderOfInsertion) {
  PropertyList::Dictionary entries;
  for (const char* key : {"zulu", "alpha", "mike"}) entries.set(key, key);
  entries.set("alpha", 2);
  std::vector<std::string> keys;
  for (const auto& entry : entries) keys.push_back(entry.key);
  EXPECT_EQ(keys, (std::vector<std::string>{"zulu", "alpha", "mike"}));
  EXPECT_EQ(entries.find("alpha")->integer(), 2);
}

TEST(PropertyListDictionary, RefusesToInsertAKeyTwice) {
  PropertyList::Dictionary entries;
  EXPECT_NE(entries.insert("key", 1), nullptr);
  EXPECT_EQ(entries.insert("key", 2), nullptr);
  EXPECT_EQ(entries.find("key")->integer(), 1);
}

TEST(PropertyListDictionary, FindsEveryKeyAtEverySize) {
  PropertyList::Dictionary entries;
  for (int i = 0; i < 2000; ++i) {
    EXPECT_EQ(entries.find(std::to_string(i)), nullptr);
    ASSERT_NE(entries.insert(std::to_string(i), i), nullptr);
    ASSERT_EQ(entries.insert(std::to_string(i), 0), nullptr);
    ASSERT_EQ(entries.find(std::to_string(i / 2))->integer(), i / 2);
  }
  EXPECT_EQ(entries.size(), 2000U);
}

TEST(PropertyListDictionary, FindsTheOthersAfterAnErase) {
  PropertyList::Dictionary entries;
  for (int i = 0; i < 100; ++i) entries.set(std::to_string(i), i);
  for (int i = 0; i < 100; i += 2) EXPECT_TRUE(entries.erase(std::to_string(i)));
  EXPECT_FALSE(entries.erase("0"));
  EXPECT_EQ(entries.size(), 50U);
  for (int i = 0; i < 100; ++i) {
    const PropertyList* found = entries.find(std::to_string(i));
    EXPECT_EQ(found != nullptr, i % 2 == 1);
    EXPECT_TRUE(found == nullptr || found->integer() == i);
  }
}

TEST(PropertyListDictionary, IsEqualWhateverTheOrder) {
  PropertyList::Dictionary ascending, descending;
  for (int i = 0; i < 40; ++i) ascending.set(std::to_string(i), i);
  for (int i = 39; i >= 0; --i) descending.set(std::to_string(i), i);
  EXPECT_EQ(ascending, descending);
  descending.set("39", 40);
  EXPECT_FALSE(ascending == descending);
  descending.erase("39");
  EXPECT_FALSE(ascending == descending);
}

TEST(PropertyListDictionary, CopiesAreIndependent) {
  PropertyList::Dictionary entries;
  for (int i = 0; i < 40; ++i) entries.set(std::to_string(i), i);
  PropertyList::Dictionary copy = entries;
  copy.erase("7");
  copy.set("8", "eight");
  EXPECT_EQ(entries.find("7")->integer(), 7);
  EXPECT_EQ(entries.find("8")->integer(), 8);
  EXPECT_EQ(copy.find("39")->integer(), 39);
}

TEST(PropertyListValue, TakesAPartOfItselfInItsPlace) {
  PropertyList moved = Nested(3);
  moved = std::move(moved.array()->front());
  EXPECT_EQ(moved, Nested(2));
  PropertyList copied = Nested(3);
  copied = copied.array()->front();
  EXPECT_EQ(copied, Nested(2));
}

TEST(PropertyListValue, IsCopiedComparedAndDestroyedAtTheDepthLimit) {
  const std::size_t deepest = platform::PropertyListLimits{}.depth;
  bool equal = false;
  // A thread of its own, as work queues have them.
  std::thread([&] {
    const PropertyList value = Nested(deepest);
    PropertyList copy = value;
    equal = copy == value;
    copy.array()->clear();
  }).join();
  EXPECT_TRUE(equal);
}

}  // namespace
