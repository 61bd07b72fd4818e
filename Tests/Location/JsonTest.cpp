// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Json.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

using platform::ParseJson;
using platform::PropertyList;

PropertyList::Dictionary Dictionary(std::initializer_list<PropertyList::Entry> entries) {
  PropertyList::Dictionary dictionary;
  for (const auto& entry : entries) dictionary.set(entry.key, entry.value);
  return dictionary;
}

TEST(Json, ReadsEveryKindOfValue) {
  EXPECT_EQ(ParseJson("true"), PropertyList(true));
  EXPECT_EQ(ParseJson(" false\r\n\t"), PropertyList(false));
  EXPECT_EQ(ParseJson("\"\""), PropertyList(""));
  EXPECT_EQ(ParseJson("[]"), PropertyList(PropertyList::Array{}));
  EXPECT_EQ(ParseJson("{}"), PropertyList(PropertyList::Dictionary{}));
  EXPECT_EQ(ParseJson(R"( { "a" : [ 1 , "x" ] , "b" : { "c" : true } } )"),
            PropertyList(Dictionary(
                {{"a", PropertyList::Array{1, "x"}}, {"b", Dictionary({{"c", true}})}})));
}

TEST(Json, ReadsNumbersAsIntegersWhereTheyAre) {
  EXPECT_EQ(ParseJson("0"), PropertyList(0));
  EXPECT_EQ(ParseJson("-9223372036854775808"), PropertyList(INT64_MIN));
  EXPECT_EQ(ParseJson("9223372036854775808"), PropertyList(9223372036854775808.0));
  EXPECT_EQ(ParseJson("-0.5e+1"), PropertyList(-5.0));
  EXPECT_EQ(ParseJson("2E2"), PropertyList(200.0));
}

TEST(Json, LeavesANullMemberOut) {
  EXPECT_EQ(ParseJson(R"({"a":null,"b":1})"), PropertyList(Dictionary({{"b", 1}})));
  EXPECT_EQ(ParseJson("null"), PropertyList(PropertyList::Dictionary{}));
  EXPECT_EQ(ParseJson("[null]"), PropertyList(PropertyList::Array{PropertyList::Dictionary{}}));
}

TEST(Json, UndoesEscapes) {
  EXPECT_EQ(ParseJson(R"("\"\\\/\b\f\n\r\t")"), PropertyList("\"\\/\b\f\n\r\t"));
  EXPECT_EQ(ParseJson(R"("A\u00fc\u20AC\ud83d\ude00")"),
            PropertyList("A\xc3\xbc\xe2\x82\xac\xf0\x9f\x98\x80"));
}

TEST(Json, RefusesWhatIsNotExactlyOneValue) {
  const std::vector<std::string> texts{"",
                                       " ",
                                       "{",
                                       "[",
                                       "\"",
                                       "tru",
                                       "nul",
                                       "True",
                                       "{}x",
                                       "1 2",
                                       "[1,]",
                                       "[,]",
                                       "{,}",
                                       "{\"a\"}",
                                       "{\"a\":}",
                                       "{\"a\":1,}",
                                       "{a:1}",
                                       "{'a':1}",
                                       "{\"a\":1 \"b\":2}",
                                       "[1 2]",
                                       "{\"a\":1",
                                       "[1",
                                       "-",
                                       "+1",
                                       "01",
                                       "-01",
                                       "1.",
                                       ".5",
                                       "1e",
                                       "1e+",
                                       "0x10",
                                       "NaN",
                                       "Infinity",
                                       "1e999",
                                       "\"\n\"",
                                       "\"\\x\"",
                                       "\"\\u12\"",
                                       "\"\\u12g4\"",
                                       "\"\\u+123\"",
                                       "\"\\ud83d\"",
                                       "\"\\ud83dx\"",
                                       "\"\\ud83d\\u0041\"",
                                       "\"\\ude00\"",
                                       "\"\\u0000\"",
                                       "\"\xff\"",
                                       "\"\xc0\x80\"",
                                       "\"\\",
                                       "\xef\xbb\xbf{}",
                                       std::string("\0", 1),
                                       std::string("\"a\0\"", 4)};
  for (const std::string& text : texts) EXPECT_EQ(ParseJson(text), std::nullopt) << text;
}

TEST(Json, RefusesAKeyThatIsThereTwice) {
  for (const char* text : {R"({"a":1,"a":1})", R"({"a":null,"a":1})", R"({"a":1,"a":null})",
                           R"({"a":null,"a":null})", R"({"a":1,"\u0061":1})"}) {
    EXPECT_EQ(ParseJson(text), std::nullopt) << text;
  }
  EXPECT_TRUE(ParseJson(R"({"a":{"a":1},"b":{"a":null}})")) << "each in an object of its own";
}

TEST(Json, NestsUpTo32Deep) {
  const auto arrays = [](std::size_t depth) {
    return std::string(depth, '[') + std::string(depth, ']');
  };
  const auto objects = [](std::size_t depth) {
    std::string text = "1";
    while (depth-- > 0) text = R"({"a":)" + text + "}";
    return text;
  };
  EXPECT_TRUE(ParseJson(arrays(32)));
  EXPECT_FALSE(ParseJson(arrays(33)));
  EXPECT_TRUE(ParseJson(objects(32)));
  EXPECT_FALSE(ParseJson(objects(33)));
  EXPECT_FALSE(ParseJson(arrays(1'000'000)));
}

TEST(Json, RefusesEveryPrefixOfADocument) {
  const std::string text = R"({"a":["\u20ac",-1.5e2,true,null],"b":{}})";
  ASSERT_TRUE(ParseJson(text));
  for (std::size_t length = 0; length < text.size(); ++length) {
    EXPECT_EQ(ParseJson(text.substr(0, length)), std::nullopt) << length;
  }
}

TEST(Json, MakesSomethingThatCanBeWrittenOrNothingOfEveryTextOneByteAway) {
  const std::string text = R"({"a":["\u20ac\ud83d\ude00",-1.5e2,true,null],"b":{},"c":10})";
  std::size_t accepted = 0;
  for (std::size_t at = 0; at < text.size(); ++at) {
    for (int byte = 0; byte < 256; ++byte) {
      std::string changed = text;
      changed[at] = static_cast<char>(byte);
      const auto value = ParseJson(changed);
      if (!value) continue;
      ++accepted;
      EXPECT_TRUE(platform::SerializeBinary(*value)) << changed;
    }
  }
  EXPECT_GT(accepted, text.size());
}

}  // namespace
