// SPDX-License-Identifier: Apache-2.0
//
// halvecctl against the helper's side of the wire in literal bytes.
#include <gtest/gtest.h>

#include <cstdio>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "Tests/Client/FakeHelper.h"
#include "Tests/Halvecctl/Answered.h"
#include "Tests/Halvecctl/Program.h"

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

const std::string kXmlHead =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n";

std::string Xml(const std::string& value) { return kXmlHead + value + "\n</plist>\n"; }

Bytes ValueReply(const std::string& content, std::uint32_t id = 0x848088) {
  return DataReply(id, 0, static_cast<std::uint32_t>(content.size())) + Text(content);
}

/// The value that a set carried, behind domain "com.example" and key "Key".
std::string ValueOf(const Bytes& request) {
  EXPECT_GE(request.size(), 568U);
  EXPECT_EQ(Bytes(request.begin() + 52, request.begin() + 564),
            Slot(256, "com.example") + Slot(256, "Key"));
  return {request.begin() + 568, request.end()};
}

std::string Set(std::vector<std::string> value, const std::string& input = "") {
  value.insert(value.begin(), {"preference", "set", "com.example", "Key"});
  const Exchange exchange = RunAnswered(value, PlainReply(0x848087, 0), input);
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.outcome.output, "");
  return ValueOf(exchange.request);
}

void ExpectHolds(const std::string& text, const std::string& part) {
  EXPECT_NE(text.find(part), std::string::npos) << text << " lacks " << part;
}

TEST(PreferenceSet, SendsTheValueInItsType) {
  ExpectHolds(Set({"a<b"}), "<string>a&lt;b</string>");
  ExpectHolds(Set({"true"}), "<string>true</string>");
  ExpectHolds(Set({"7", "--string"}), "<string>7</string>");
  ExpectHolds(Set({"-7", "--integer"}), "<integer>-7</integer>");
  ExpectHolds(Set({"0xff", "--integer"}), "<integer>255</integer>");
  ExpectHolds(Set({"18446744073709551615", "--integer"}),
              "<integer>18446744073709551615</integer>");
  ExpectHolds(Set({"1.5", "--real"}), "<real>1.5</real>");
  ExpectHolds(Set({"true", "--boolean"}), "<true/>");
  ExpectHolds(Set({"--boolean", "false"}), "<false/>");
  ExpectHolds(Set({"--", "--json"}), "<string>--json</string>");
}

TEST(PreferenceSet, SendsAFileAsItIs) {
  const std::string list = "<plist><array><true/></array></plist>";
  EXPECT_EQ(Set({"--plist", "-"}, list), list);
  const std::string binary = std::string("bplist00\x09\x08", 10) + std::string(6, '\0') +
                             "\x01\x01" + std::string(7, '\0') + "\x01" + std::string(15, '\0') +
                             "\x09";
  EXPECT_EQ(Set({"--plist", "-"}, binary), binary);
}

TEST(PreferenceSet, FailsWithTheHelpersCode) {
  const Exchange exchange =
      RunAnswered({"preference", "set", "d", "k", "v"}, PlainReply(0x848087, 5));
  EXPECT_EQ(exchange.outcome.exitCode, 1);
  EXPECT_EQ(exchange.outcome.output, "");
  EXPECT_EQ(exchange.outcome.errors,
            "halvecctl: the helper answered with a failure, code 5 (KERN_FAILURE)\n");
}

TEST(PreferenceRemove, SendsOneByte) {
  const Exchange exchange = RunAnswered({"preference", "remove", "com.example", "Key", "--json"},
                                        PlainReply(0x848087, 0));
  EXPECT_EQ(exchange.outcome.exitCode, 0);
  EXPECT_EQ(exchange.outcome.output, "{\"code\":0,\"codeName\":\"KERN_SUCCESS\"}\n");
  EXPECT_EQ(ValueOf(exchange.request), std::string(1, '\0'));
}

Outcome Get(const std::string& value, std::vector<std::string> options = {}) {
  options.insert(options.begin(), {"preference", "get", "d", "k"});
  return RunAnswered(options, ValueReply(Xml(value))).outcome;
}

