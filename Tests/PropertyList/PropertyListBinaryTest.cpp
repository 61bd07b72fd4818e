// SPDX-License-Identifier: Apache-2.0
//
// The binary form, byte for byte: what is written, what is read, what is refused. One thread.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "Tests/PropertyList/PropertyListSupport.h"

namespace {

using platform::ParsePropertyList;
using platform::PropertyList;
using platform::SerializeBinary;
using property_list_test::DataOf;
using property_list_test::Parse;
using property_list_test::TextOf;
using namespace std::string_literals;

std::string Number(std::uint64_t value, std::size_t width) {
  std::string bytes;
  for (std::size_t i = width; i-- > 0;) bytes += static_cast<char>(i < 8 ? value >> (8 * i) : 0);
  return bytes;
}

struct Layout {
  std::size_t offsetWidth = 1;
  std::size_t refWidth = 1;
  std::uint64_t top = 0;
  std::int64_t extraObjects = 0;  // claimed, but not there
  std::int64_t tableShift = 0;    // claimed place of the table
};

std::string Binary(const std::vector<std::string>& objects, const Layout& layout = {}) {
  std::string text = "bplist00";
  std::string table;
  for (const std::string& object : objects) {
    table += Number(text.size(), layout.offsetWidth);
    text += object;
  }
  const std::uint64_t start = text.size() + static_cast<std::uint64_t>(layout.tableShift);
  const std::uint64_t count = objects.size() + static_cast<std::uint64_t>(layout.extraObjects);
  return text + table + std::string(6, '\0') + static_cast<char>(layout.offsetWidth) +
         static_cast<char>(layout.refWidth) + Number(count, 8) + Number(layout.top, 8) +
         Number(start, 8);
}

std::optional<PropertyList> Object(const std::string& object) { return Parse(Binary({object})); }

TEST(PropertyListBinary, IsWrittenLevelByLevelWithEqualTextsOnce) {
  PropertyList::Dictionary entries;
  entries.set("a", "b");
  entries.set("c", PropertyList::Array{"a", 300});
  const auto bytes = SerializeBinary(std::move(entries));
  ASSERT_TRUE(bytes);
  EXPECT_EQ(TextOf(*bytes),
            "bplist00"
            "\xD2\x01\x02\x03\x04"  // 0 at 8: {1: 3, 2: 4}
            "\x51"
            "a"  // 1 at 13
            "\x51"
            "c"  // 2 at 15
            "\x51"
            "b"             // 3 at 17
            "\xA2\x01\x05"  // 4 at 19: [1, 5]
            "\x11\x01\x2C"  // 5 at 22
            "\x08\x0D\x0F\x11\x13\x16"
            "\0\0\0\0\0\0\x01\x01"
            "\0\0\0\0\0\0\0\x06"
            "\0\0\0\0\0\0\0\0"
            "\0\0\0\0\0\0\0\x19"s);
}

TEST(PropertyListBinary, WritesEveryKindInItsShortestForm) {
  const auto body = [](const PropertyList& value) {
    const std::string text = TextOf(*SerializeBinary(value));
    return text.substr(8, text.size() - 8 - 1 - 32);
  };
  EXPECT_EQ(body(false), "\x08");
  EXPECT_EQ(body(true), "\x09");
  EXPECT_EQ(body(0), "\x10\0"s);
  EXPECT_EQ(body(255), "\x10\xFF");
  EXPECT_EQ(body(256), "\x11\x01\0"s);
  EXPECT_EQ(body(65'536), "\x12\0\x01\0\0"s);
  EXPECT_EQ(body(std::int64_t{1} << 32), "\x13\0\0\0\x01\0\0\0\0"s);
  EXPECT_EQ(body(-1), "\x13\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF");
  EXPECT_EQ(body(std::numeric_limits<std::uint64_t>::max()),
            "\x14\0\0\0\0\0\0\0\0\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF"s);
  EXPECT_EQ(body(1.5), "\x23\x3F\xF8\0\0\0\0\0\0"s);
  EXPECT_EQ(body(PropertyList::Date{1.5}), "\x33\x3F\xF8\0\0\0\0\0\0"s);
  EXPECT_EQ(body(DataOf("ab")),
            "\x42"
            "ab");
  EXPECT_EQ(body(""), "\x50");
  EXPECT_EQ(body("0123456789abcde"),
            "\x5F\x10\x0F"
            "0123456789abcde");
  EXPECT_EQ(body("\xC3\xA9"), "\x61\0\xE9"s);
  EXPECT_EQ(body("\xF0\x9F\x98\x80"), "\x62\xD8\x3D\xDE\0"s);
  EXPECT_EQ(body(PropertyList::Uid{7}), "\x80\x07");
  EXPECT_EQ(body(PropertyList::Uid{0x10000}), "\x83\0\x01\0\0"s);
  EXPECT_EQ(body(PropertyList::Array{}), "\xA0");
  EXPECT_EQ(body(PropertyList::Dictionary{}), "\xD0");
}

TEST(PropertyListBinary, ReadsBackWhatXmlCannotCarry) {
  PropertyList::Dictionary entries;
  entries.set("control \x01", "\x1B[0m");
  entries.set("fraction", PropertyList::Date{0.123456789});
  entries.set("far", PropertyList::Date{1e300});
  entries.set("uid", PropertyList::Uid{std::numeric_limits<std::uint64_t>::max()});
  entries.set("non-character", "\xEF\xBF\xBF");
  const auto bytes = SerializeBinary(entries);
  ASSERT_TRUE(bytes);
  EXPECT_EQ(ParsePropertyList(*bytes), PropertyList(entries));
}

TEST(PropertyListBinary, RefusesToWriteTextThatIsNoUtf8) {
  EXPECT_FALSE(SerializeBinary("\xC3"));
  EXPECT_FALSE(SerializeBinary("\xED\xA0\x80"));
  EXPECT_FALSE(SerializeBinary(std::string(1, '\0')));
  EXPECT_FALSE(SerializeBinary(PropertyList::Date{std::numeric_limits<double>::quiet_NaN()}));
}

TEST(PropertyListBinary, ReadsIntegersOfEveryWidth) {
  EXPECT_EQ(Object("\x10\xFF"), PropertyList(255));
  EXPECT_EQ(Object("\x11\xFF\xFF"), PropertyList(65'535));
  EXPECT_EQ(Object("\x12\xFF\xFF\xFF\xFF"), PropertyList(4'294'967'295));
  EXPECT_EQ(Object("\x13\x80\0\0\0\0\0\0\0"s),
            PropertyList(std::numeric_limits<std::int64_t>::min()));
  EXPECT_EQ(Object("\x14" + Number(0, 8) + Number(~0ULL, 8)),
            PropertyList(std::numeric_limits<std::uint64_t>::max()));
  EXPECT_EQ(Object("\x14" + Number(~0ULL, 8) + Number(~0ULL, 8)), PropertyList(-1));
  EXPECT_FALSE(Object("\x14" + Number(1, 8) + Number(0, 8)));
  EXPECT_FALSE(Object("\x14" + Number(~0ULL, 8) + Number(1, 8)));
  EXPECT_FALSE(Object("\x15" + std::string(32, '\0')));
  EXPECT_FALSE(Object("\x1F" + std::string(200, '\0')));
}

TEST(PropertyListBinary, ReadsRealsOfBothWidths) {
  EXPECT_EQ(Object("\x22\x3F\xC0\0\0"s), PropertyList(1.5));
  EXPECT_EQ(Object("\x23\xBF\xF8\0\0\0\0\0\0"s), PropertyList(-1.5));
  EXPECT_FALSE(Object("\x21\0\0"s));
  EXPECT_FALSE(Object("\x24" + std::string(16, '\0')));
}

TEST(PropertyListBinary, ReadsCountsOfEveryWidth) {
  const PropertyList text("abc");
  EXPECT_EQ(Object("\x53"
                   "abc"),
            text);
  EXPECT_EQ(Object("\x5F\x10\x03"
                   "abc"),
            text);
  EXPECT_EQ(Object("\x5F\x11\0\x03"
                   "abc"s),
            text);
  EXPECT_EQ(Object("\x5F\x12\0\0\0\x03"
                   "abc"s),
            text);
  EXPECT_EQ(Object("\x5F\x13\0\0\0\0\0\0\0\x03"
                   "abc"s),
            text);
  EXPECT_FALSE(Object("\x5F\x14" + Number(0, 8) + Number(3, 8) + "abc"));
  EXPECT_FALSE(
      Object("\x5F\x13\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF"
             "abc"));
  EXPECT_FALSE(
      Object("\x5F\x22\0\0\0\x03"
             "abc"s));
  EXPECT_FALSE(Object("\x5F"));
  EXPECT_FALSE(Object("\x5F\x13"));
}

TEST(PropertyListBinary, ReadsReferencesAndOffsetsOfEveryWidth) {
  for (std::size_t width = 1; width <= 8; ++width) {
    const std::vector<std::string> objects{"\xA1" + Number(1, width), "\x09"};
    EXPECT_EQ(Parse(Binary(objects, {.offsetWidth = 9 - width, .refWidth = width})),
              PropertyList(PropertyList::Array{true}));
  }
  EXPECT_FALSE(Parse(Binary({"\x09"}, {.offsetWidth = 0})));
  EXPECT_FALSE(Parse(Binary({"\x09"}, {.offsetWidth = 9})));
  EXPECT_FALSE(Parse(Binary({"\x09"}, {.refWidth = 0})));
  EXPECT_FALSE(Parse(Binary({"\x09"}, {.refWidth = 9})));
}

TEST(PropertyListBinary, ReadsTheTopObjectWhereverItStands) {
  EXPECT_EQ(Parse(Binary({"\x08", "\x09"}, {.top = 1})), PropertyList(true));
  EXPECT_FALSE(Parse(Binary({"\x08", "\x09"}, {.top = 2})));
  EXPECT_FALSE(Parse(Binary({"\x08", "\x09"}, {.top = ~0ULL})));
}

TEST(PropertyListBinary, RefusesATrailerThatDoesNotAddUp) {
  const std::vector<std::string> objects{"\x09"};
  EXPECT_TRUE(Parse(Binary(objects)));
  for (const std::int64_t shift : {-9, -1, 1, 2, 40, 1 << 20}) {
    EXPECT_FALSE(Parse(Binary(objects, {.tableShift = shift}))) << shift;
  }
  for (const std::int64_t extra : {std::int64_t{-1}, std::int64_t{1}, std::int64_t{255},
                                   std::int64_t{1} << 61, std::int64_t{-2}}) {
    EXPECT_FALSE(Parse(Binary(objects, {.extraObjects = extra}))) << extra;
  }
  // Eight times the claimed objects wraps around to what is there.
  EXPECT_FALSE(Parse(Binary(objects, {.offsetWidth = 8, .extraObjects = std::int64_t{1} << 61})));
}

TEST(PropertyListBinary, RefusesEveryCutOffVersionOfItself) {
  PropertyList::Dictionary entries;
  entries.set("key", PropertyList::Array{1, 2.5, "text", DataOf("data"), true});
  const std::string whole = TextOf(*SerializeBinary(std::move(entries)));
  for (std::size_t length = 0; length < whole.size(); ++length) {
    EXPECT_FALSE(Parse(std::string_view(whole).substr(0, length))) << length;
    EXPECT_FALSE(Parse("bplist00" + whole.substr(std::max<std::size_t>(length, 9)))) << length;
  }
  EXPECT_FALSE(Parse(whole + '\0'));
  EXPECT_FALSE(Parse("bplist01" + whole.substr(8)));
}

TEST(PropertyListBinary, RefusesObjectsThatLeaveTheirPlace) {
  for (const std::string& object :
       {"\x11\x01"s, "\x13\0\0\0"s, "\x22\0\0"s, "\x23\0\0"s, "\x33\0"s,
        "\x45"
        "abcd"s,
        "\x55"
        "abcd"s,
        "\x62\0a\0"s, "\x83\0\0"s, "\xA1"s, "\xD1\0"s, "\xAF\x11\0\x10"s}) {
    EXPECT_FALSE(Object(object)) << testing::PrintToString(object);
  }
}

TEST(PropertyListBinary, RefusesKindsItDoesNotKnow) {
  for (const std::string& object :
       {"\x00"s, "\x01"s, "\x0A"s, "\x0F"s, "\x30"s, "\x32\0\0\0\0"s, "\x70"s,
        "\x71"
        "a"s,
        "\x88\0\0\0\0\0\0\0\0\0"s, "\x90"s, "\xB0"s, "\xC0"s, "\xE0"s, "\xF0"s}) {
    EXPECT_FALSE(Object(object)) << testing::PrintToString(object);
  }
}

TEST(PropertyListBinary, RefusesTextThatIsNotWhatItSays) {
  EXPECT_FALSE(
      Object("\x52"
             "a\x80"));
  EXPECT_FALSE(
      Object("\x52"
             "a\0"s));
  EXPECT_FALSE(Object("\x61\xD8\x3D"));
  EXPECT_FALSE(Object("\x62\xD8\x3D\0a"s));
  EXPECT_FALSE(Object("\x62\xDE\x00\xD8\x3D"s));
  EXPECT_FALSE(Object("\x61\0\0"s));
  EXPECT_EQ(Object("\x61\0a"s), PropertyList("a"));
  EXPECT_EQ(Object("\x61\x07\xFF"), PropertyList("\xDF\xBF"));
  EXPECT_EQ(Object("\x61\xFF\xFF"), PropertyList("\xEF\xBF\xBF"));
  EXPECT_EQ(Object("\x62\xDB\xFF\xDF\xFF"), PropertyList("\xF4\x8F\xBF\xBF"));
}

TEST(PropertyListBinary, RefusesADateThatIsNoNumber) {
  EXPECT_FALSE(Object("\x33\x7F\xF8\0\0\0\0\0\0"s));
  EXPECT_EQ(Object("\x33\x41\0\0\0\0\0\0\0"s), PropertyList(PropertyList::Date{131'072}));
}

TEST(PropertyListBinary, RefusesBrokenDictionaries) {
  const std::string key =
      "\x51"
      "k";
  EXPECT_TRUE(Parse(Binary({"\xD1\x01\x02", key, "\x09"})));
  EXPECT_FALSE(Parse(Binary({"\xD1\x02\x01", key, "\x09"})));          // the key is no text
  EXPECT_FALSE(Parse(Binary({"\xD2\x01\x01\x02\x02", key, "\x09"})));  // twice the same object
  EXPECT_FALSE(Parse(Binary({"\xD2\x01\x03\x02\x02", key, "\x09", key})));
  EXPECT_FALSE(Parse(Binary({"\xD2\x01\x03\x02\x02", key, "\x09", "\x61\0k"s})));
  EXPECT_FALSE(Parse(Binary({"\xD1\x01\x03", key, "\x09"})));  // no such object
  EXPECT_FALSE(Parse(Binary({"\xD1\x03\x02", key, "\x09"})));
}

TEST(PropertyListBinary, RefusesOffsetsOutsideTheObjects) {
  for (const char offset : {'\0', '\x07', '\x0A', '\xFF'}) {
    std::string text = Binary({"\x09", "\x08"});
    text[10] = offset;  // the first entry of the table, which stands right behind the objects
    EXPECT_FALSE(Parse(text)) << static_cast<int>(offset);
  }
}

}  // namespace
