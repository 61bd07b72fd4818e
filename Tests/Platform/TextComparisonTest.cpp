// SPDX-License-Identifier: Apache-2.0
//
// Equality of text with case ignored and digits by value. One thread.
#include "Helper/Platform/TextComparison.h"

#include <gtest/gtest.h>

#include <string>

namespace {

/// Both ways round, because equality knows no sides.
bool Equal(const std::string& left, const std::string& right) {
  const bool equal = platform::EqualIgnoringCaseWithNumbers(left, right);
  EXPECT_EQ(platform::EqualIgnoringCaseWithNumbers(right, left), equal) << left << " " << right;
  return equal;
}

TEST(TextComparison, IgnoresTheCaseOfLetters) {
  EXPECT_TRUE(Equal("", ""));
  EXPECT_TRUE(Equal("1.0.A", "1.0.a"));
  EXPECT_TRUE(Equal("Release-ABCXYZ", "rELEASE-abcxyz"));
  EXPECT_FALSE(Equal("a", "b"));
  EXPECT_FALSE(Equal("[", "{")) << "32 apart as the letters are, but no letters";
  EXPECT_FALSE(Equal("@", "`"));
}

TEST(TextComparison, TakesARunOfDigitsByItsValue) {
  EXPECT_TRUE(Equal("7", "007"));
  EXPECT_TRUE(Equal("1.02.3", "01.2.003"));
  EXPECT_TRUE(Equal("0", "0000"));
  EXPECT_TRUE(Equal("v0a", "V00A"));
  EXPECT_FALSE(Equal("2", "3"));
  EXPECT_FALSE(Equal("1.10", "1.1"));
  EXPECT_FALSE(Equal("10", "1"));
  EXPECT_FALSE(Equal("1.0", "10"));
  EXPECT_FALSE(Equal("-1", "1"));
}

TEST(TextComparison, TakesDigitsOfAnyNumber) {
  const std::string nines(500, '9');
  EXPECT_TRUE(Equal(nines, std::string(100'000, '0') + nines));
  EXPECT_FALSE(Equal(nines, nines + "9"));
  EXPECT_FALSE(Equal("18446744073709551616", "0")) << "2 to the 64th is not 0";
  EXPECT_FALSE(Equal("18446744073709551617", "18446744073709551618"));
}

TEST(TextComparison, TellsABeginningFromTheWhole) {
  EXPECT_FALSE(Equal("", "0"));
  EXPECT_FALSE(Equal("", "a"));
  EXPECT_FALSE(Equal("1", "1."));
  EXPECT_FALSE(Equal("1.0", "1.0.0"));
  EXPECT_FALSE(Equal("a", "a0"));
  EXPECT_FALSE(Equal("1 ", "1"));
}

TEST(TextComparison, IgnoresCaseInEveryScript) {
  EXPECT_TRUE(Equal("Ä1É", "ä01é"));
  EXPECT_TRUE(Equal("ВЕРСИЯ", "версия"));
  EXPECT_TRUE(Equal("ΣΣ", "σς"));
  EXPECT_TRUE(Equal("\U00010400", "\U00010428")) << "beyond the basic plane";
  EXPECT_FALSE(Equal("ä", "a"));
  EXPECT_FALSE(Equal("é", "e\u0301")) << "nothing is normalised";
  EXPECT_FALSE(Equal("ß", "SS"));
  EXPECT_TRUE(Equal("東京 2", "東京 02"));
}

TEST(TextComparison, TakesOnlyTheDigits0To9ByValue) { EXPECT_FALSE(Equal("\u0661", "1")); }

TEST(TextComparison, OfWhatIsNotUtf8IsThatOfItsBytes) {
  EXPECT_TRUE(Equal("a\xff", "a\xff"));
  EXPECT_FALSE(Equal("a\xff", "A\xff"));
  EXPECT_FALSE(Equal("\xc3", "\xe4"));
  EXPECT_FALSE(Equal(std::string("1\0", 2), "1"));
}

}  // namespace
