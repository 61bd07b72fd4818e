// SPDX-License-Identifier: Apache-2.0
//
// halvecctl location resolve and country against the helper's side of the wire in literal bytes.
#include <gtest/gtest.h>
#include <sys/socket.h>

#include <filesystem>
#include <string>
#include <vector>

#include "Helper/Platform/UnixSocketAddress.h"
#include "Tests/Client/FakeHelper.h"
#include "Tests/Halvecctl/Answered.h"
#include "Tests/Halvecctl/Program.h"

namespace {

using fake::Bytes;
using fake::FileDescriptor;
using fake::Hex;
using fake::PlainReply;
using fake::Slot;
using fake::Text;
using fake::Word;
using program::Exchange;
using program::Outcome;
using program::RunAnswered;
using program::RunProgram;

constexpr std::uint32_t kResolveReply = 0x848093;
constexpr std::uint32_t kCountryReply = 0x848094;

TEST(LocationResolve, SendsTheTwoNumbers) {
  const Exchange exchange =
      RunAnswered({"location", "resolve", "37.5", "-122"}, PlainReply(kResolveReply, 0));
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.outcome.output, "");
  EXPECT_EQ(fake::ToHex(exchange.request),
            "00000000300000000000000000000000000000002f80840000000000010000000000000000c042400000"
            "000000805ec0");
}

TEST(LocationResolve, SendsAlsoWhatIsNoCoordinate) {
  const Exchange exchange =
      RunAnswered({"location", "resolve", "nan", "inf"}, PlainReply(kResolveReply, 0));
  EXPECT_EQ(fake::ToHex(exchange.request).substr(64), "000000000000f87f000000000000f07f");
}

TEST(LocationResolve, FailsWithTheHelpersCode) {
  const Exchange exchange =
      RunAnswered({"location", "resolve", "1", "2"}, PlainReply(kResolveReply, 5));
  EXPECT_EQ(exchange.outcome.exitCode, 1);
}

TEST(LocationResolve, NeedsTwoNumbers) {
  for (const std::vector<std::string>& words : std::vector<std::vector<std::string>>{
           {}, {"1"}, {"1", "2", "3"}, {"1", "x"}, {"", "2"}, {"1,5", "2"}, {"1", "2", "--wat"}}) {
    std::vector<std::string> arguments{"location", "resolve"};
    arguments.insert(arguments.end(), words.begin(), words.end());
    EXPECT_EQ(RunProgram(arguments).exitCode, 2);
  }
}

Exchange Country(const std::string& slot, std::vector<std::string> options = {}) {
  Bytes reply = PlainReply(kCountryReply, 0) + Slot(64, slot);
  reply.at(4) = 100;
  options.insert(options.begin(), {"location", "country"});
  return RunAnswered(options, reply);
}

TEST(LocationCountry, PrintsTheCode) {
  const Exchange exchange = Country("CH");
  EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
  EXPECT_EQ(exchange.outcome.output, "CH\n");
  EXPECT_EQ(fake::ToHex(exchange.request), "000000001800000000000000000000000000000030808400");
  EXPECT_EQ(Country("CH", {"--json"}).outcome.output, "{\"countryCode\":\"CH\"}\n");
}

TEST(LocationCountry, PrintsATextThatFillsItsSlotWhole) {
  EXPECT_EQ(Country(std::string(64, 'x')).outcome.output, std::string(64, 'x') + "\n");
}

TEST(LocationCountry, IsNoCommandToTheTerminal) {
  EXPECT_EQ(Country("\x1b[2J").outcome.output, "\"\\u001b[2J\"\n");
  EXPECT_EQ(Country("\xc2\x9bK").outcome.output, "\"\\u009bK\"\n");
  EXPECT_EQ(Country("\xc2\xa0K").outcome.output, "\xc2\xa0K\n");
}

TEST(LocationCountry, IsAbsentWhereTheHelperDoesNotKnow) {
  EXPECT_EQ(Country("").outcome.exitCode, 6);
  EXPECT_EQ(Country("").outcome.output, "");
  EXPECT_EQ(Country("", {"--json"}).outcome.output, "{\"countryCode\":null}\n");
}

/// The connection port as it stands beside the service socket.
std::string PortPath(const fake::Service& service) {
  return service.path().substr(0, service.path().rfind('/')) + "/com.zarvo.Halvec.connection";
}

Bytes OneWay(std::uint32_t id, const Bytes& payload) {
  const auto size = static_cast<std::uint32_t>(28 + (payload.size() + 3) / 4 * 4);
  Bytes message = Word(0) + Word(size) + fake::Zeros(12) + Word(id) +
                  Word(static_cast<std::uint32_t>(payload.size())) + payload;
  message.resize(size);
  return message;
}

Bytes CivicInfo(const std::string& members) {
  return OneWay(5501001, Text("<plist><dict>" + members + "</dict></plist>"));
}

/// The connection request without its payload's padding: an empty array.
Bytes ConnectionRequest() {
  const Bytes payload = Text("<plist><array/></plist>");
  return Hex("00000080") + Word(68) + fake::Zeros(12) + Hex("48f05300") + Word(1) +
         fake::Zeros(10) + Hex("1100") + Word(23) + payload + fake::Zeros(1);
}

void SendToPort(const fake::Service& service, const Bytes& request,
                const std::vector<int>& descriptors) {
  const FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const platform::UnixSocketAddress address(PortPath(service));
  ASSERT_EQ(::connect(socket.get(), address.get(), address.size()), 0);
  fake::Send(socket.get(), request, descriptors);
}

struct Waiting {
  Outcome outcome;
  std::string answer;  // what the program answered over the connection, as hexadecimal text
};