TEST(PreferenceGet, PrintsAScalarAsItIs) {
  EXPECT_EQ(Get("<string>a &amp; b</string>").output, "a & b\n");
  EXPECT_EQ(Get("<integer>-12</integer>").output, "-12\n");
  EXPECT_EQ(Get("<real>0.5</real>").output, "0.5\n");
  EXPECT_EQ(Get("<true/>").output, "true\n");
  EXPECT_EQ(Get("<data>AAEC</data>").output, "AAEC\n");
  EXPECT_EQ(Get("<date>2024-02-29T23:59:58Z</date>").output, "2024-02-29T23:59:58Z\n");
  EXPECT_EQ(Get("<date>1999-12-31T00:00:00Z</date>").output, "1999-12-31T00:00:00Z\n");
}

TEST(PreferenceGet, PrintsAContainerAsXml) {
  const std::string list = "<dict>\n\t<key>a</key>\n\t<true/>\n</dict>";
  const Outcome outcome = Get(list);
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_EQ(outcome.output, Xml(list));
}

TEST(PreferenceGet, PrintsXmlOnRequest) {
  EXPECT_EQ(Get("<true/>", {"--xml"}).output, Xml("<true/>"));
}

TEST(PreferenceGet, PrintsJsonOnRequest) {
  EXPECT_EQ(Get("<dict><key>a\"b</key><array><integer>1</integer><real>-0.25</real><false/></array>"
                "<key>d</key><data>AA==</data><key>e</key><date>2001-01-01T00:00:00Z</date>"
                "<key>n</key><real>nan</real><key>s</key><string>x\ty\\z\xc3\xa9</string></dict>",
                {"--json"})
                .output,
            "{\"a\\\"b\":[1,-0.25,false],\"d\":\"AA==\",\"e\":\"2001-01-01T00:00:00Z\","
            "\"n\":\"nan\",\"s\":\"x\\ty\\\\z\xc3\xa9\"}\n");
}

TEST(PreferenceGet, AsksAsAnApplicationOnRequest) {
  const Exchange exchange =
      RunAnswered({"preference", "get", "--app", "d", "k"}, ValueReply(Xml("<true/>"), 0x848089));
  EXPECT_EQ(exchange.outcome.output, "true\n");
  EXPECT_EQ(Bytes(exchange.request.begin() + 20, exchange.request.begin() + 24), Hex("25808400"));
}

TEST(PreferenceGet, TellsAnAbsentValueByItsExitCode) {
  for (const auto& [option, output] :
       {std::pair{"--app", ""}, {"--xml", ""}, {"--json", "null\n"}}) {
    const std::uint32_t id = std::string(option) == "--app" ? 0x848089 : 0x848088;
    const Exchange exchange =
        RunAnswered({"preference", "get", "d", "k", option}, ValueReply("", id));
    EXPECT_EQ(exchange.outcome.exitCode, 6) << option;
    EXPECT_EQ(exchange.outcome.output, output) << option;
    EXPECT_EQ(exchange.outcome.errors, "") << option;
  }
}

TEST(PreferenceGet, RefusesAnAnswerThatIsNoPropertyList) {
  const Exchange exchange = RunAnswered({"preference", "get", "d", "k"}, ValueReply("nonsense"));
  EXPECT_EQ(exchange.outcome.exitCode, 5);
  EXPECT_EQ(exchange.outcome.output, "");
}

TEST(Call, MakesARequestByNameOrId) {
  for (const char* request : {"TriggerDatabaseUpdate", "8683563", "0x84802b"}) {
    const Exchange exchange = RunAnswered({"call", request, "0x80000001"}, PlainReply(0x84808f, 0));
    EXPECT_EQ(exchange.outcome.exitCode, 0);
    EXPECT_EQ(exchange.outcome.output, "code 0 (KERN_SUCCESS)\n");
    EXPECT_EQ(fake::ToHex(exchange.request),
              "00000000240000000000000000000000000000002b8084000000000001000000"
              "01000080");
  }
}

TEST(Call, TakesNegativeNumbersAndReals) {
  EXPECT_EQ(
      fake::ToHex(
          RunAnswered({"call", "SetRadioManagerLogging", "-0x2"}, PlainReply(0x848095, 0)).request)
          .substr(64),
      "feffffff");
  EXPECT_EQ(fake::ToHex(RunAnswered({"call", "RequestCountryCodeFromLocation", "52.5", "-13.25"},
                                    PlainReply(0x848093, 0))
                            .request)
                .substr(64),
            "0000000000404a400000000000802ac0");
}

