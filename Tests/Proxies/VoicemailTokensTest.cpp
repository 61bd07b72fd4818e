// SPDX-License-Identifier: Apache-2.0
//
// The six token requests over real ports, on a store in memory.
#include "Tests/Support/ServerFixture.h"

namespace {

using support::Bytes;
using support::Get;

constexpr std::int32_t kSet = 8683549;
constexpr std::int32_t kSetForKey = 8683550;
constexpr std::int32_t kClear = 8683551;
constexpr std::int32_t kReset = 8683552;
constexpr std::int32_t kCopyForKey = 8683553;
constexpr std::int32_t kCopy = 8683554;

const std::vector<std::string> kNotUtf8{
    "\xff", "a\x80", "\xc0\x80", "\xed\xa0\x80", "\xf4\x90\x80\x80", "cut \xe2\x82"};

class VoicemailTokens : public support::ServerFixture {
 protected:
  void SetUp() override {
    start();
    client = connect();
  }
  /// Sends a request whose body is these texts; the reply.
  Bytes send(std::int32_t id, const std::vector<std::string>& texts) {
    Bytes bytes = support::Message(
        id, texts.empty() ? 24U : 32U + 256U * static_cast<std::uint32_t>(texts.size()));
    std::size_t at = 32;
    for (const std::string& text : texts) {
      support::PutText(bytes, at, text);
      at += 256;
    }
    return request(*client, bytes).bytes;
  }
  /// A reply with a code, and the slot of a text where it carries one.
  static Bytes reply(std::int32_t id, std::int32_t code) {
    Bytes bytes(36);
    support::Put(bytes, 4, 36U);
    support::Put(bytes, 20, id + 100);
    bytes[28] = 1;
    support::Put(bytes, 32, code);
    return bytes;
  }
  static Bytes reply(std::int32_t id, const std::string& text) {
    Bytes bytes = reply(id, 0);
    bytes.resize(292);
    support::Put(bytes, 4, 292U);
    support::PutText(bytes, 36, text);
    return bytes;
  }

  std::unique_ptr<support::WireClient> client;
};

TEST_F(VoicemailTokens, AreCopiedAsTheyWereSet) {
  EXPECT_EQ(send(kSet, {"t0ken \xe2\x82\xac"}), reply(kSet, 0));
  EXPECT_EQ(send(kCopy, {}), reply(kCopy, "t0ken \xe2\x82\xac"));
  EXPECT_EQ(send(kSetForKey, {"key", "other"}), reply(kSetForKey, 0));
  EXPECT_EQ(send(kCopyForKey, {"key"}), reply(kCopyForKey, "other"));
  EXPECT_EQ(send(kCopy, {}), reply(kCopy, "t0ken \xe2\x82\xac")) << "tokens by key stand apart";
}

TEST_F(VoicemailTokens, ThatAreAbsentComeOutAsTheEmptyText) {
  EXPECT_EQ(send(kCopy, {}), reply(kCopy, ""));
  EXPECT_EQ(send(kCopyForKey, {"key"}), reply(kCopyForKey, ""));
  EXPECT_EQ(send(kSetForKey, {"key", ""}), reply(kSetForKey, 0));
  EXPECT_EQ(send(kCopyForKey, {"key"}), reply(kCopyForKey, ""));
  EXPECT_EQ(tokens.copyToken("key"), "");
}

TEST_F(VoicemailTokens, MayHaveTheEmptyKey) {
  EXPECT_EQ(send(kSetForKey, {"", "token"}), reply(kSetForKey, 0));
  EXPECT_EQ(send(kCopyForKey, {""}), reply(kCopyForKey, "token"));
}

TEST_F(VoicemailTokens, WithoutTheirZeroAreReadUpToTheLastByteButOne) {
  EXPECT_EQ(send(kSet, {std::string(256, 't')}), reply(kSet, 0));
  EXPECT_EQ(send(kCopy, {}), reply(kCopy, std::string(255, 't')));
  EXPECT_EQ(send(kSetForKey, {std::string(256, 'k'), std::string(256, 'v')}), reply(kSetForKey, 0));
  EXPECT_EQ(tokens.copyToken(std::string(255, 'k')), std::string(255, 'v'));
}

TEST_F(VoicemailTokens, ThatAreNotUtf8Answer5AndNothingIsStored) {
  ASSERT_EQ(send(kSet, {"before"}), reply(kSet, 0));
  for (const std::string& text : kNotUtf8) {
    EXPECT_EQ(send(kSet, {text}), reply(kSet, 5));
    EXPECT_EQ(send(kSetForKey, {"key", text}), reply(kSetForKey, 5));
    EXPECT_EQ(send(kSetForKey, {text, "token"}), reply(kSetForKey, 5));
    EXPECT_EQ(send(kCopyForKey, {text}), reply(kCopyForKey, 5));
  }
  EXPECT_EQ(tokens.copyCurrentToken(), "before");
  EXPECT_FALSE(tokens.copyToken("key"));
}

TEST_F(VoicemailTokens, ReadUpToTheirZeroAreNotJudgedByWhatStandsBehindIt) {
  Bytes bytes = support::Message(kSet, 288);
  support::PutText(bytes, 32, "token");
  bytes[38] = 0xff;
  EXPECT_EQ(request(*client, bytes).bytes, reply(kSet, 0));
  EXPECT_EQ(tokens.copyCurrentToken(), "token");
}

TEST_F(VoicemailTokens, TooLongForTheReplyComeOutAsTheEmptyText) {
  tokens.setCurrentToken(std::string(256, 't'));
  tokens.setToken("key", std::string(100'000, 't'));
  EXPECT_EQ(send(kCopy, {}), reply(kCopy, ""));
  EXPECT_EQ(send(kCopyForKey, {"key"}), reply(kCopyForKey, ""));
  tokens.setCurrentToken(std::string(255, 't'));
  EXPECT_EQ(send(kCopy, {}), reply(kCopy, std::string(255, 't')));
}

TEST_F(VoicemailTokens, ClearedLeaveNoCurrentToken) {
  ASSERT_EQ(send(kSet, {"token"}), reply(kSet, 0));
  tokens.addRecord();
  EXPECT_EQ(send(kClear, {}), reply(kClear, 0));
  EXPECT_FALSE(tokens.copyCurrentToken());
  EXPECT_EQ(tokens.records(), 1) << "the records stay";
  EXPECT_EQ(send(kClear, {}), reply(kClear, 0)) << "with nothing to clear";
}

TEST_F(VoicemailTokens, AreClearedWithTheRecordsByAResetButNotThoseByKey) {
  ASSERT_EQ(send(kSet, {"token"}), reply(kSet, 0));
  ASSERT_EQ(send(kSetForKey, {"key", "token"}), reply(kSetForKey, 0));
  tokens.addRecord();
  (void)tokens.takeChanges();
  EXPECT_EQ(send(kReset, {}), reply(kReset, 0));
  using enum fakes::FakeVoicemailTokenStore::Change;
  EXPECT_EQ(tokens.takeChanges(), (std::vector{kClearCurrentToken, kRemoveAllRecords}))
      << "the current token first";
  EXPECT_FALSE(tokens.copyCurrentToken());
  EXPECT_EQ(tokens.records(), 0);
  EXPECT_EQ(tokens.copyToken("key"), "token");
}

}  // namespace
