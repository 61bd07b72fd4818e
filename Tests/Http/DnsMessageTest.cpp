// SPDX-License-Identifier: Apache-2.0
//
// Name queries and replies, byte for byte, and replies that nobody honest would send.
#include "Helper/Platform/Linux/DnsMessage.h"

#include <gtest/gtest.h>

#include <random>

namespace {

using platform::DecodeDnsReply;
using platform::DnsReply;
using platform::DnsType;
using platform::EncodeDnsQuery;
using Bytes = std::vector<std::uint8_t>;
using Kind = DnsReply::Kind;
using Addresses = std::vector<std::string>;

const Bytes kQuestion{3, 'w', 'e', 'b', 2, 'i', 'o', 0, 0, 1, 0, 1};

Bytes Joined(std::initializer_list<Bytes> parts) {
  Bytes whole;
  for (const Bytes& part : parts) whole.insert(whole.end(), part.begin(), part.end());
  return whole;
}

Bytes Query() { return EncodeDnsQuery(0x1234, "web.io", DnsType::kA); }

/// A reply's head: identifier, flags, one question, so many answers.
Bytes Head(std::uint8_t answers, std::uint8_t code = 0, std::uint8_t flags = 0x81) {
  return {0x12, 0x34, flags, static_cast<std::uint8_t>(0x80 | code), 0, 1, 0, answers, 0, 0, 0, 0};
}

/// A record of the name that the question has, by reference.
Bytes Record(std::uint8_t type, const Bytes& data) {
  return Joined(
      {{0xc0, 12, 0, type, 0, 1, 0, 0, 0, 60, 0, static_cast<std::uint8_t>(data.size())}, data});
}

TEST(DnsQuery, IsOneRecursiveQuestion) {
  EXPECT_EQ(Query(), Joined({{0x12, 0x34, 1, 0, 0, 1, 0, 0, 0, 0, 0, 0}, kQuestion}));
  const Bytes six = EncodeDnsQuery(1, "web.io.", DnsType::kAaaa);
  EXPECT_EQ(six, Joined({{0, 1, 1, 0, 0, 1, 0, 0, 0, 0, 0, 0},
                         {3, 'w', 'e', 'b', 2, 'i', 'o', 0, 0, 28, 0, 1}}));
}

TEST(DnsQuery, HasOnlyNamesThatAreNames) {
  const std::string label(63, 'a');
  const std::string longest = label + "." + label + "." + label + "." + std::string(61, 'a');
  EXPECT_EQ(EncodeDnsQuery(1, longest, DnsType::kA).size(), 12U + 255U + 4U);
  EXPECT_FALSE(EncodeDnsQuery(1, label, DnsType::kA).empty());
  for (const std::string& name : {std::string(), std::string("."), std::string("a..b"),
                                  std::string(".a"), label + "a", longest + "a"}) {
    EXPECT_TRUE(EncodeDnsQuery(1, name, DnsType::kA).empty()) << name;
  }
}

TEST(DnsReplies, GiveTheAddressesInTheirOrder) {
  const Bytes packet =
      Joined({Head(2), kQuestion, Record(1, {192, 0, 2, 7}), Record(1, {192, 0, 2, 1})});
  const DnsReply reply = DecodeDnsReply(packet, Query());
  EXPECT_EQ(reply.kind, Kind::kAnswered);
  EXPECT_EQ(reply.addresses, (Addresses{"192.0.2.7", "192.0.2.1"}));
}

TEST(DnsReplies, GiveIpv6Addresses) {
  Bytes question = kQuestion;
  question[9] = 28;
  Bytes address(16);
  address[0] = 0x20;
  address[1] = 0x01;
  address[15] = 1;
  const DnsReply reply = DecodeDnsReply(Joined({Head(1), question, Record(28, address)}),
                                        EncodeDnsQuery(0x1234, "web.io", DnsType::kAaaa));
  EXPECT_EQ(reply.addresses, (Addresses{"2001::1"}));
}

TEST(DnsReplies, MayAnswerWithNothing) {
  const DnsReply reply = DecodeDnsReply(Joined({Head(0), kQuestion}), Query());
  EXPECT_EQ(reply.kind, Kind::kAnswered);
  EXPECT_TRUE(reply.addresses.empty());
}

TEST(DnsReplies, SayWhetherTheNameExists) {
  const auto kindOf = [](std::uint8_t code) {
    return DecodeDnsReply(Joined({Head(0, code), kQuestion}), Query()).kind;
  };
  EXPECT_EQ(kindOf(3), Kind::kNoSuchName);
  for (const int code : {1, 2, 4, 5, 15}) {
    EXPECT_EQ(kindOf(static_cast<std::uint8_t>(code)), Kind::kRefused) << code;
  }
}

TEST(DnsReplies, MayBeTruncated) {
  EXPECT_EQ(DecodeDnsReply(Joined({Head(1, 0, 0x83), kQuestion}), Query()).kind, Kind::kTruncated);
}

TEST(DnsReplies, AreForeignWhenAnythingDiffersFromTheQuery) {
  const Bytes good = Joined({Head(1), kQuestion, Record(1, {192, 0, 2, 7})});
  ASSERT_EQ(DecodeDnsReply(good, Query()).kind, Kind::kAnswered);
  for (const std::size_t at : {0, 1, 2, 5, 13, 14, 15, 17, 18, 19, 20, 21, 22, 23}) {
    Bytes other = good;
    other[at] ^= at == 2 ? 0x80 : 0x01;
    EXPECT_EQ(DecodeDnsReply(other, Query()).kind, Kind::kForeign) << at;
  }
  Bytes capitals = good;
  capitals[13] = 'W';
  EXPECT_EQ(DecodeDnsReply(capitals, Query()).kind, Kind::kAnswered) << "letters count as equal";
}

TEST(DnsReplies, GiveNoAddressOfAnotherNameTypeClassOrLength) {
  const Bytes stranger{1, 'x', 0, 0, 1, 0, 1, 0, 0, 0, 60, 0, 4, 192, 0, 2, 9};
  Bytes chaos = Record(1, {192, 0, 2, 8});
  chaos[5] = 3;
  const Bytes packet = Joined({Head(5), kQuestion, stranger, chaos, Record(1, {192, 0, 2}),
                               Record(28, Bytes(16)), Record(1, {192, 0, 2, 7})});
  EXPECT_EQ(DecodeDnsReply(packet, Query()).addresses, (Addresses{"192.0.2.7"}));
}

TEST(DnsReplies, LeadFromAliasToAlias) {
  const Bytes toX{1, 'x', 0};
  const Bytes toY{1, 'y', 0};
  const Bytes xIsY = Joined({toX, {0, 5, 0, 1, 0, 0, 0, 60, 0, 3}, toY});
  const Bytes y = Joined({toY, {0, 1, 0, 1, 0, 0, 0, 60, 0, 4, 192, 0, 2, 7}});
  const Bytes packet = Joined({Head(3), kQuestion, y, xIsY, Record(5, toX)});
  EXPECT_EQ(DecodeDnsReply(packet, Query()).addresses, (Addresses{"192.0.2.7"}));
}

TEST(DnsReplies, EndAtACircleOfAliases) {
  const Bytes packet = Joined({Head(1), kQuestion, Record(5, {0xc0, 12})});
  const DnsReply reply = DecodeDnsReply(packet, Query());
  EXPECT_EQ(reply.kind, Kind::kAnswered);
  EXPECT_TRUE(reply.addresses.empty());
}

TEST(DnsReplies, KeepWhatIsWholeOfWhatIsCutShort) {
  const Bytes whole =
      Joined({Head(2), kQuestion, Record(1, {192, 0, 2, 7}), Record(1, {192, 0, 2, 1})});
  for (std::size_t length = 0; length < whole.size(); ++length) {
    const Bytes cut(whole.begin(), whole.begin() + static_cast<long>(length));
    const DnsReply reply = DecodeDnsReply(cut, Query());
    EXPECT_EQ(reply.addresses.size(), length < 24 + 16 ? 0U : 1U) << length;
  }
}

TEST(DnsReplies, SurviveNamesThatReferToThemselves) {
  for (const Bytes& name : {Bytes{0xc0, 24}, Bytes{0xff, 0xff}, Bytes{63, 'a'}, Bytes{0x80, 1}}) {
    const Bytes packet =
        Joined({Head(1), kQuestion, name, {0, 1, 0, 1, 0, 0, 0, 60, 0, 4, 192, 0, 2, 7}});
    EXPECT_TRUE(DecodeDnsReply(packet, Query()).addresses.empty());
  }
}

TEST(DnsReplies, SurviveRandomBytesBehindTheQuestion) {
  std::mt19937 random(20241103);
  for (int round = 0; round < 20'000; ++round) {
    Bytes packet = Joined({Head(255), kQuestion, Bytes(random() % 120)});
    for (std::size_t i = 24; i < packet.size(); ++i) {
      packet[i] = static_cast<std::uint8_t>(random() % 4 ? random() % 16 : random());
    }
    EXPECT_NE(DecodeDnsReply(packet, Query()).kind, Kind::kForeign);
  }
}

}  // namespace
