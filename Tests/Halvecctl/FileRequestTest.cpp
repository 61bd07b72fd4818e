// SPDX-License-Identifier: Apache-2.0
//
// halvecctl bundle, path and plist: the literal requests they make, and what they print.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "Tests/Halvecctl/Answered.h"

namespace {

using fake::Bytes;
using fake::DataReply;
using fake::Hex;
using fake::PlainReply;
using fake::Slot;
using fake::Text;
using program::Exchange;
using program::Outcome;
using program::RunAnswered;
using program::RunProgram;

constexpr std::uint32_t kSetReply = 0x84808a;
constexpr std::uint32_t kCreateReply = 0x84808b;
constexpr std::uint32_t kRemoveReply = 0x84808c;
constexpr std::uint32_t kShowReply = 0x848097;

/// The header of a request and its NDR record, as the transport describes them.
Bytes Head(const char* size, const char* id) {
  return Hex("00000000") + Hex(size) + Hex("000000000000000000000000") + Hex(id) +
         Hex("0000000001000000");
}

TEST(BundleLink, SendsTargetPathAndDomain) {
  const Exchange exchange =
      RunAnswered({"bundle", "link", "/target", "/link path", "--domain", "com.example"},
                  PlainReply(kSetReply, 0));
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.outcome.output, "");
  EXPECT_EQ(exchange.request, Head("200c0000", "26808400") + Slot(1024, "/target") +
                                  Slot(1024, "/link path") + Slot(1024, "com.example"));
}

TEST(BundleLink, SendsAnEmptyDomainWhereNoneIsGiven) {
  const Exchange exchange =
      RunAnswered({"bundle", "link", "t", "p", "--json"}, PlainReply(kSetReply, 0));
  EXPECT_EQ(exchange.outcome.output, "{\"code\":0,\"codeName\":\"KERN_SUCCESS\"}\n");
  EXPECT_EQ(exchange.request,
            Head("200c0000", "26808400") + Slot(1024, "t") + Slot(1024, "p") + Slot(1024, ""));
}

TEST(BundleLink, MakesTheUncheckedRequestOnDemand) {
  const Exchange exchange =
      RunAnswered({"bundle", "link", "t", "p", "--unchecked"}, PlainReply(kCreateReply, 0));
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.request, Head("20080000", "27808400") + Slot(1024, "t") + Slot(1024, "p"));
}

TEST(BundleLink, FailsWithTheHelpersCode) {
  const Outcome outcome =
      RunAnswered({"bundle", "link", "t", "p"}, PlainReply(kSetReply, 8)).outcome;
  EXPECT_EQ(outcome.exitCode, 1);
  EXPECT_EQ(outcome.errors,
            "halvecctl: the helper answered with a failure, code 8 (KERN_NO_ACCESS)\n");
}

TEST(BundleUnlink, SendsPathAndDomain) {
  const Exchange exchange = RunAnswered({"bundle", "unlink", "p", "--domain", "com.example"},
                                        PlainReply(kRemoveReply, 0));
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.request,
            Head("20080000", "28808400") + Slot(1024, "p") + Slot(1024, "com.example"));
  EXPECT_EQ(RunAnswered({"bundle", "unlink", "p"}, PlainReply(kRemoveReply, 5)).outcome.exitCode,
            1);
}

Bytes FileReply(const std::string& content) {
  return DataReply(kShowReply, 0, static_cast<std::uint32_t>(content.size())) + Text(content);
}

TEST(PlistShow, PrintsTheXmlThatTheHelperAnswers) {
  const std::string xml =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict/>\n</plist>\n";
  const Exchange exchange = RunAnswered({"plist", "show", "/p"}, FileReply(xml));
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.outcome.output, xml);
  EXPECT_EQ(exchange.request, Head("20010000", "33808400") + Slot(256, "/p"));
}

TEST(PlistShow, PrintsJsonOnRequest) {
  const Exchange exchange =
      RunAnswered({"plist", "show", "/p", "--json"},
                  FileReply("<plist><dict><key>k</key><integer>7</integer></dict></plist>"));
  EXPECT_EQ(exchange.outcome.output, "{\"k\":7}\n");
}

TEST(PlistShow, FailsWithTheHelpersCodeAndRefusesRubbish) {
  const Outcome missing = RunAnswered({"plist", "show", "/p"}, PlainReply(kShowReply, 9)).outcome;
  EXPECT_EQ(missing.exitCode, 1);
  EXPECT_EQ(missing.errors,
            "halvecctl: the helper answered with a failure, code 9 (KERN_MEMORY_FAILURE)\n");
  const Outcome rubbish = RunAnswered({"plist", "show", "/p"}, FileReply("rubbish")).outcome;
  EXPECT_EQ(rubbish.exitCode, 5);
  EXPECT_EQ(rubbish.output, "");
}

std::string Explain(const std::string& path) {
  const Outcome outcome = RunProgram({"path", "explain", path});
  EXPECT_EQ(outcome.exitCode, 0) << outcome.errors;
  return outcome.output;
}

TEST(PathExplain, NamesTheRuleThatAllows) {
  EXPECT_EQ(Explain("/private/var/mobile/Library/Carrier Bundles/x"),
            "link there:             refused: is not on the list\n"
            "remove or place there:  allowed: begins with the system's carrier-bundles directory "
            "/private/var/mobile/Library/Carrier Bundles\n");
  EXPECT_EQ(Explain("/private/var/mobile/Library/CarrierDefault.bundle"),
            "link there:             allowed: is on the list as "
            "/private/var/mobile/Library/CarrierDefault.bundle\n"
            "remove or place there:  allowed: is on the list as "
            "/private/var/mobile/Library/CarrierDefault.bundle\n");
  EXPECT_EQ(Explain("/tmp/no-such.tcbk"),
            "link there:             refused: is not on the list\n"
            "remove or place there:  allowed: ends with .tcbk and begins with /tmp\n");
}

TEST(PathExplain, NamesTheRuleThatRefuses) {
  EXPECT_EQ(Explain("/etc"),
            "link there:             refused: a directory or FIFO stands there\n"
            "remove or place there:  refused: a directory or FIFO stands there, in no "
            "carrier-bundles directory, and no package (/tmp... .tcbk)\n");
  EXPECT_EQ(Explain("/etc/passwd"),
            "link there:             refused: is not on the list\n"
            "remove or place there:  refused: is not on the list, in no carrier-bundles "
            "directory, and no package (/tmp... .tcbk)\n");
}

TEST(PathExplain, AnswersInJson) {
  const Outcome outcome = RunProgram({"path", "explain", "/tmp/no-such.tcbk", "--json"});
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_EQ(outcome.output.find("{\"path\":\"/tmp/no-such.tcbk\",\"home\":"), 0U);
  EXPECT_NE(outcome.output.find("\"link\":{\"allowed\":false,\"rule\":\"unlisted\"},"
                                "\"place\":{\"allowed\":true,\"rule\":\"package\","
                                "\"place\":\"/tmp\"}}\n"),
            std::string::npos)
      << outcome.output;
}

}  // namespace
