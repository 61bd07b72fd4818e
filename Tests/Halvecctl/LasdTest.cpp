// SPDX-License-Identifier: Apache-2.0
//
// halvecctl lasd against the helper's side of the wire: what it asks, and what it makes of the
// notifications.
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include <algorithm>
#include <filesystem>
#include <string>
#include <vector>

#include "Helper/Platform/UnixSocketAddress.h"
#include "Tests/Client/FakeHelper.h"
#include "Tests/Halvecctl/Answered.h"
#include "Tests/Halvecctl/Program.h"

namespace {

using fake::Bytes;
using fake::DataReply;
using fake::FileDescriptor;
using fake::Hex;
using fake::PlainReply;
using fake::Slot;
using fake::Text;
using program::Exchange;
using program::Outcome;
using program::RunAnswered;
using program::RunProgram;

constexpr std::uint32_t kTriggerReply = 0x84808f;
constexpr std::uint32_t kCopyReply = 0x848088;

/// The one-way message, in literal bytes, that carries `payload`.
Bytes OneWay(const Bytes& payload) {
  const auto size = static_cast<std::uint32_t>(28 + (payload.size() + 3) / 4 * 4);
  Bytes message = Hex("00000000") + fake::Word(size) + fake::Zeros(16) +
                  fake::Word(static_cast<std::uint32_t>(payload.size())) + payload;
  message.resize(size);
  return message;
}

/// The notification with this event and type.
Bytes Notification(const std::string& event, const std::string& type = "") {
  std::string list =
      "<plist><dict><key>Notification</key><string>com.zarvo.lasd." + event + "</string>";
  if (!type.empty()) list += "<key>DBType</key><string>" + type + "</string>";
  return OneWay(Text(list + "</dict></plist>"));
}

TEST(LasdUpdate, AsksForAllTypesOrThoseNamed) {
  for (const auto& [types, mask] : std::vector<std::pair<std::vector<std::string>, const char*>>{
           {{}, "1f000000"},
           {{"--types", "gsm"}, "08000000"},
           {{"--types", "scdma,lte"}, "14000000"},
           {{"--types", "cdma,umts,cdma"}, "03000000"}}) {
    std::vector<std::string> arguments{"lasd", "update"};
    arguments.insert(arguments.end(), types.begin(), types.end());
    const Exchange exchange = RunAnswered(arguments, PlainReply(kTriggerReply, 0));
    EXPECT_EQ(exchange.outcome.exitCode, 0) << exchange.outcome.errors;
    EXPECT_EQ(exchange.outcome.output, "");
    EXPECT_EQ(
        fake::ToHex(exchange.request),
        std::string("00000000240000000000000000000000000000002b8084000000000001000000") + mask);
  }
}

TEST(LasdUpdate, ExitsAsEveryRequest) {
  const Exchange failed = RunAnswered({"lasd", "update"}, PlainReply(kTriggerReply, 5));
  EXPECT_EQ(failed.outcome.exitCode, 1);
  EXPECT_EQ(failed.outcome.errors,
            "halvecctl: the helper answered with a failure, code 5 (KERN_FAILURE)\n");
  const Exchange json = RunAnswered({"lasd", "update", "--json"}, PlainReply(kTriggerReply, 0));
  EXPECT_EQ(json.outcome.output, "{\"code\":0,\"codeName\":\"KERN_SUCCESS\"}\n");
}

/// The notification port as it stands beside the service socket.
std::string PortPath(const fake::Service& service) {
  return service.path().substr(0, service.path().rfind('/')) + "/com.zarvo.Halvec.lasd";
}

void Notify(const fake::Service& service, const Bytes& datagram) {
  const FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const platform::UnixSocketAddress address(PortPath(service));
  EXPECT_EQ(
      ::sendto(socket.get(), datagram.data(), datagram.size(), 0, address.get(), address.size()),
      static_cast<ssize_t>(datagram.size()));
}

/// Runs `lasd update --wait` with `options`, answers each trigger with 0 and then with the
/// datagrams of its turn. After the last turn the helper goes away when `leaves`, else it stays.
Outcome RunWaiting(const std::vector<std::string>& options,
                   const std::vector<std::vector<Bytes>>& turns, std::vector<std::string>& masks,
                   bool leaves = false) {
  fake::Service service;
  fake::Beside helper([&] {
    fake::Connection connection = fake::Accept(service.socket());
    for (const std::vector<Bytes>& turn : turns) {
      masks.push_back(fake::ToHex(fake::Receive(connection.privatePort.get()).bytes).substr(64));
      fake::Send(connection.privatePort.get(), PlainReply(kTriggerReply, 0));
      for (const Bytes& datagram : turn) Notify(service, datagram);
    }
    if (!leaves) (void)fake::Receive(connection.clientPort.get());
  });
  std::vector<std::string> arguments{"--service", service.path(), "lasd", "update", "--wait"};
  arguments.insert(arguments.end(), options.begin(), options.end());
  Outcome outcome = RunProgram(arguments);
  helper.join();
  EXPECT_FALSE(std::filesystem::exists(PortPath(service))) << "the port goes with the program";
  return outcome;
}

TEST(LasdUpdateWait, ChecksOneTypeAfterTheOtherAndTellsEachOutcome) {
  std::vector<std::string> masks;
  const Outcome outcome = RunWaiting({},
                                     {{Notification("UpdateAvailable", "gsm")},
                                      {Notification("NoUpdateRequired")},
                                      {Notification("UpdateFailed")},
                                      {Notification("UpdateAvailable", "lte")},
                                      {Notification("NoUpdateRequired")}},
                                     masks);
  EXPECT_EQ(outcome.exitCode, 1) << outcome.errors;
  EXPECT_EQ(outcome.output,
            "gsm    installed\numts   up to date\ncdma   failed\nlte    installed\n"
            "scdma  up to date\n");
  EXPECT_EQ(masks,
            (std::vector<std::string>{"08000000", "01000000", "02000000", "04000000", "10000000"}));
}

TEST(LasdUpdateWait, ExitsWithZeroWhenNothingFailed) {
  std::vector<std::string> masks;
  const Outcome outcome = RunWaiting(
      {"--types", "lte,gsm", "--json"},
      {{Notification("NoUpdateRequired")}, {Notification("UpdateAvailable", "lte")}}, masks);
  EXPECT_EQ(outcome.exitCode, 0) << outcome.errors;
  EXPECT_EQ(outcome.output, "{\"gsm\":\"up to date\",\"lte\":\"installed\"}\n");
}

TEST(LasdUpdateWait, PassesOverWhatIsNotAboutItsType) {
  std::vector<std::string> masks;
  Bytes otherId = Notification("UpdateFailed");
  otherId[20] = 1;
  const Outcome outcome = RunWaiting(
      {"--types", "gsm"},
      {{Notification("UpdateAvailable", "lte"), otherId, Text("short"), OneWay(Text("junk")),
        OneWay(Text("<plist><dict/></plist>")), Notification("UpdateAvailable", "gsm")}},
      masks);
  EXPECT_EQ(outcome.exitCode, 0) << outcome.errors;
  EXPECT_EQ(outcome.output, "gsm    installed\n");
}

TEST(LasdUpdateWait, GivesUpAfterItsTime) {
  std::vector<std::string> masks;
  const Outcome outcome = RunWaiting({"--types", "gsm", "--within", "0.05"}, {{}}, masks);
  EXPECT_EQ(outcome.exitCode, 5);
  EXPECT_EQ(outcome.errors, "halvecctl: nothing was told in time\n");
}

TEST(LasdUpdateWait, EndsWhenTheHelperGoesAway) {
  std::vector<std::string> masks;
  const Outcome outcome = RunWaiting({"--types", "gsm"}, {{}}, masks, /*leaves=*/true);
  EXPECT_EQ(outcome.exitCode, 5);
  EXPECT_EQ(outcome.errors, "halvecctl: the helper went away\n");
}

TEST(LasdUpdateWait, LeavesAPortThatAnotherProgramHoldsAlone) {
  fake::Service service;
  const FileDescriptor daemon(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const platform::UnixSocketAddress address(PortPath(service));
  ASSERT_EQ(::bind(daemon.get(), address.get(), address.size()), 0);
  const Outcome outcome = RunProgram({"--service", service.path(), "lasd", "update", "--wait"});
  EXPECT_EQ(outcome.exitCode, 7);
  EXPECT_EQ(outcome.errors, "halvecctl: another program holds " + PortPath(service) +
                                " and is told what happens; do without --wait\n");
  EXPECT_TRUE(std::filesystem::exists(PortPath(service)));
}

TEST(LasdUpdateWait, TakesTheNameOfAProgramThatWasKilled) {
  fake::Service service;
  {
    const FileDescriptor killed(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    const platform::UnixSocketAddress address(PortPath(service));
    ASSERT_EQ(::bind(killed.get(), address.get(), address.size()), 0);
  }
  fake::Beside helper([&] {
    fake::Connection connection = fake::Accept(service.socket());
    (void)fake::Receive(connection.privatePort.get());
    struct stat status {};
    EXPECT_EQ(::stat(PortPath(service).c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777, 0660U);
    fake::Send(connection.privatePort.get(), PlainReply(kTriggerReply, 0));
    Notify(service, Notification("NoUpdateRequired"));
    (void)fake::Receive(connection.clientPort.get());
  });
  const Outcome outcome =
      RunProgram({"--service", service.path(), "lasd", "update", "--wait", "--types", "gsm"});
  EXPECT_EQ(outcome.exitCode, 0) << outcome.errors;
}

/// Runs `lasd status` with `options`, and answers the five requests for recorded versions.
Outcome RunStatus(const std::vector<std::string>& options, const std::vector<std::string>& values,
                  std::vector<std::string>& keys) {
  fake::Service service;
  fake::Beside helper([&] {
    fake::Connection connection = fake::Accept(service.socket());
    for (const std::string& value : values) {
      const Bytes request = fake::Receive(connection.privatePort.get()).bytes;
      EXPECT_EQ(Bytes(request.begin() + 32, request.begin() + 288), Slot(256, "com.zarvo.lasd"));
      keys.emplace_back(request.begin() + 288, std::find(request.begin() + 288, request.end(), 0));
      fake::Send(connection.privatePort.get(),
                 DataReply(kCopyReply, 0, static_cast<std::uint32_t>(value.size())) + Text(value));
    }
    (void)fake::Receive(connection.clientPort.get());
  });
  std::vector<std::string> arguments{"--service", service.path(), "lasd", "status"};
  arguments.insert(arguments.end(), options.begin(), options.end());
  return RunProgram(arguments);
}

const std::vector<std::string> kRecorded{
    "<plist><dict><key>Version</key><string>2.1</string><key>ContentURL</key>"
    "<string>https://host/gsm.db.gz</string></dict></plist>",
    "", "<plist><dict/></plist>", "<plist><string>no dictionary</string></plist>",
    "<plist><dict><key>Version</key><string>a\nb</string></dict></plist>"};

TEST(LasdStatus, ShowsTheRecordedVersions) {
  std::vector<std::string> keys;
  const Outcome outcome = RunStatus({}, kRecorded, keys);
  EXPECT_EQ(outcome.exitCode, 0) << outcome.errors;
  EXPECT_TRUE(
      outcome.output.starts_with("gsm    version 2.1 from https://host/gsm.db.gz\n"
                                 "umts   never installed\n"
                                 "cdma   version - from -\n"
                                 "lte    never installed\n"))
      << outcome.output;
  EXPECT_EQ(keys, (std::vector<std::string>{"gsm", "umts", "cdma", "lte", "scdma"}));
}

TEST(LasdStatus, PrintsJsonOnRequest) {
  std::vector<std::string> keys;
  const Outcome outcome = RunStatus({"--json"}, kRecorded, keys);
  EXPECT_TRUE(outcome.output.starts_with(
      "{\"recorded\":{\"gsm\":{\"Version\":\"2.1\",\"ContentURL\":\"https://host/gsm.db.gz\"},"
      "\"umts\":null,\"cdma\":{},\"lte\":null,\"scdma\":{\"Version\":\"a\\nb\"}},\"files\":{"))
      << outcome.output;
  EXPECT_TRUE(outcome.output.ends_with("}}\n"));
}

}  // namespace