/// Runs `location resolve 1 2 --wait` with `options` against a helper that delivers `packet`.
Waiting RunWaiting(const Bytes& request, const Bytes& packet,
                   const std::vector<std::string>& options = {}) {
  fake::Service service;
  Waiting waiting;
  fake::Beside helper([&] {
    const fake::Connection connection = fake::Accept(service.socket());
    (void)fake::Receive(connection.privatePort.get());
    fake::Send(connection.privatePort.get(), PlainReply(kResolveReply, 0));
    auto [own, daemons] = fake::MakePair(SOCK_SEQPACKET);
    SendToPort(service, request, {daemons.get()});
    daemons.reset();
    // Fails where the program has refused the request already.
    (void)::send(own.get(), packet.data(), packet.size(), MSG_NOSIGNAL);
    waiting.answer = fake::ToHex(fake::Receive(own.get()).bytes);
    (void)fake::Receive(connection.clientPort.get());
  });
  std::vector<std::string> arguments{"--service", service.path(), "location", "resolve", "1",
                                     "2",         "--wait"};
  arguments.insert(arguments.end(), options.begin(), options.end());
  waiting.outcome = RunProgram(arguments);
  helper.join();
  EXPECT_FALSE(std::filesystem::exists(PortPath(service))) << "the port goes with the program";
  return waiting;
}

const std::string kZurich =
    "<key>country</key><string>CH</string><key>state</key><string>Zurich</string>"
    "<key>city</key><string>Z\xc3\xbcrich</string><key>postalCode</key><string>8001</string>";

TEST(LocationResolveWait, PrintsWhatTheHelperDeliversAndAnswersItWithSuccess) {
  const Waiting waiting = RunWaiting(ConnectionRequest(), CivicInfo(kZurich));
  EXPECT_EQ(waiting.outcome.exitCode, 0) << waiting.outcome.errors;
  EXPECT_EQ(waiting.outcome.output,
            "country:     CH\nstate:       Zurich\ncity:        Z\xc3\xbcrich\n"
            "postal code: 8001\n");
  EXPECT_EQ(waiting.answer,
            "0000000024000000000000000000000000000000adf05300080000000000000000000000");
}

TEST(LocationResolveWait, PrintsJson) {
  EXPECT_EQ(RunWaiting(ConnectionRequest(), CivicInfo(kZurich), {"--json"}).outcome.output,
            "{\"country\":\"CH\",\"state\":\"Zurich\",\"city\":\"Z\xc3\xbcrich\","
            "\"postalCode\":\"8001\"}\n");
}

TEST(LocationResolveWait, PrintsNoCommandToTheTerminal) {
  const Bytes info = CivicInfo("<key>city</key><string>\x7f</string>");
  EXPECT_NE(RunWaiting(ConnectionRequest(), info).outcome.output.find("city:        \"\\u007f\"\n"),
            std::string::npos);
}

TEST(LocationResolveWait, KeepsNullApartFromEmpty) {
  const Bytes info = CivicInfo("<key>country</key><string></string>");
  EXPECT_EQ(RunWaiting(ConnectionRequest(), info).outcome.output,
            "country:     \nstate:       (null)\ncity:        (null)\npostal code: (null)\n");
  EXPECT_EQ(RunWaiting(ConnectionRequest(), info, {"--json"}).outcome.output,
            "{\"country\":\"\",\"state\":null,\"city\":null,\"postalCode\":null}\n");
}

TEST(LocationResolveWait, FailsWhenWhatComesIsNoCivicInfo) {
  for (const Bytes& packet :
       {OneWay(5501002, {}), OneWay(5501001, Text("x")),
        OneWay(5501001, Text("<plist><array/></plist>")), Bytes(30, 0), Bytes(3, 0)}) {
    const Waiting waiting = RunWaiting(ConnectionRequest(), packet);
    EXPECT_EQ(waiting.outcome.exitCode, 5);
    EXPECT_EQ(waiting.answer, "");
  }
}

TEST(LocationResolveWait, FailsWhenWhatComesIsNoConnectionRequest) {
  Bytes otherId = ConnectionRequest();
  otherId.at(20) = 0x49;
  Bytes wrongLength = ConnectionRequest();
  wrongLength.at(40) = 29;
  for (const Bytes& request : {CivicInfo(kZurich), otherId, wrongLength, Bytes(5, 0)}) {
    EXPECT_EQ(RunWaiting(request, CivicInfo(kZurich)).outcome.exitCode, 5);
  }
}

TEST(LocationResolveWait, SaysWhoHasThePortAndAsksNothing) {
  fake::Service service;
  const FileDescriptor daemon(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const platform::UnixSocketAddress address(PortPath(service));
  ASSERT_EQ(::bind(daemon.get(), address.get(), address.size()), 0);
  const Outcome outcome =
      RunProgram({"--service", service.path(), "location", "resolve", "1", "2", "--wait"});
  EXPECT_EQ(outcome.exitCode, 7);
  EXPECT_NE(outcome.errors.find("another program holds"), std::string::npos) << outcome.errors;
  EXPECT_TRUE(std::filesystem::exists(PortPath(service)));
  std::filesystem::remove(PortPath(service));
}

TEST(LocationResolveWait, FailsWhenTheHelperGoesAway) {
  fake::Service service;
  fake::Beside helper([&] {
    const fake::Connection connection = fake::Accept(service.socket());
    (void)fake::Receive(connection.privatePort.get());
    fake::Send(connection.privatePort.get(), PlainReply(kResolveReply, 0));
  });
  const Outcome outcome =
      RunProgram({"--service", service.path(), "location", "resolve", "1", "2", "--wait"});
  helper.join();
  EXPECT_EQ(outcome.exitCode, 5);
  EXPECT_EQ(outcome.errors, "halvecctl: the helper went away\n");
}

}  // namespace