TEST(Call, PrintsACodeAndExitsWithOne) {
  const Exchange text = RunAnswered({"call", "ClearVoicemailToken"}, PlainReply(0x848083, 8));
  EXPECT_EQ(text.outcome.exitCode, 1);
  EXPECT_EQ(text.outcome.output, "code 8 (KERN_NO_ACCESS)\n");
  const Exchange json =
      RunAnswered({"call", "ClearVoicemailToken", "--json"}, PlainReply(0x848083, 8));
  EXPECT_EQ(json.outcome.exitCode, 1);
  EXPECT_EQ(json.outcome.output,
            "{\"request\":\"ClearVoicemailToken\",\"id\":8683551,\"code\":8,"
            "\"codeName\":\"KERN_NO_ACCESS\",\"results\":{}}\n");
}

Bytes FlagReply(std::uint32_t id, const char* flag) {
  Bytes reply = PlainReply(id, 0) + Hex(flag);
  reply.at(4) = 40;
  return reply;
}

TEST(Call, ExitsWithOneWhenSuccessIsFalse) {
  const Exchange bad =
      RunAnswered({"call", "ExtractArchive", "a", "b"}, FlagReply(0x848096, "00000000"));
  EXPECT_EQ(bad.outcome.exitCode, 1);
  EXPECT_EQ(bad.outcome.output, "code 0 (KERN_SUCCESS)\nsuccess: false\n");
  const Exchange good =
      RunAnswered({"call", "ExtractArchive", "a", "b"}, FlagReply(0x848096, "01000000"));
  EXPECT_EQ(good.outcome.exitCode, 0);
  EXPECT_EQ(good.outcome.output, "code 0 (KERN_SUCCESS)\nsuccess: true\n");
}

TEST(Call, TakesNoForAnAnswerWhereTheFlagIsAQuestion) {
  const Exchange exchange =
      RunAnswered({"call", "IsVoicemailSubscribed", "--json"}, FlagReply(0x84808d, "00000000"));
  EXPECT_EQ(exchange.outcome.exitCode, 0);
  EXPECT_EQ(exchange.outcome.output,
            "{\"request\":\"IsVoicemailSubscribed\",\"id\":8683561,\"code\":0,"
            "\"codeName\":\"KERN_SUCCESS\",\"results\":{\"subscribed\":false}}\n");
}

Bytes TokenReply(const std::string& token) {
  Bytes reply = PlainReply(0x848086, 0) + Slot(256, token);
  reply.at(4) = 0x24;
  reply.at(5) = 0x01;
  return reply;
}

TEST(Call, PrintsATextResult) {
  EXPECT_EQ(RunAnswered({"call", "CopyVoicemailToken"}, TokenReply("t0ken")).outcome.output,
            "code 0 (KERN_SUCCESS)\ntoken: t0ken\n");
  EXPECT_EQ(
      RunAnswered({"call", "CopyVoicemailToken", "--raw"}, TokenReply("t0ken")).outcome.output,
      "t0ken");
}

TEST(Call, NeverPrintsWhatATerminalMightObey) {
  EXPECT_EQ(RunAnswered({"call", "CopyVoicemailToken"}, TokenReply("\x1b[2J\xff")).outcome.output,
            "code 0 (KERN_SUCCESS)\ntoken: \"\\u001b[2J\xef\xbf\xbd\"\n");
}

TEST(Call, PrintsDataAsTextOrBase64) {
  const std::vector<std::string> request{"call", "CopyPropertyListFile", "/p"};
  EXPECT_EQ(RunAnswered(request, ValueReply("<a/>\n", 0x848097)).outcome.output,
            "code 0 (KERN_SUCCESS)\ncontent: 5 bytes\n<a/>\n");
  const std::string binary("\x00\xff\x10\x80", 4);
  EXPECT_EQ(RunAnswered(request, ValueReply(binary, 0x848097)).outcome.output,
            "code 0 (KERN_SUCCESS)\ncontent: 4 bytes\nAP8QgA==\n");
  EXPECT_EQ(
      RunAnswered({"call", "CopyPropertyListFile", "/p", "--raw"}, ValueReply(binary, 0x848097))
          .outcome.output,
      binary);
  ExpectHolds(
      RunAnswered({"call", "CopyPropertyListFile", "/p", "--json"}, ValueReply(binary, 0x848097))
          .outcome.output,
      "\"results\":{\"content\":{\"bytes\":4,\"base64\":\"AP8QgA==\"}}");
  ExpectHolds(
      RunAnswered({"call", "CopyPropertyListFile", "/p", "--json"}, ValueReply("a\n", 0x848097))
          .outcome.output,
      "\"results\":{\"content\":{\"bytes\":2,\"text\":\"a\\n\"}}");
}

