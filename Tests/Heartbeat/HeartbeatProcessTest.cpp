// SPDX-License-Identifier: Apache-2.0
//
// The real helper's heartbeat as the far side of the cellular link sees it.
#include <algorithm>
#include <sstream>

#include "Tests/Process/ProcessSuite.h"

namespace process_tests {
namespace {

using Heartbeat = ProcessSuite;

/// The bytes of the packets in lines of `handset capture show`, as text in hexadecimal.
std::vector<std::string> PacketsIn(const std::string& output, const std::string& direction) {
  std::vector<std::string> packets;
  std::istringstream lines(output);
  for (std::string line; std::getline(lines, line);) {
    if (line.find(' ' + direction + " icmp ") == std::string::npos) continue;
    packets.push_back(line.substr(line.rfind(' ') + 1));
  }
  return packets;
}

TEST_F(Heartbeat, SendsItsRequestsOverTheCellularLinkToTheTargetOfTheBuild) {
  const Outcome outcome =
      run("handset capture start pdp_ip0; handset capture start wlan0; date +%s\n"
          "halvecctl heartbeat start; printf '%04x\\n' $(handset wait-start)\n"
          "handset capture show --protocol icmp --count 6 --timeout 30; halvecctl heartbeat stop\n"
          "handset network counters wlan0");
  std::istringstream lines(outcome.output);
  std::string began, identifier;
  lines >> began >> identifier;
  const auto requests = PacketsIn(outcome.output, "out");
  ASSERT_EQ(requests.size(), 3U) << outcome.output << outcome.errors;
  for (const std::string& packet : requests) {
    ASSERT_EQ(packet.size(), 2U * (20 + 48)) << packet;
    EXPECT_EQ(packet.substr(24),
              "0a400002"
              "c0000201" +
                  packet.substr(40))
        << "source and target";
    const std::string echo = packet.substr(40);
    EXPECT_EQ(echo.substr(0, 4), "0800");
    EXPECT_EQ(echo.substr(8, 8), identifier + "0000") << "process id and sequence";
    EXPECT_EQ(echo.substr(16, 48), std::string(48, '0'));
    EXPECT_EQ(echo.substr(88), "00000000");
    // Seconds in the byte order of the host: 64 bits.
    std::string seconds;
    for (std::size_t at = 8; at-- > 0;) seconds += echo.substr(64 + at * 2, 2);
    const long long sent = std::stoll(seconds, nullptr, 16);
    EXPECT_GE(sent, std::stoll(began));
    EXPECT_LE(sent, std::stoll(began) + 60);
  }
  EXPECT_EQ(PacketsIn(outcome.output, "in").size(), 3U) << outcome.output;
  EXPECT_NE(outcome.output.find("wlan0  rx 0 packets 0 bytes, tx 0 packets 0 bytes"),
            std::string::npos)
      << outcome.output;
}

TEST_F(Heartbeat, KeepsTheHelperWhenItsClientsHaveGoneAndLetsItGoWhenItIsStopped) {
  const Outcome outcome =
      run("halvecctl heartbeat start; handset wait-exit --timeout 15; echo $?\n"
          "halvecctl heartbeat stop; handset wait-exit --timeout 60 | cut -d' ' -f 1-2");
  EXPECT_EQ(outcome.output, "124\nexited 0\n") << outcome.errors;
}

TEST_F(Heartbeat, GoesByWhateverRouteThereIsWithoutTheCellularInterface) {
  const Outcome outcome =
      run("handset network remove pdp_ip0; handset capture start wlan0\n"
          "halvecctl heartbeat start\n"
          "handset capture show --protocol icmp --count 2 --timeout 30; halvecctl heartbeat stop");
  const auto requests = PacketsIn(outcome.output, "out");
  ASSERT_FALSE(requests.empty()) << outcome.output << outcome.errors;
  EXPECT_EQ(requests[0].substr(24, 16),
            "c0a84002"
            "c0000201");
}

TEST_F(Heartbeat, SurvivesTheInterfaceGoingInMidExchangeAndUsesItsSuccessor) {
  const Outcome outcome = run(
      "handset tower reply off; handset capture start pdp_ip0\n"
      "halvecctl heartbeat start\n"
      "handset capture show --count 1 --timeout 30 pdp_ip0 >/dev/null\n"
      "handset network remove pdp_ip0; client connect\n"
      "handset network add pdp_ip0; handset tower reply on\n"
      "handset capture show --protocol icmp --timeout 0 >/tmp/before\n"
      "handset capture show --protocol icmp --skip $(wc -l </tmp/before) --count 2 --timeout 30\n"
      "halvecctl heartbeat stop; handset status --json");
  EXPECT_TRUE(outcome.output.starts_with("0\n")) << outcome.output << outcome.errors;
  EXPECT_EQ(PacketsIn(outcome.output, "out").size(), 1U) << outcome.output << outcome.errors;
  EXPECT_NE(outcome.output.find("\"starts\":1,\"exits\":0"), std::string::npos) << outcome.output;
}

TEST_F(Heartbeat, GoesOnWithoutRepliesAndWithRubbish) {
  // To the helper's address: a header alone, a short echo reply, one whose header length lies, and
  // an echo request.
  const Outcome outcome =
      run("handset tower reply off; handset capture start pdp_ip0; halvecctl heartbeat start\n"
          "for packet in 450000140001000040010000c00002010a400002 "
          "4500001d0001000040010000c00002010a400002000000000a00000000 "
          "4f0000440001000040010000c00002010a400002$(printf '%096d' 0) "
          "450000440001000040010000c00002010a4000020800$(printf '%092d' 0); do\n"
          "  handset tower send $packet; done\n"
          "handset capture show --protocol icmp --count 8 --timeout 30\n"
          "client connect; handset status --json");
  EXPECT_GE(PacketsIn(outcome.output, "out").size(), 2U) << outcome.output << outcome.errors;
  EXPECT_NE(outcome.output.find("\n0\n"), std::string::npos) << outcome.output;
  EXPECT_NE(outcome.output.find("\"starts\":1,\"exits\":0"), std::string::npos) << outcome.output;
}

TEST_F(Heartbeat, SurvivesManySwitches) {
  const Outcome outcome =
      run("for i in 1 2 3 4 5 6 7 8 9 10; do halvecctl heartbeat start; halvecctl heartbeat stop\n"
          "done; client connect; handset wait-exit --timeout 60 | cut -d' ' -f 1-2");
  EXPECT_EQ(outcome.output, "0\nexited 0\n") << outcome.errors;
}

TEST_F(Heartbeat, StartedTwiceAndStoppedOnceKeepsTheHelper) {
  const Outcome outcome =
      run("halvecctl heartbeat start; halvecctl heartbeat start; halvecctl heartbeat stop\n"
          "handset wait-exit --timeout 15; echo $?");
  EXPECT_EQ(outcome.output, "124\n") << outcome.errors;
}

}  // namespace
}  // namespace process_tests
