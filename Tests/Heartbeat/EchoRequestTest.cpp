// SPDX-License-Identifier: Apache-2.0
//
// The echo request byte for byte, and every packet that may or may not answer it.
#include "Helper/Heartbeat/EchoRequest.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

namespace {

using platform::EchoTime;

std::string Hex(const EchoRequest& request) {
  std::string text;
  for (const std::byte byte : request) {
    constexpr char kDigits[] = "0123456789abcdef";
    text += kDigits[std::to_integer<unsigned>(byte) >> 4];
    text += kDigits[std::to_integer<unsigned>(byte) & 0xf];
  }
  return text;
}

TEST(EchoRequest, HasItsTypeChecksumIdentifierAndTimeInFortyEightBytesAndZerosElsewhere) {
  EXPECT_EQ(
      Hex(MakeEchoRequest(0x1234, {.seconds = 0x1122334455667788, .microseconds = 0x0b0a0d0e})),
      "080078a2"
      "12340000"
      "000000000000000000000000000000000000000000000000"
      "8877665544332211"
      "0e0d0a0b"
      "00000000");
}

TEST(EchoRequest, ChecksumComesOutAsZeroSumOverAllBytes) {
  for (unsigned identifier : {0U, 1U, 0x00ffU, 0xf7ffU, 0xffffU}) {
    const EchoRequest request = MakeEchoRequest(static_cast<std::uint16_t>(identifier),
                                                {.seconds = -1, .microseconds = -1});
    std::uint32_t sum = 0;
    for (std::size_t at = 0; at < request.size(); at += 2) {
      sum += std::to_integer<std::uint32_t>(request[at]) << 8;
      sum += std::to_integer<std::uint32_t>(request[at + 1]);
    }
    while (sum > 0xffff) sum = (sum & 0xffff) + (sum >> 16);
    EXPECT_EQ(sum, 0xffffU) << identifier;
  }
}

class EchoReply : public testing::Test {
 protected:
  /// A reply with a header of `words` words, in an otherwise clean buffer.
  void place(std::size_t words, int type = 0, std::uint16_t identifier = 0x1234) {
    buffer.fill(std::byte{0});
    buffer[0] = static_cast<std::byte>(0x40 | words);
    buffer[words * 4] = static_cast<std::byte>(type);
    buffer[words * 4 + 4] = static_cast<std::byte>(identifier >> 8);
    buffer[words * 4 + 5] = static_cast<std::byte>(identifier & 0xff);
  }
  [[nodiscard]] bool answers(std::int64_t length) const {
    return IsEchoReply(buffer, length, 0x1234);
  }
  EchoBuffer buffer{};
};

TEST_F(EchoReply, IsRecognisedBehindAHeaderOfAnyLength) {
  for (std::size_t words = 0; words <= 15; ++words) {
    place(words);
    if (words == 0) buffer[0] = std::byte{0};  // the header's byte is the type then
    EXPECT_TRUE(answers(static_cast<std::int64_t>(words * 4 + 48))) << words;
  }
}

TEST_F(EchoReply, MayBeLongerButNotShorterThanTheRequest) {
  place(5);
  EXPECT_TRUE(answers(20 + 48));
  EXPECT_TRUE(answers(2048));
  EXPECT_FALSE(answers(20 + 47));
  EXPECT_FALSE(answers(20));
}

TEST_F(EchoReply, ShorterThanItsOwnHeaderPassesTheTestOfItsLength) {
  place(5);
  EXPECT_TRUE(answers(19)) << "what stood in the buffer before is what is compared";
  EXPECT_TRUE(answers(1));
  EXPECT_TRUE(answers(0));
  buffer[20] = std::byte{8};
  EXPECT_FALSE(answers(19));
}

TEST_F(EchoReply, OfAnotherTypeIsNone) {
  for (const int type : {3, 8, 11, 255}) {
    place(5, type);
    EXPECT_FALSE(answers(68)) << type;
  }
}

TEST_F(EchoReply, OfAnotherIdentifierIsNone) {
  for (const int identifier : {0x3412, 0x1235, 0x0034, 0}) {
    place(5, 0, static_cast<std::uint16_t>(identifier));
    EXPECT_FALSE(answers(68)) << identifier;
  }
}

TEST_F(EchoReply, IsNotJudgedByItsCodeSequenceChecksumOrPayload) {
  place(5);
  std::fill(buffer.begin() + 26, buffer.end(), std::byte{0xff});
  buffer[21] = buffer[22] = buffer[23] = std::byte{0xff};
  EXPECT_TRUE(answers(68));
}

TEST_F(EchoReply, WithAHeaderLengthThatPointsElsewhereIsNone) {
  place(5);
  for (const unsigned words : {0U, 4U, 6U, 15U}) {
    buffer[0] = static_cast<std::byte>(0x40 | words);
    EXPECT_FALSE(answers(1000)) << words;
  }
}

}  // namespace
