// SPDX-License-Identifier: Apache-2.0
//
// What is too long, too deep or too much is refused, by readers and writers alike, and nothing at
// the limit is. One thread.
#include <gtest/gtest.h>

#include "Tests/PropertyList/PropertyListSupport.h"

namespace {

using platform::ParsePropertyList;
using platform::PropertyList;
using platform::PropertyListLimits;
using platform::SerializeBinary;
using platform::SerializeXml;
using property_list_test::Document;
using property_list_test::Nested;
using property_list_test::Parse;

std::string NestedXml(std::size_t count) {
  std::string text;
  for (std::size_t i = 0; i < count; ++i) text += "<array>";
  for (std::size_t i = 0; i < count; ++i) text += "</array>";
  return Document(text);
}

// A binary list of one-byte offsets and references: `objects` back to back, the first on top.
std::string Binary(const std::vector<std::string>& objects) {
  std::string text = "bplist00";
  std::string table;
  for (const std::string& object : objects) {
    table += static_cast<char>(text.size());
    text += object;
  }
  const auto number = [](std::size_t value) {
    std::string bytes(7, '\0');
    bytes += static_cast<char>(value);
    return bytes;
  };
  const std::size_t start = text.size();
  return text + table + std::string(6, '\0') + "\x01\x01" + number(objects.size()) + number(0) +
         number(start);
}

TEST(PropertyListLimits, TheDepthLimitIsTheDeepestThatPasses) {
  const std::size_t deepest = PropertyListLimits{}.depth;
  EXPECT_EQ(Parse(NestedXml(deepest)), Nested(deepest));
  EXPECT_FALSE(Parse(NestedXml(deepest + 1)));

  const auto xml = SerializeXml(Nested(deepest));
  ASSERT_TRUE(xml);
  EXPECT_EQ(Parse(*xml), Nested(deepest));
  EXPECT_FALSE(SerializeXml(Nested(deepest + 1)));

  const auto binary = SerializeBinary(Nested(deepest));
  ASSERT_TRUE(binary);
  EXPECT_EQ(ParsePropertyList(*binary), Nested(deepest));
  EXPECT_FALSE(SerializeBinary(Nested(deepest + 1)));

  PropertyListLimits deeper;
  deeper.depth = deepest + 1;
  const auto tooDeep = SerializeBinary(Nested(deepest + 1), deeper);
  ASSERT_TRUE(tooDeep);
  EXPECT_FALSE(ParsePropertyList(*tooDeep));
  EXPECT_EQ(ParsePropertyList(*tooDeep, nullptr, deeper), Nested(deepest + 1));
}

TEST(PropertyListLimits, DepthFarBeyondTheLimitIsRefusedJustTheSame) {
  EXPECT_FALSE(Parse(NestedXml(500'000)));
  EXPECT_FALSE(Parse("<plist>" + std::string(1'000'000, '<')));
}

TEST(PropertyListLimits, TheNodeLimitCountsValuesAndKeys) {
  PropertyListLimits limits;
  limits.nodes = 7;  // the dictionary, two keys, an array of two, a value
  PropertyList::Dictionary entries;
  entries.set("a", PropertyList::Array{1, 2});
  entries.set("b", true);
  const PropertyList fits(entries);
  entries.set("c", true);
  const PropertyList exceeds(entries);

  const auto xml = SerializeXml(fits, limits);
  const auto binary = SerializeBinary(fits, limits);
  ASSERT_TRUE(xml && binary);
  EXPECT_EQ(ParsePropertyList(std::as_bytes(std::span(*xml)), nullptr, limits), fits);
  EXPECT_EQ(ParsePropertyList(*binary, nullptr, limits), fits);

  EXPECT_FALSE(SerializeXml(exceeds, limits));
  EXPECT_FALSE(SerializeBinary(exceeds, limits));
  const std::string unlimited = *SerializeXml(exceeds);
  EXPECT_FALSE(ParsePropertyList(std::as_bytes(std::span(unlimited)), nullptr, limits));
  EXPECT_FALSE(ParsePropertyList(*SerializeBinary(exceeds), nullptr, limits));
}

TEST(PropertyListLimits, OneByteTooManyIsRefused) {
  std::string document = Document("<string>a</string>");
  const std::size_t longest = PropertyListLimits{}.bytes;
  document.append(longest - document.size(), '\n');
  EXPECT_EQ(Parse(document), PropertyList("a"));
  document += '\n';
  EXPECT_FALSE(Parse(document));
}

TEST(PropertyListLimits, WritersStopAtTheLengthThatReadersAccept) {
  const std::size_t longest = PropertyListLimits{}.bytes;
  const PropertyList text(std::string(longest, 'x'));
  EXPECT_FALSE(SerializeXml(text));
  EXPECT_FALSE(SerializeBinary(text));
  EXPECT_FALSE(SerializeXml(PropertyList::Data(longest)));
  EXPECT_FALSE(SerializeBinary(PropertyList::Data(longest)));
  // Short in itself, long by its indentation.
  PropertyList::Array items(100'000, PropertyList(1));
  PropertyList deep(std::move(items));
  for (int i = 0; i < 500; ++i) {
    PropertyList::Array outer;
    outer.push_back(std::move(deep));
    deep = PropertyList(std::move(outer));
  }
  EXPECT_FALSE(SerializeXml(deep));
  const auto binary = SerializeBinary(deep);
  ASSERT_TRUE(binary);
  EXPECT_EQ(ParsePropertyList(*binary), deep);
}

TEST(PropertyListLimits, ATextThatIsStoredOnceCountsEachTime) {
  PropertyListLimits limits;
  limits.bytes = 1000;
  const PropertyList fits(PropertyList::Array(9, PropertyList(std::string(100, 'x'))));
  const PropertyList exceeds(PropertyList::Array(11, PropertyList(std::string(100, 'x'))));
  const auto binary = SerializeBinary(fits, limits);
  ASSERT_TRUE(binary);
  EXPECT_EQ(ParsePropertyList(*binary, nullptr, limits), fits);
  EXPECT_FALSE(SerializeBinary(exceeds, limits));
  const auto unlimited = SerializeBinary(exceeds);
  ASSERT_TRUE(unlimited);
  EXPECT_LT(unlimited->size(), 300U);
  EXPECT_FALSE(ParsePropertyList(*unlimited, nullptr, limits));
}

TEST(PropertyListLimits, ACycleIsRefused) {
  EXPECT_FALSE(Parse(Binary({"\xA1" + std::string(1, '\0')})));  // an array of itself
  EXPECT_FALSE(Parse(Binary({"\xA1\x01", "\xA1" + std::string(1, '\0')})));
  EXPECT_FALSE(Parse(Binary({"\xA2\x01\x01", "\xA2" + std::string(2, '\0')})));
  EXPECT_FALSE(Parse(Binary({"\xD1\x01" + std::string(1, '\0'),
                             "\x51"
                             "a"})));
}

TEST(PropertyListLimits, SharedArraysAreCountedAsOftenAsTheyAreReached) {
  // Level on level of arrays that refer twice to the next: 2^24 values in 100 bytes.
  std::vector<std::string> objects;
  for (char next = 1; next <= 24; ++next) objects.push_back(std::string("\xA2") + next + next);
  objects.emplace_back("\x09");
  EXPECT_FALSE(Parse(Binary(objects)));
  // The same with few levels is an ordinary list.
  const std::vector<std::string> few{"\xA2\x01\x01", "\xA2\x02\x02", "\x09"};
  const PropertyList pair(PropertyList::Array{true, true});
  EXPECT_EQ(Parse(Binary(few)), PropertyList(PropertyList::Array{pair, pair}));
}

TEST(PropertyListLimits, SharedDataIsCountedAsOftenAsItIsReached) {
  // 2^10 references to one text of 64 KiB.
  std::string text = "bplist00";
  std::string table;
  const auto add = [&](const std::string& object) {
    for (int shift = 24; shift >= 0; shift -= 8) table += static_cast<char>(text.size() >> shift);
    text += object;
  };
  for (char next = 1; next <= 10; ++next) add(std::string("\xA2") + next + next);
  add(std::string("\x4F\x12\0\x01\0\0", 6) + std::string(65'536, 'x'));
  std::string trailer(6, '\0');
  trailer += "\x04\x01";
  const auto number = [](std::size_t value) {
    std::string bytes;
    for (int shift = 56; shift >= 0; shift -= 8) bytes += static_cast<char>(value >> shift);
    return bytes;
  };
  trailer += number(11) + number(0) + number(text.size());
  std::string reason;
  EXPECT_FALSE(Parse(text + table + trailer, &reason));
  EXPECT_EQ(reason, "too much text and data");
}

}  // namespace
