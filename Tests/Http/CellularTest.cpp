// SPDX-License-Identifier: Apache-2.0
//
// Transfers that may not use cellular, between a Wi-Fi and a cellular link in a network namespace
// of the test's own. What counts is what the kernel counts: packets sent on the cellular interface.
#include <gtest/gtest.h>
#include <sched.h>
#include <stdlib.h>
#include <sys/mount.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <memory>
#include <sstream>

#include "Helper/Platform/Linux/HttpTransportCurl.h"
#include "Helper/Platform/Linux/NetworkLinks.h"
#include "Helper/Platform/vlu/Http.h"
#include "Tests/Http/Retrieval.h"
#include "Tests/Http/Script.h"

namespace {

using support::TextOf;
using vlu::Http::ErrorType;
using Response = std::shared_ptr<vlu::Http::HttpResponse>;

/// Runs `command` of ip(8).
void Ip(const std::string& command) {
  EXPECT_EQ(std::system(("ip " + command).c_str()), 0) << command;  // NOLINT(concurrency-mt-unsafe)
}

class OffCellular : public ::testing::Test {
 protected:
  void SetUp() override {
    if (::geteuid() != 0 || ::unshare(CLONE_NEWNET) != 0) {
      GTEST_SKIP() << "a network namespace of one's own needs root";
    }
    networks =
        std::make_unique<support::Script>(std::vector<std::string>{TEST_SCRIPTS "/networks.py"});
    ASSERT_EQ(networks->lines(), std::vector<std::string>{"ready"});
    ASSERT_NE(::mkdtemp(folder.data()), nullptr);
    std::ofstream(hosts()) << "127.0.0.1 localhost\n# 192.0.2.9 comment.example\n"
                              "198.51.100.10\tin-hosts.example IN-hosts-too.example # web\n";
    setServers("nameserver 10.20.0.1\n");
  }
  ~OffCellular() override { std::filesystem::remove_all(folder); }

  [[nodiscard]] std::string hosts() const { return folder + "/hosts"; }
  void setServers(const std::string& text) const { std::ofstream(folder + "/resolv.conf") << text; }
  Response get(const std::string& url, bool allowsCellular = false) {
    platform::HttpProfile profile;
    profile.connectLimit = std::chrono::seconds(4);
    profile.resolver = {
        .hostsFile = hosts(),
        .serverFiles = {folder + "/absent", folder + "/resolv.conf", folder + "/resolv-too.conf"},
        .patience = std::chrono::milliseconds(400)};
    platform::HttpTransportCurl transport(profile);
    const platform::ScopedReplacement<vlu::Http::HttpTransport> replacement{transport};
    return support::Retrieve(url, {{"Accept-Encoding", "gzip"}}, allowsCellular);
  }
  /// "hello", or how it failed.
  std::string outcome(const std::string& url) {
    const Response response = get(url);
    return response->errorType() == ErrorType::kSuccess
               ? TextOf(response->takeBody())
               : vlu::Http::asString(response->errorType());
  }
  /// How many packets have gone out of an interface.
  static long sent(const std::string& interface) {
    std::ifstream table("/proc/thread-self/net/dev");
    for (std::string line; std::getline(table, line);) {
      const std::size_t colon = line.find(':');
      if (colon == std::string::npos) continue;
      if (line.substr(line.find_first_not_of(' '), colon - line.find_first_not_of(' ')) !=
          interface) {
        continue;
      }
      std::istringstream fields(line.substr(colon + 1));
      long field = 0;
      for (int i = 0; i < 10; ++i) fields >> field;
      return field;
    }
    ADD_FAILURE() << "no interface " << interface;
    return -1;
  }

