// SPDX-License-Identifier: Apache-2.0
//
// File names of preference domains. One thread.
#include "Helper/Platform/Linux/PreferenceFileName.h"

#include <gtest/gtest.h>

#include <set>

namespace {

using platform::PreferenceFileName;
using platform::Sha256Digits;
using namespace std::string_literals;

TEST(PreferenceFileName, LeavesPlainIdentifiersAsTheyAre) {
  for (const char* domain : {"com.zarvo.carrier", "a", "A-b_c.9", "com.zarvo..x"}) {
    EXPECT_EQ(PreferenceFileName(domain), domain);
  }
}

TEST(PreferenceFileName, EscapesWhatIsNoPlainLetter) {
  EXPECT_EQ(PreferenceFileName("a/b"), "a%2Fb");
  EXPECT_EQ(PreferenceFileName("../../etc/passwd"), "%2E.%2F..%2Fetc%2Fpasswd");
  EXPECT_EQ(PreferenceFileName(".hidden"), "%2Ehidden");
  EXPECT_EQ(PreferenceFileName(".."), "%2E.");
  EXPECT_EQ(PreferenceFileName("50%"), "50%25");
  EXPECT_EQ(PreferenceFileName("a b\n"), "a%20b%0A");
  EXPECT_EQ(PreferenceFileName("a\0b"s), "a%00b");
  EXPECT_EQ(PreferenceFileName("\xC3\xA9"), "%C3%A9");
  EXPECT_EQ(PreferenceFileName(""), "%");
}

TEST(PreferenceFileName, IsAlwaysOneSafeComponent) {
  for (int length = 0; length < 300; ++length) {
    for (const char c : {'a', '.', '/', '\0', '%', '\xFF'}) {
      const std::string name = PreferenceFileName(std::string(static_cast<std::size_t>(length), c));
      EXPECT_LE(name.size(), 160U);
      EXPECT_EQ(name.find('/'), std::string::npos);
      EXPECT_EQ(name.find('\0'), std::string::npos);
      EXPECT_NE(name.front(), '.');
    }
  }
}

TEST(PreferenceFileName, DiffersWhereverTheDomainDiffers) {
  std::set<std::string> names;
  std::size_t count = 0;
  const auto add = [&](const std::string& domain) {
    names.insert(PreferenceFileName(domain));
    ++count;
  };
  for (std::size_t length = 0; length < 400; ++length) {
    add(std::string(length, 'a'));
    add(std::string(length, 'a') + "/");
    add(std::string(length, 'a') + "%2F");
    add(std::string(length, 'a') + ".");
  }
  for (int c = 0; c < 256; ++c) {
    if (c == '.' || c == '/') continue;  // already there, behind no letter
    add(std::string(1, static_cast<char>(c)) + "!");
    add(std::string(200, 'b') + static_cast<char>(c));
  }
  EXPECT_EQ(names.size(), count);
}

TEST(PreferenceFileName, EndsInTheDigestWhenItWouldBeTooLong) {
  const std::string domain(255, 'a');
  EXPECT_EQ(PreferenceFileName(std::string(160, 'a')), std::string(160, 'a'));
  EXPECT_EQ(PreferenceFileName(domain), std::string(80, 'a') + "%~" + Sha256Digits(domain));
}

// The examples that the standard's publisher gives.
TEST(Sha256, HasTheDigestsOfThePublishedExamples) {
  EXPECT_EQ(Sha256Digits(""), "E3B0C44298FC1C149AFBF4C8996FB92427AE41E4649B934CA495991B7852B855");
  EXPECT_EQ(Sha256Digits("abc"),
            "BA7816BF8F01CFEA414140DE5DAE2223B00361A396177A9CB410FF61F20015AD");
  EXPECT_EQ(Sha256Digits("abcdbcdecdefdefgefghfghighijhijkijkljklmklmnlmnomnopnopq"),
            "248D6A61D20638B8E5C026930C3E6039A33CE45964FF2167F6ECEDD419DB06C1");
  EXPECT_EQ(Sha256Digits(std::string(1'000'000, 'a')),
            "CDC76E5C9914FB9281A1C7E284D73E67F1809A48A497200E046D39CCC7112CD0");
}

}  // namespace
