// SPDX-License-Identifier: Apache-2.0
//
// The XML form, byte for byte: what is written, what is read, what is refused. One thread.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "Tests/PropertyList/PropertyListSupport.h"

namespace {

using platform::PropertyList;
using platform::SerializeXml;
using property_list_test::DataOf;
using property_list_test::Document;
using property_list_test::Parse;

PropertyList::Dictionary Sample() {
  PropertyList::Dictionary inner;
  inner.set("On", true);
  inner.set("Off", false);
  PropertyList::Dictionary root;
  root.set("Name", "Zarvo <&> Sons");
  root.set("Count", -3);
  root.set("Ratio", 0.1);
  root.set("When", PropertyList::Date{86'400});
  root.set("Token", DataOf("any carnal pleas"));
  root.set("List", PropertyList::Array{1, "two", std::move(inner)});
  root.set("NoItems", PropertyList::Array{});
  root.set("NoKeys", PropertyList::Dictionary{});
  return root;
}

constexpr std::string_view kSampleText =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
    "<plist version=\"1.0\">\n"
    "<dict>\n"
    "\t<key>Name</key>\n"
    "\t<string>Zarvo &lt;&amp;&gt; Sons</string>\n"
    "\t<key>Count</key>\n"
    "\t<integer>-3</integer>\n"
    "\t<key>Ratio</key>\n"
    "\t<real>0.1</real>\n"
    "\t<key>When</key>\n"
    "\t<date>2001-01-02T00:00:00Z</date>\n"
    "\t<key>Token</key>\n"
    "\t<data>YW55IGNhcm5hbCBwbGVhcw==</data>\n"
    "\t<key>List</key>\n"
    "\t<array>\n"
    "\t\t<integer>1</integer>\n"
    "\t\t<string>two</string>\n"
    "\t\t<dict>\n"
    "\t\t\t<key>On</key>\n"
    "\t\t\t<true/>\n"
    "\t\t\t<key>Off</key>\n"
    "\t\t\t<false/>\n"
    "\t\t</dict>\n"
    "\t</array>\n"
    "\t<key>NoItems</key>\n"
    "\t<array/>\n"
    "\t<key>NoKeys</key>\n"
    "\t<dict/>\n"
    "</dict>\n"
    "</plist>\n";

TEST(PropertyListXml, IsWrittenWithTabsAndWithoutADocumentType) {
  EXPECT_EQ(SerializeXml(Sample()), kSampleText);
}

TEST(PropertyListXml, ReadsBackWhatIsWritten) {
  const auto read = Parse(kSampleText);
  ASSERT_TRUE(read);
  EXPECT_EQ(*read, PropertyList(Sample()));
  EXPECT_EQ(SerializeXml(*read), kSampleText);
}

TEST(PropertyListXml, SkipsADocumentTypeCommentsAndInstructions) {
  EXPECT_EQ(Parse("<?xml version=\"1.0\"?>\n"
                  "<!DOCTYPE plist PUBLIC \"-//Zarvo//DTD PLIST 1.0//EN\" "
                  "\"http://www.zarvo.example/DTDs/PropertyList-1.0.dtd\">\n"
                  "<!-- before --><plist version=\"1.0\"><?hint?><!-- beside --><array>"
                  "<string>a<!-- within -->b</string></array></plist>"),
            PropertyList(PropertyList::Array{"ab"}));
}

TEST(PropertyListXml, NeedsNoDeclarationAndNoVersion) {
  EXPECT_EQ(Parse("<plist><true/></plist>"), PropertyList(true));
}

TEST(PropertyListXml, TakesAByteOrderMarkAndUtf16) {
  EXPECT_EQ(Parse("\xEF\xBB\xBF" + Document("<string>\xC3\xA9</string>")),
            PropertyList("\xC3\xA9"));
  std::string wide = "\xFF\xFE";
  for (const char c : std::string_view("<plist version=\"1.0\"><string>e")) wide += {c, '\0'};
  wide += "\xE9";
  wide += '\0';
  for (const char c : std::string_view("</string></plist>")) wide += {c, '\0'};
  EXPECT_EQ(Parse(wide), PropertyList("e\xC3\xA9"));
}

TEST(PropertyListXml, TakesCharacterReferencesAndSections) {
  EXPECT_EQ(Parse(Document("<string>&#x41;&#66;&lt;<![CDATA[<&>]]>&apos;&quot;</string>")),
            PropertyList("AB<<&>'\""));
}

TEST(PropertyListXml, KeepsACarriageReturnThroughAReference) {
  const PropertyList value("a\r\nb\rc\n\t d");
  const auto text = SerializeXml(value);
  ASSERT_TRUE(text);
  EXPECT_NE(text->find("a&#13;\nb&#13;c\n\t d"), std::string::npos);
  EXPECT_EQ(Parse(*text), value);
}

TEST(PropertyListXml, RefusesToWriteWhatItCannotCarry) {
  for (const char* text : {"\x01", "\x08", "\x0B", "\x1F", "\xEF\xBF\xBE", "\xEF\xBF\xBF", "\xC3",
                           "\xED\xA0\x80", "\xC0\xAF", "\xF4\x90\x80\x80", "\x80", "a\xE2\x82"}) {
    EXPECT_FALSE(SerializeXml(PropertyList(text))) << testing::PrintToString(text);
    PropertyList::Dictionary keyed;
    keyed.set(text, 1);
    EXPECT_FALSE(SerializeXml(std::move(keyed))) << testing::PrintToString(text);
  }
  EXPECT_FALSE(SerializeXml(std::string(1, '\0')));
  EXPECT_FALSE(SerializeXml(PropertyList::Uid{1}));
  EXPECT_FALSE(SerializeXml(PropertyList::Date{std::numeric_limits<double>::quiet_NaN()}));
  EXPECT_FALSE(SerializeXml(PropertyList::Date{1e300}));
  EXPECT_FALSE(SerializeXml(PropertyList::Date{-1e12}));
}

TEST(PropertyListXml, WritesTheCharactersAtTheEdges) {
  for (const char* text : {" ", "\x7F", "\xC2\x80", "\xED\x9F\xBF", "\xEE\x80\x80", "\xEF\xBF\xBD",
                           "\xF0\x90\x80\x80", "\xF4\x8F\xBF\xBF"}) {
    const auto written = SerializeXml(PropertyList(text));
    ASSERT_TRUE(written) << testing::PrintToString(text);
    EXPECT_EQ(Parse(*written), PropertyList(text));
  }
}

TEST(PropertyListXml, ReadsIntegersAsTheyAreMeant) {
  const auto read = [](std::string_view text) {
    return Parse(Document("<integer>" + std::string(text) + "</integer>"));
  };
  EXPECT_EQ(read("0"), PropertyList(0));
  EXPECT_EQ(read("-0"), PropertyList(0));
  EXPECT_EQ(read("+12"), PropertyList(12));
  EXPECT_EQ(read("0012"), PropertyList(12));
  EXPECT_EQ(read("0x1F"), PropertyList(31));
  EXPECT_EQ(read("-0X1f"), PropertyList(-31));
  EXPECT_EQ(read("-9223372036854775808"), PropertyList(std::numeric_limits<std::int64_t>::min()));
  EXPECT_EQ(read("18446744073709551615"), PropertyList(std::numeric_limits<std::uint64_t>::max()));
  for (const char* text :
       {"", "-", "+", "12abc", "abc", "1.0", "1,5", " 1", "1 ", "\n1\n", "+-1", "--1", "0x", "0xG",
        "1e3", "18446744073709551616", "-9223372036854775809", "0x10000000000000000"}) {
    EXPECT_FALSE(read(text)) << text;
  }
}

TEST(PropertyListXml, ReadsRealsAsTheyAreMeant) {
  const auto read = [](std::string_view text) {
    return Parse(Document("<real>" + std::string(text) + "</real>"));
  };
  EXPECT_EQ(read("1"), PropertyList(1.0));
  EXPECT_EQ(read("-0"), PropertyList(-0.0));
  EXPECT_EQ(read("+1.5e-3"), PropertyList(0.0015));
  EXPECT_EQ(read("5e-324"), PropertyList(5e-324));
  EXPECT_EQ(read("1.7976931348623157e308"), PropertyList(1.7976931348623157e308));
  EXPECT_EQ(read("+infinity"), PropertyList(std::numeric_limits<double>::infinity()));
  EXPECT_EQ(read("-INF"), PropertyList(-std::numeric_limits<double>::infinity()));
  ASSERT_TRUE(read("nan"));
  EXPECT_TRUE(std::isnan(*read("nan")->real()));
  for (const char* text :
       {"", "-", "1,5", "1.5x", " 1.5", "1.5 ", "0x1p3", "+-1", "1e400", "nan(1)", "one", "."}) {
    EXPECT_FALSE(read(text)) << text;
  }
}

TEST(PropertyListXml, WritesRealsThatReadBackTheSame) {
  for (const double value :
       {0.1, 1.0 / 3, 1e23, 5e-324, 1.7976931348623157e308, -0.0, 123456789.0,
        std::numeric_limits<double>::infinity(), -std::numeric_limits<double>::infinity()}) {
    const auto text = SerializeXml(PropertyList(value));
    ASSERT_TRUE(text);
    EXPECT_EQ(Parse(*text), PropertyList(value)) << *text;
  }
}

TEST(PropertyListXml, ReadsDatesThatExist) {
  const auto read = [](std::string_view text) {
    return Parse(Document("<date>" + std::string(text) + "</date>"));
  };
  EXPECT_EQ(read("2001-01-01T00:00:00Z"), PropertyList(PropertyList::Date{0}));
  EXPECT_EQ(read("2000-12-31T23:59:59Z"), PropertyList(PropertyList::Date{-1}));
  EXPECT_EQ(read("1970-01-01T00:00:00Z"), PropertyList(PropertyList::Date{-978'307'200}));
  EXPECT_EQ(read("2024-02-29T12:00:00Z"), PropertyList(PropertyList::Date{730'900'800}));
  EXPECT_EQ(read("0000-12-30T00:00:00Z"), PropertyList(PropertyList::Date{-63114076800.0}));
  for (const char* text :
       {"", "yesterday", "2023-02-29T00:00:00Z", "2001-13-01T00:00:00Z", "2001-00-01T00:00:00Z",
        "2001-01-32T00:00:00Z", "2001-01-01T24:00:00Z", "2001-01-01T00:60:00Z",
        "2001-01-01T00:00:60Z", "2001-01-01T00:00:00", "2001-01-01 00:00:00Z", "2001-01-01T00:00Z",
        "2001-01-01T00:00:00.5Z", "2001-01-01T00:00:00z", " 2001-01-01T00:00:00Z",
        "-001-01-01T00:00:00Z", "2001-+1-01T00:00:00Z", "20x1-01-01T00:00:00Z"}) {
    EXPECT_FALSE(read(text)) << text;
  }
}

TEST(PropertyListXml, WritesDatesToTheEdgesOfTheirRange) {
  for (const char* text :
       {"0000-01-01T00:00:00Z", "1582-10-15T01:02:03Z", "9999-12-31T23:59:59Z"}) {
    const std::string document = Document("<date>" + std::string(text) + "</date>");
    const auto date = Parse(document);
    ASSERT_TRUE(date) << text;
    EXPECT_EQ(SerializeXml(*date), document);
  }
}

TEST(PropertyListXml, CutsTheFractionOfADate) {
  const auto text = SerializeXml(PropertyList::Date{-0.25});
  ASSERT_TRUE(text);
  EXPECT_NE(text->find("2000-12-31T23:59:59Z"), std::string::npos);
}

TEST(PropertyListXml, ReadsBase64WithBlanksAnywhere) {
  const auto read = [](std::string_view text) {
    return Parse(Document("<data>" + std::string(text) + "</data>"));
  };
  EXPECT_EQ(read(""), PropertyList(DataOf("")));
  EXPECT_EQ(read(" \n\t"), PropertyList(DataOf("")));
  EXPECT_EQ(read("YQ=="), PropertyList(DataOf("a")));
  EXPECT_EQ(read("YWI="), PropertyList(DataOf("ab")));
  EXPECT_EQ(read("\n\tYW\n\tJj\r\n YWJj\tYQ = =\n"), PropertyList(DataOf("abcabca")));
  EXPECT_EQ(read("////+++/"), PropertyList(DataOf("\xFF\xFF\xFF\xFB\xEF\xBF")));
  for (const char* text : {"Y", "YQ", "YWI", "YQ=", "YQ===", "=", "====", "YW=I", "YQ==YQ==",
                           "YR==", "YWJ=", "Y-==", "_w==", "YWJj!", "YWJjY", "YWJj=", "YWJj===="}) {
    EXPECT_FALSE(read(text)) << text;
  }
}

TEST(PropertyListXml, WritesDataOfEveryLength) {
  std::string text;
  for (int length = 0; length < 70; ++length, text += static_cast<char>(length * 37)) {
    const auto written = SerializeXml(DataOf(text));
    ASSERT_TRUE(written);
    EXPECT_EQ(Parse(*written), PropertyList(DataOf(text)));
  }
}

struct Refused {
  const char* name;
  std::string document;
};

void PrintTo(const Refused& refused, std::ostream* out) { *out << refused.name; }

class RefusedXml : public testing::TestWithParam<Refused> {};

TEST_P(RefusedXml, GivesAReason) {
  std::string reason;
  EXPECT_FALSE(Parse(GetParam().document, &reason));
  EXPECT_FALSE(reason.empty());
}

INSTANTIATE_TEST_SUITE_P(
    PropertyListXml, RefusedXml,
    testing::Values(
        Refused{"Nothing", ""}, Refused{"Garbage", "hello"}, Refused{"NoValue", Document("")},
        Refused{"TwoValues", Document("<true/><false/>")},
        Refused{"TwoContainers", Document("<array/><dict/>")}, Refused{"NoPlistElement", "<dict/>"},
        Refused{"OtherRoot", "<list><true/></list>"},
        Refused{"PlistInside", "<plist><plist><true/></plist></plist>"},
        Refused{"PlistInArray", Document("<array><plist/></array>")},
        Refused{"OtherVersion", "<plist version=\"2.0\"><true/></plist>"},
        Refused{"OtherAttribute", "<plist lang=\"en\"><true/></plist>"},
        Refused{"AttributeOfValue", Document("<string id=\"1\">a</string>")},
        Refused{"UnknownElement", Document("<null/>")},
        Refused{"LongerName", Document("<strings>a</strings>")},
        Refused{"UpperCaseName", Document("<True/>")},
        Refused{"TrailingText", Document("<true/>") + "junk"},
        Refused{"TrailingNul", Document("<true/>") + std::string(1, '\0')},
        Refused{"TwoDocuments", Document("<true/>") + Document("<true/>")},
        Refused{"CutOff", Document("<string>abc</string>").substr(0, 70)},
        Refused{"TextInPlist", Document("a<true/>")},
        Refused{"TextInArray", Document("<array>a</array>")},
        Refused{"TextInDictionary", Document("<dict>a</dict>")},
        Refused{"TextInBoolean", Document("<true>yes</true>")},
        Refused{"BlankInBoolean", Document("<true> </true>")},
        Refused{"ElementInText", Document("<string>a<true/></string>")},
        Refused{"ElementInBoolean", Document("<true><false/></true>")},
        Refused{"ContainerInText", Document("<string><array/></string>")},
        Refused{"KeyWithoutValue", Document("<dict><key>a</key></dict>")},
        Refused{"KeyWithoutValueAtEnd", Document("<dict><key>a</key><true/><key>b</key></dict>")},
        Refused{"ValueWithoutKey", Document("<dict><true/></dict>")},
        Refused{"ContainerWithoutKey", Document("<dict><array/></dict>")},
        Refused{"KeyTwice", Document("<dict><key>a</key><true/><key>a</key><false/></dict>")},
        Refused{"KeyAfterKey", Document("<dict><key>a</key><key>b</key><true/></dict>")},
        Refused{"KeyInArray", Document("<array><key>a</key></array>")},
        Refused{"KeyAtRoot", Document("<key>a</key>")},
        Refused{"InternalSubset",
                "<!DOCTYPE plist [<!ENTITY a \"b\">]><plist><string>&a;</string></plist>"},
        Refused{"EmptyInternalSubset", "<!DOCTYPE plist []><plist><true/></plist>"},
        Refused{"UnknownEntity", Document("<string>&nbsp;</string>")},
        Refused{"UnknownEntityBehindDocumentType",
                "<!DOCTYPE plist SYSTEM \"a.dtd\"><plist><string>a&b;c</string></plist>"},
        Refused{"ControlCharacter", Document("<string>\x01</string>")},
        Refused{"ControlReference", Document("<string>&#1;</string>")},
        Refused{"NulReference", Document("<string>&#0;</string>")},
        Refused{"SurrogateReference", Document("<string>&#xD800;</string>")},
        Refused{"NonCharacterReference", Document("<string>&#xFFFE;</string>")},
        Refused{"BadUtf8", Document("<string>\xC3(</string>")},
        Refused{"OverlongUtf8", Document("<string>\xC0\xAF</string>")},
        Refused{"UnknownEncoding",
                "<?xml version=\"1.0\" encoding=\"EBCDIC\"?><plist><true/></plist>"}),
    [](const auto& test) { return std::string(test.param.name); });

TEST(PropertyListXml, NamesTheLineOfADefect) {
  std::string reason;
  EXPECT_FALSE(Parse(Document("<dict>\n<key>a</key>\n<integer>x</integer>\n</dict>"), &reason));
  EXPECT_EQ(reason, "line 5: not an integer");
}

}  // namespace