  std::unique_ptr<support::Script> networks;
  std::string folder = "/tmp/off-cellular-XXXXXX";
};

TEST_F(OffCellular, TheRoutesPreferCellularWhereItIsAllowed) {
  EXPECT_EQ(TextOf(get("http://198.51.100.10/hello", true)->takeBody()), "hello");
  EXPECT_GT(sent("pdp_ip0"), 0) << "or the other tests would show nothing";
}

TEST_F(OffCellular, ATransferGoesOverWifiWhateverTheRoutesPrefer) {
  EXPECT_EQ(outcome("http://198.51.100.10/hello"), "hello");
  EXPECT_EQ(outcome("http://[2001:db8:1::10]/hello"), "hello");
  EXPECT_GT(sent("wlan0"), 0);
  EXPECT_EQ(sent("pdp_ip0"), 0);
}

TEST_F(OffCellular, NamesAreResolvedOverWifi) {
  for (const char* name : {"web", "WEB", "both", "six", "alias", "backwards", "long", "forged"}) {
    EXPECT_EQ(outcome(std::string("http://") + name + ".example/hello"), "hello") << name;
  }
  EXPECT_EQ(sent("pdp_ip0"), 0);
}

TEST_F(OffCellular, NamesWithoutAnAddressAreNotFound) {
  for (const char* name : {"nobody", "circle", "stray", "failing", "silent"}) {
    EXPECT_EQ(outcome(std::string("http://") + name + ".example/hello"), "host not found") << name;
  }
  EXPECT_EQ(outcome("http://" + std::string(64, 'a') + ".example/hello"), "host not found");
  EXPECT_EQ(sent("pdp_ip0"), 0);
}

TEST_F(OffCellular, ANameThatEndsWithADotIsResolvedOnceAndOverWifi) {
  EXPECT_EQ(outcome("http://web.example./hello"), "hello");
  EXPECT_EQ(sent("pdp_ip0"), 0);
}

TEST_F(OffCellular, TheHostsFileComesFirst) {
  setServers("");
  EXPECT_EQ(outcome("http://in-hosts.example/hello"), "hello");
  EXPECT_EQ(outcome("http://in-hosts-too.EXAMPLE/hello"), "hello");
  EXPECT_EQ(outcome("http://comment.example/hello"), "no network that may be used");
  EXPECT_EQ(sent("pdp_ip0"), 0);
}

TEST_F(OffCellular, RedirectsStayOnWifi) {
  EXPECT_EQ(outcome("http://web.example/redirect?http://both.example/hello"), "hello");
  EXPECT_EQ(outcome("http://198.51.100.10/redirect?http://alias.example/hello"), "hello");
  EXPECT_EQ(sent("pdp_ip0"), 0);
}

TEST_F(OffCellular, TheNextServerIsAskedWhenOneDoesNotAnswer) {
  setServers(
      "# of the cellular network\nnameserver 10.65.0.1\nnameserver 10.20.0.77\n"
      "nameserver not-an-address\nnameserver 10.20.0.1\n");
  EXPECT_EQ(outcome("http://web.example/hello"), "hello");
  EXPECT_EQ(sent("pdp_ip0"), 0);
}

TEST_F(OffCellular, AServerOnLoopbackIsNotTrustedToStayOffCellular) {
  setServers("nameserver 127.0.0.53\nnameserver ::1\n");
  EXPECT_EQ(outcome("http://web.example/hello"), "no network that may be used");
  std::ofstream(folder + "/resolv-too.conf") << "nameserver 10.20.0.1\n";
  EXPECT_EQ(outcome("http://web.example/hello"), "hello") << "of the next file";
  EXPECT_EQ(sent("pdp_ip0"), 0);
}

TEST_F(OffCellular, NothingIsSentWhenThereIsNoWifi) {
  Ip("link set wlan0 down");
  const long before = sent("wlan0");
  for (const char* host :
       {"198.51.100.10", "[2001:db8:1::10]", "web.example", "in-hosts.example"}) {
    EXPECT_EQ(outcome(std::string("http://") + host + "/hello"), "no network that may be used");
  }
  EXPECT_EQ(sent("wlan0"), before);
  EXPECT_EQ(sent("pdp_ip0"), 0);
}

TEST_F(OffCellular, WifiWithoutARouteToTheHostIsNone) {
  Ip("route del default dev wlan0");
  EXPECT_EQ(outcome("http://198.51.100.10/hello"), "no network that may be used");
  EXPECT_EQ(outcome("http://10.20.0.1:81/hello"), "cannot connect") << "that is on the link";
  EXPECT_EQ(sent("pdp_ip0"), 0);
}

TEST_F(OffCellular, EveryNameOfACellularInterfaceCounts) {
  Ip("link set wlan0 down");
  std::string name = "pdp_ip0";
  for (const char* next :
       {"pdp_ip12", "rmnet0", "rmnet_data3", "wwan0", "wwan0mbim1", "ccmni2", "ppp0"}) {
    Ip("link set " + name + " down");
    Ip("link set " + name + " name " + next);
    name = next;
    Ip("link set " + name + " up");
    Ip("route add default via 10.65.0.1 dev " + name);
    EXPECT_EQ(outcome("http://198.51.100.10/hello"), "no network that may be used") << name;
    EXPECT_EQ(sent(name), 0) << name;
  }
  Ip("link set " + name + " down");
  Ip("link set " + name + " name eth0");
  Ip("link set eth0 up");
  Ip("route add default via 10.65.0.1 dev eth0");
  EXPECT_EQ(outcome("http://198.51.100.10/hello"), "hello") << "another name is none of these";
}

TEST_F(OffCellular, ATunnelIsNotTaken) {
  Ip("link set wlan0 down");
  Ip("tuntap add dev tun0 mode tun");
  Ip("address add 10.99.0.2/24 dev tun0");
  Ip("link set tun0 up");
  Ip("route add 198.51.100.10/32 dev tun0");
  EXPECT_EQ(outcome("http://198.51.100.10/hello"), "no network that may be used");
  EXPECT_EQ(sent("tun0"), 0);
}

TEST_F(OffCellular, LoopbackIsForLoopbackAddressesAlone) {
  Ip("link set wlan0 down");
  Ip("route add 203.0.113.0/24 dev lo");
  EXPECT_EQ(outcome("http://203.0.113.1/hello"), "no network that may be used");
  EXPECT_EQ(outcome("http://127.0.0.1:1/hello"), "cannot connect");
  EXPECT_EQ(outcome("http://[::1]:1/hello"), "cannot connect");
}

TEST_F(OffCellular, OfTwoEligibleInterfacesTheRoutesDecide) {
  Ip("link add wlan1 type veth peer name ap1");
  Ip("address add 10.21.0.2/24 dev wlan1");
  Ip("link set ap1 up");
  Ip("link set wlan1 up");
  Ip("route add default via 10.21.0.1 dev wlan1 metric 900");
  EXPECT_EQ(outcome("http://198.51.100.10/hello"), "hello") << "the lower metric";
  Ip("route add 198.51.100.0/24 via 10.20.0.1 dev wlan0 metric 2000");
  Ip("route del default dev wlan0");
  EXPECT_EQ(outcome("http://198.51.100.10/hello"), "hello") << "the longer prefix";
  EXPECT_EQ(sent("pdp_ip0"), 0);
}

TEST(CellularInterface, IsToldByItsName) {
  for (const char* name : {"pdp_ip0", "rmnet_data0", "wwan0", "ccmni0", "ppp0"}) {
    EXPECT_TRUE(platform::IsCellularInterface(name)) << name;
  }
  for (const char* name : {"wlan0", "eth0", "lo", "usb0", "en-ppp0", "my_rmnet0", ""}) {
    EXPECT_FALSE(platform::IsCellularInterface(name)) << name;
  }
}

TEST(CellularInterface, IsToldByItsDeviceType) {
  if (::geteuid() != 0 || ::unshare(CLONE_NEWNS) != 0) {
    GTEST_SKIP() << "a mount namespace of one's own needs root";
  }
  const std::string interfaces = "/sys/class/net";
  ASSERT_EQ(::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr), 0);
  ASSERT_EQ(::mount("none", interfaces.c_str(), "tmpfs", 0, nullptr), 0);
  const auto make = [&](const std::string& name, const std::string& uevent) {
    std::filesystem::create_directory(interfaces + "/" + name);
    std::ofstream(interfaces + "/" + name + "/uevent") << uevent;
  };
  make("usb0", "DEVTYPE=wwan\nINTERFACE=usb0\nIFINDEX=7\n");
  make("wlan0", "DEVTYPE=wlan\nINTERFACE=wlan0\nIFINDEX=8\n");
  EXPECT_TRUE(platform::IsCellularInterface("usb0"));
  EXPECT_FALSE(platform::IsCellularInterface("wlan0"));
  EXPECT_FALSE(platform::IsCellularInterface("absent0"));
}

}  // namespace
