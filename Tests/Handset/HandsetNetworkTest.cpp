// SPDX-License-Identifier: Apache-2.0
//
// The handset's links: routes, counters, captured packets, interfaces that go and come. One thread.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "Tests/Handset/HandsetRun.h"

namespace handset_tests {
namespace {

const std::vector<std::string> kTools{"--install", std::string(NETWORK_CALLER) + ":echo-request"};

class HandsetNetwork : public HandsetSuite {
 protected:
  static Outcome run(const std::string& script) { return RunHandset(script, kTools); }
};

TEST_F(HandsetNetwork, IsALoopbackInterfaceAloneOnRequest) {
  const Outcome outcome = RunHandset(
      "ls /sys/class/net; cat /sys/class/net/lo/flags; handset network counters; echo $?\n"
      "handset world true; echo $?",
      {"--no-network"});
  EXPECT_EQ(outcome.output, "lo\n0x9\n2\n125\n");
}

TEST_F(HandsetNetwork, HasACellularAndAWirelessInterfaceThatAreUp) {
  EXPECT_EQ(run("cd /sys/class/net; ls; cat */operstate").output,
            "lo\npdp_ip0\nwlan0\nunknown\nup\nup\n");
}

TEST_F(HandsetNetwork, SendsOverTheCellularInterfaceUnlessToldOtherwise) {
  const Outcome outcome = run("for target in " HEARTBEAT_TARGET
                              " 203.0.113.9 192.168.64.1; do\n"
                              "ip route get $target | grep -o 'dev [^ ]*'; done\n"
                              "ip route get 203.0.113.9 oif wlan0 | grep -o 'via [^ ]* dev [^ ]*'");
  EXPECT_EQ(outcome.output, "dev pdp_ip0\ndev pdp_ip0\ndev wlan0\nvia 192.168.64.1 dev wlan0\n");
}

TEST_F(HandsetNetwork, HasTheHeartbeatsTargetBehindEitherLink) {
  const Outcome outcome =
      run("echo-request ping " HEARTBEAT_TARGET
          " 7; handset network counters\n"
          "echo-request ping " HEARTBEAT_TARGET " 8 wlan0; handset network counters --json wlan0");
  EXPECT_EQ(outcome.output, HEARTBEAT_TARGET
            " 7\n"
            "pdp_ip0  rx 1 packets 50 bytes, tx 1 packets 50 bytes\n"
            "wlan0  rx 0 packets 0 bytes, tx 0 packets 0 bytes\n" HEARTBEAT_TARGET
            " 8\n"
            "{\"interface\":\"wlan0\",\"rx_packets\":1,\"rx_bytes\":50,"
            "\"tx_packets\":1,\"tx_bytes\":50}\n");
}

TEST_F(HandsetNetwork, ShowsThePacketsOfTheLinksThatItCaptures) {
  const Outcome outcome =
      run("handset capture start pdp_ip0; handset capture start pdp_ip0\n"
          "echo-request send 10.64.0.1 7; echo-request ping 192.168.64.1 8\n"
          "handset capture start wlan0; echo-request ping 192.168.64.1 9\n"
          "handset capture show | sed 's/ 4500.*\\(....\\)..................../ \\1/'\n"
          "handset capture show --json wlan0 | head -n 1 | cut -d, -f 2-6");
  EXPECT_EQ(outcome.output,
            "192.168.64.1 8\n192.168.64.1 9\n"
            "pdp_ip0 out icmp 10.64.0.2 > 10.64.0.1 1234\n"
            "pdp_ip0 in icmp 10.64.0.1 > 10.64.0.2 1234\n"
            "wlan0 out icmp 192.168.64.2 > 192.168.64.1 1234\n"
            "wlan0 in icmp 192.168.64.1 > 192.168.64.2 1234\n"
            "\"interface\":\"wlan0\",\"direction\":\"out\",\"protocol\":\"icmp\","
            "\"source\":\"192.168.64.2\",\"destination\":\"192.168.64.1\"\n");
}

TEST_F(HandsetNetwork, WaitsForCapturedPacketsOfAProtocol) {
  // Nobody listens to the datagram, which the other side says: the first ICMP packet.
  const Outcome outcome = run(
      "handset capture start pdp_ip0; logger -n 10.64.0.1 -P 514 -d -t tag text\n"
      "handset capture show --protocol icmp --skip 2 --count 1 --timeout 60 >/tmp/shown & wait=$!\n"
      "echo-request send 10.64.0.1 7; wait $wait; cut -d' ' -f 1-6 /tmp/shown\n"
      "handset capture show --protocol udp --count 1 | sed 's/[0-9]* >/PORT >/' | cut -d' ' -f "
      "1-6\n"
      "handset capture show --protocol icmp --count 4 --timeout 0 | wc -l\n"
      "handset capture show --protocol tcp");
  EXPECT_EQ(outcome.output,
            "pdp_ip0 in icmp 10.64.0.1 > 10.64.0.2\n"
            "pdp_ip0 out udp 10.64.0.2:PORT > 10.64.0.1:514\n3\n");
  EXPECT_EQ(outcome.errors, "handset: timed out\n");
}

TEST_F(HandsetNetwork, LosesAnInterfacesRoutesWhileItIsDown) {
  const Outcome outcome =
      run("handset network down pdp_ip0; echo-request ping " HEARTBEAT_TARGET
          " 1\n"
          "handset network counters wlan0; echo-request send 203.0.113.9 2 pdp_ip0\n"
          "handset network up pdp_ip0; echo-request ping " HEARTBEAT_TARGET
          " 3\n"
          "handset network counters");
  EXPECT_EQ(outcome.output, HEARTBEAT_TARGET
            " 1\n"
            "wlan0  rx 1 packets 50 bytes, tx 1 packets 50 bytes\n" HEARTBEAT_TARGET
            " 3\n"
            "pdp_ip0  rx 1 packets 50 bytes, tx 1 packets 50 bytes\n"
            "wlan0  rx 1 packets 50 bytes, tx 1 packets 50 bytes\n");
  EXPECT_EQ(outcome.errors, "Network is unreachable\n");
}

TEST_F(HandsetNetwork, MayLoseAnInterfaceAndGetItBackAsANewOne) {
  const Outcome outcome = run(
      "handset capture start pdp_ip0; handset network remove pdp_ip0\n"
      "handset network remove pdp_ip0; handset capture start pdp_ip0; handset network up pdp_ip0\n"
      "ls /sys/class/net; handset network counters pdp_ip0; echo $?; handset network add pdp_ip0\n"
      "handset network add pdp_ip0; cat /sys/class/net/pdp_ip0/ifindex\n"
      "echo-request ping " HEARTBEAT_TARGET " 1; handset capture show | cut -c 1-16");
  EXPECT_EQ(outcome.output,
            "lo\nwlan0\n1\n4\n" HEARTBEAT_TARGET " 1\npdp_ip0 out icmp\npdp_ip0 in icmp \n");
  EXPECT_EQ(outcome.errors,
            "handset: there is no pdp_ip0\nhandset: there is no pdp_ip0\n"
            "handset: there is no pdp_ip0\nhandset: pdp_ip0 is there already\n");
}

TEST_F(HandsetNetwork, HasATowerThatMayKeepSilent) {
  // What was sent meanwhile is not answered later: the first reply is the second request's.
  const Outcome outcome = run("handset tower reply off; echo-request send " HEARTBEAT_TARGET
                              " 1\n"
                              "handset tower reply on; handset capture start pdp_ip0\n"
                              "echo-request ping " HEARTBEAT_TARGET
                              " 2; handset capture show | wc -l\n"
                              "handset network counters pdp_ip0");
  EXPECT_EQ(outcome.output,
            HEARTBEAT_TARGET " 2\n2\npdp_ip0  rx 1 packets 50 bytes, tx 2 packets 100 bytes\n");
}

TEST_F(HandsetNetwork, DeliversThePacketsThatATestMakesUp) {
  // An echo reply from 198.51.100.77, identifier 4660, number 0, with checksums that are right.
  const std::string packet =
      "4500001c0000400040"
      "01"
      "061f"
      "c633644d"
      "0a400002"
      "0000edcb12340000";
  const Outcome outcome =
      run("echo-request hear >/tmp/heard & until grep -q ready /tmp/heard; do :; done\n"
          "handset tower send " +
          packet +
          "; wait; cat /tmp/heard\n"
          "handset tower send 4x; echo $?; handset tower send 450; echo $?");
  EXPECT_EQ(outcome.output, "ready\n198.51.100.77 0\n2\n2\n") << outcome.errors;
}

TEST_F(HandsetNetwork, LetsACommandRunInTheWorld) {
  const Outcome outcome = run(
      "handset world -- sh -c 'ip -o link | cut -d: -f 2'; handset world false; echo $?\n"
      "handset world ip route get 10.64.0.2 | grep -o 'dev [^ ]*'; handset as mobile -- handset "
      "world true; echo $?");
  EXPECT_EQ(outcome.output, " lo\n tower@if2\n access-point@if3\n1\ndev tower\n125\n");
}

TEST_F(HandsetNetwork, RefusesUsageThatItDoesNotKnow) {
  for (const char* words :
       {"network", "network sing", "network down", "network down eth0", "network counters eth0",
        "network down wlan0 wlan0", "capture", "capture start", "capture start eth0",
        "capture show --what", "capture show eth0", "tower", "tower reply", "tower reply maybe",
        "tower send xx", "world"}) {
    EXPECT_EQ(run(std::string("handset ") + words).status, 2) << words;
  }
}

}  // namespace
}  // namespace handset_tests
