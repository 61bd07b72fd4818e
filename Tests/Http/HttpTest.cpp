// SPDX-License-Identifier: Apache-2.0
//
// The HTTP library's plain parts: header names, and the texts for the log.
#include "Helper/Platform/vlu/Http.h"

#include <gtest/gtest.h>

namespace {

using vlu::Http::asString;
using vlu::Http::ErrorType;
using vlu::Http::HeaderMap;

TEST(HeaderNames, AreOrderedWithoutRegardToCase) {
  const vlu::Http::case_insensitive_key_comparer before;
  EXPECT_TRUE(before("Accept", "content"));
  EXPECT_TRUE(before("accept", "CONTENT"));
  EXPECT_FALSE(before("content", "Accept"));
  EXPECT_FALSE(before("Accept", "ACCEPT"));
  EXPECT_FALSE(before("ACCEPT", "Accept"));
  EXPECT_TRUE(before("", "a"));
  EXPECT_TRUE(before("Accept", "Accept-Encoding"));
}

TEST(HeaderNames, FindAndKeepTheFirstSpelling) {
  HeaderMap headers{{"Content-Type", "text/plain"}};
  headers["content-type"] = "application/gzip";
  ASSERT_EQ(headers.size(), 1U);
  EXPECT_EQ(headers.begin()->first, "Content-Type");
  EXPECT_EQ(headers.find("CONTENT-TYPE")->second, "application/gzip");
}

TEST(HttpTexts, NameEveryErrorDifferently) {
  std::map<std::string, int> texts;
  for (int error = 0; error <= 11; ++error) ++texts[asString(static_cast<ErrorType>(error))];
  EXPECT_EQ(texts.size(), 12U);
  EXPECT_STREQ(asString(ErrorType::kSuccess), "success");
  EXPECT_EQ(static_cast<int>(ErrorType::kSuccess), 1);
  EXPECT_STREQ(asString(static_cast<ErrorType>(99)), "unknown error");
}

TEST(HttpTexts, NameTheStatusCodes) {
  EXPECT_STREQ(asString(0), "no status");
  EXPECT_STREQ(asString(200), "ok");
  EXPECT_STREQ(asString(304), "not modified");
  EXPECT_STREQ(asString(404), "not found");
  EXPECT_STREQ(asString(503), "service unavailable");
  for (const int none : {-1, 1, 199, 299, 418, 600}) EXPECT_STREQ(asString(none), "unknown status");
}

}  // namespace