TEST(Call, SendsDataFromAFileOrStandardInput) {
  const Exchange piped = RunAnswered({"call", "SetPreferenceValue", "com.example", "Key", "-"},
                                     PlainReply(0x848087, 0), "some bytes");
  EXPECT_EQ(ValueOf(piped.request), "some bytes");
  const std::string golden = std::string(HALVECCTL_GOLDEN) + "/list.txt";
  const Exchange file = RunAnswered(
      {"call", "SetPreferenceValue", "com.example", "Key", "@" + golden}, PlainReply(0x848087, 0));
  EXPECT_EQ(file.outcome.exitCode, 0);
  EXPECT_EQ(ValueOf(file.request).find("id        hex"), 0U);
}

TEST(Call, NeverCutsAText) {
  fake::Service service;
  fake::Beside helper([&] {
    const fake::Connection connection = fake::Accept(service.socket());
    EXPECT_TRUE(fake::Receive(connection.clientPort.get()).bytes.empty());
  });
  const Outcome outcome = program::RunProgram(
      {"--service", service.path(), "call", "SetVoicemailToken", std::string(256, 'x')});
  EXPECT_EQ(outcome.exitCode, 2);
  EXPECT_EQ(outcome.errors, "halvecctl: a text or data is too long to be sent\n");
}

/// Runs a request against a service that does what `body` does.
Outcome RunBeside(fake::Service& service, const std::function<void()>& body,
                  const std::string& seconds = "10") {
  fake::Beside helper(body);
  return program::RunProgram(
      {"--service", service.path(), "--timeout", seconds, "call", "CopyCountryCode"});
}

TEST(ExitCode, IsThreeWithoutAService) {
  fake::Service service;
  service.close();
  const Outcome outcome = RunBeside(service, [] {});
  EXPECT_EQ(outcome.exitCode, 3);
  ExpectHolds(outcome.errors, "halvecctl: cannot connect to " + service.path() +
                                  ": the helper's service is not running");
}

TEST(ExitCode, IsThreeWhenTheConnectFails) {
  fake::Service service;
  const Outcome outcome =
      RunBeside(service, [&] { fake::AnswerConnect(service.socket(), PlainReply(4792274, 5)); });
  EXPECT_EQ(outcome.exitCode, 3);
  ExpectHolds(outcome.errors, "code 5 (KERN_FAILURE)");
}

TEST(ExitCode, IsFourForACallerWithoutTheEntitlement) {
  fake::Service service;
  const Outcome outcome =
      RunBeside(service, [&] { fake::AnswerConnect(service.socket(), PlainReply(4792274, 35)); });
  EXPECT_EQ(outcome.exitCode, 4);
  ExpectHolds(outcome.errors, "does not hold the entitlement, code 35 (KERN_INVALID_SECURITY)");
}

TEST(ExitCode, IsFiveWhenTheHelperGoesAway) {
  fake::Service service;
  const Outcome outcome = RunBeside(service, [&] {
    const fake::Connection connection = fake::Accept(service.socket());
    (void)fake::Receive(connection.privatePort.get());
  });
  EXPECT_EQ(outcome.exitCode, 5);
  EXPECT_EQ(outcome.errors, "halvecctl: the helper went away\n");
}

TEST(ExitCode, IsFiveWhenNobodyAnswersInTime) {
  fake::Service service;
  const Outcome outcome = RunBeside(
      service, [] {}, "0.05");
  EXPECT_EQ(outcome.exitCode, 5);
  ExpectHolds(outcome.errors, "the helper did not answer in time");
}

TEST(ExitCode, IsFiveForAnIllFormedAnswer) {
  EXPECT_EQ(RunAnswered({"call", "CopyCountryCode"}, PlainReply(0x848094, 0)).outcome.exitCode, 5);
}

}  // namespace
