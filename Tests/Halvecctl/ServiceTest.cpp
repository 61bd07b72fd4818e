// SPDX-License-Identifier: Apache-2.0
//
// halvecctl voicemail, heartbeat and radio-log: the literal requests they make, and what they make
// of the answers.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "Tests/Halvecctl/Answered.h"

namespace {

using fake::Bytes;
using fake::Hex;
using fake::PlainReply;
using fake::Slot;
using program::Exchange;
using program::RunAnswered;

/// A request in literal bytes; one without a body ends with its header.
Bytes Request(const char* size, const char* id, const Bytes& body = {}) {
  return Hex("00000000") + Hex(size) + Hex("000000000000000000000000") + Hex(id) +
         (body.empty() ? Bytes{} : Hex("0000000001000000") + body);
}

Bytes TokenReply(std::uint32_t id, const std::string& token) {
  Bytes reply = PlainReply(id, 0) + Slot(256, token);
  reply.at(4) = 0x24;
  reply.at(5) = 0x01;
  return reply;
}

constexpr std::uint32_t kCopied = 0x848086;
constexpr std::uint32_t kCopiedForKey = 0x848085;

TEST(VoicemailTokenSet, SendsTheTokenAlone) {
  const Exchange exchange =
      RunAnswered({"voicemail", "token", "set", "t0ken"}, PlainReply(0x848081, 0));
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.outcome.output, "");
  EXPECT_EQ(exchange.request, Request("20010000", "1d808400", Slot(256, "t0ken")));
}

TEST(VoicemailTokenSet, SendsKeyAndToken) {
  const Exchange exchange =
      RunAnswered({"voicemail", "token", "set", "t0ken", "--key", "k"}, PlainReply(0x848082, 0));
  EXPECT_EQ(exchange.request, Request("20020000", "1e808400", Slot(256, "k") + Slot(256, "t0ken")));
}

TEST(VoicemailTokenSet, ReadsALineOfStandardInput) {
  const Exchange exchange = RunAnswered({"voicemail", "token", "set", "-"}, PlainReply(0x848081, 0),
                                        "secret token\nnot this\n");
  EXPECT_EQ(exchange.request, Request("20010000", "1d808400", Slot(256, "secret token")));
}

TEST(VoicemailTokenSet, SaysWhatTheHelperAnswered) {
  const Exchange exchange =
      RunAnswered({"voicemail", "token", "set", "\xff"}, PlainReply(0x848081, 5));
  EXPECT_EQ(exchange.outcome.exitCode, 1);
  EXPECT_EQ(exchange.outcome.output, "");
  EXPECT_NE(exchange.outcome.errors.find("KERN_FAILURE"), std::string::npos)
      << exchange.outcome.errors;
}

TEST(VoicemailTokenGet, PrintsTheCurrentToken) {
  const Exchange exchange =
      RunAnswered({"voicemail", "token", "get"}, TokenReply(kCopied, "t0ken"));
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.outcome.output, "t0ken\n");
  EXPECT_EQ(exchange.request, Request("18000000", "22808400"));
}

TEST(VoicemailTokenGet, PrintsTheTokenOfAKey) {
  const Exchange exchange = RunAnswered({"voicemail", "token", "get", "--key", "k", "--json"},
                                        TokenReply(kCopiedForKey, "t0ken"));
  EXPECT_EQ(exchange.outcome.output, "\"t0ken\"\n");
  EXPECT_EQ(exchange.request, Request("20010000", "21808400", Slot(256, "k")));
}

TEST(VoicemailTokenGet, ExitsWithSixWithoutAToken) {
  const Exchange plain = RunAnswered({"voicemail", "token", "get"}, TokenReply(kCopied, ""));
  EXPECT_EQ(plain.outcome.exitCode, 6);
  EXPECT_EQ(plain.outcome.output, "");
  const Exchange json =
      RunAnswered({"voicemail", "token", "get", "--json"}, TokenReply(kCopied, ""));
  EXPECT_EQ(json.outcome.exitCode, 6);
  EXPECT_EQ(json.outcome.output, "null\n");
}

TEST(VoicemailTokenGet, NeverPrintsWhatATerminalMightObey) {
  EXPECT_EQ(
      RunAnswered({"voicemail", "token", "get"}, TokenReply(kCopied, "\x1b[2J")).outcome.output,
      "\"\\u001b[2J\"\n");
}

TEST(VoicemailTokenClear, ClearsTheCurrentTokenOrEmptiesThatOfAKey) {
  EXPECT_EQ(RunAnswered({"voicemail", "token", "clear"}, PlainReply(0x848083, 0)).request,
            Request("18000000", "1f808400"));
  EXPECT_EQ(
      RunAnswered({"voicemail", "token", "clear", "--key", "k"}, PlainReply(0x848082, 0)).request,
      Request("20020000", "1e808400", Slot(256, "k") + Slot(256, "")));
}

TEST(VoicemailReset, AsksForIt) {
  const Exchange exchange = RunAnswered({"voicemail", "reset", "--json"}, PlainReply(0x848084, 0));
  EXPECT_EQ(exchange.outcome.output, "{\"code\":0,\"codeName\":\"KERN_SUCCESS\"}\n");
  EXPECT_EQ(exchange.request, Request("18000000", "20808400"));
}

TEST(VoicemailSubscribed, PrintsTheAnswer) {
  for (const auto& [flag, word] : {std::pair{"01000000", "true"}, std::pair{"00000000", "false"}}) {
    Bytes reply = PlainReply(0x84808d, 0) + Hex(flag);
    reply.at(4) = 40;
    const Exchange exchange = RunAnswered({"voicemail", "subscribed"}, reply);
    EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
    EXPECT_EQ(exchange.outcome.output, std::string(word) + "\n");
    EXPECT_EQ(exchange.request, Request("18000000", "29808400"));
    EXPECT_EQ(RunAnswered({"voicemail", "subscribed", "--json"}, reply).outcome.output,
              "{\"subscribed\":" + std::string(word) + "}\n");
  }
}

TEST(Heartbeat, IsSwitchedByOneOrZero) {
  for (const auto& [word, value] :
       {std::pair{"start", "01000000"}, std::pair{"stop", "00000000"}}) {
    const Exchange exchange = RunAnswered({"heartbeat", word}, PlainReply(0x84808e, 0));
    EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
    EXPECT_EQ(exchange.outcome.output, "");
    EXPECT_EQ(exchange.request, Request("24000000", "2a808400", Hex(value)));
  }
}

TEST(RadioLog, IsSwitchedByOneOrZero) {
  for (const auto& [word, value] : {std::pair{"on", "01000000"}, std::pair{"off", "00000000"}}) {
    const Exchange exchange = RunAnswered({"radio-log", word}, PlainReply(0x848095, 0));
    EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
    EXPECT_EQ(exchange.request, Request("24000000", "31808400", Hex(value)));
  }
}

}  // namespace
