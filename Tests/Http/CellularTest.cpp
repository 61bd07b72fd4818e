// SPDX-License-Identifier: Apache-2.0
//
// Transfers that may not use cellular, between a Wi-Fi and a cellular link in a network namespace
// of the test's own. What counts is what the kernel counts: packets sent on the cellular interface.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <linux/if_tun.h>
#include <net/if.h>
#include <netinet/in.h>
#include <sched.h>
#include <stdlib.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <sys/socket.h>
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

/// What the kernel says of its network devices in /sys, for this process. Needs root.
class DeviceTypes {
 public:
  DeviceTypes() {
    EXPECT_EQ(::unshare(CLONE_NEWNS), 0);
    EXPECT_EQ(::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr), 0);
    EXPECT_EQ(::mount("none", interfaces_.c_str(), "tmpfs", 0, nullptr), 0);
  }
  ~DeviceTypes() { EXPECT_EQ(::umount2(interfaces_.c_str(), MNT_DETACH), 0); }
  DeviceTypes(const DeviceTypes&) = delete;
  DeviceTypes& operator=(const DeviceTypes&) = delete;

  void set(const std::string& name, const std::string& uevent) {
    std::filesystem::create_directory(interfaces_ + "/" + name);
    std::ofstream(interfaces_ + "/" + name + "/uevent") << uevent;
  }

 private:
  const std::string interfaces_ = "/sys/class/net";
};

/// Makes a tunnel's device run, by holding its other end as a daemon does; empty for other devices.
platform::FileDescriptor HoldTunnel(const std::string& name) {
  for (const int mode : {IFF_TUN, IFF_TAP}) {
    platform::FileDescriptor device(::open("/dev/net/tun", O_RDWR | O_CLOEXEC));
    ifreq request{};
    name.copy(request.ifr_name, sizeof request.ifr_name - 1);
    request.ifr_flags = static_cast<short>(mode | IFF_NO_PI);
    if (device && ::ioctl(device.get(), TUNSETIFF, &request) == 0) return device;
  }
  return {};
}

/// Keeps an interface from saying something by itself.
void Silence(const std::string& name) {
  std::ofstream("/proc/sys/net/ipv6/conf/" + name + "/disable_ipv6") << "1";
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

TEST_F(OffCellular, AServerOfTheHandsetsOwnIsNotTrustedUnderAnyAddress) {
  const platform::FileDescriptor server(::socket(AF_INET6, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  sockaddr_in6 everywhere{};
  everywhere.sin6_family = AF_INET6;
  everywhere.sin6_port = htons(53);
  ASSERT_EQ(::bind(server.get(), reinterpret_cast<const sockaddr*>(&everywhere), sizeof everywhere),
            0);
  for (const char* address :
       {"10.20.0.2", "fd00:20::2", "0.0.0.0", "::", "::ffff:127.0.0.1", "::ffff:10.20.0.2"}) {
    setServers(std::string("nameserver ") + address + "\n");
    EXPECT_EQ(outcome("http://web.example/hello"), "no network that may be used") << address;
    char byte = 0;
    EXPECT_LT(::recv(server.get(), &byte, 1, MSG_DONTWAIT), 0) << "asked at " << address;
  }
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

TEST_F(OffCellular, ATunnelOrABridgeIsNotTakenWhateverItFrames) {
  Ip("link set wlan0 down");
  for (const char* command :
       {"tuntap add dev soft0 mode tun", "tuntap add dev soft0 mode tap",
        "link add soft0 type vxlan id 5 dstport 4789 remote 10.65.0.1 dev pdp_ip0",
        "link add soft0 type bridge mcast_snooping 0"}) {
    Ip(command);
    // A device that somebody holds open runs; so does a bridge with a running port.
    const platform::FileDescriptor held = HoldTunnel("soft0");
    Silence("soft0");
    Ip("address add 10.99.0.2/24 dev soft0");
    Ip("link set soft0 up");
    if (std::string(command).find("bridge") != std::string::npos) {
      Ip("link add port0 type veth peer name port1");
      Silence("port1");
      Ip("link set port1 up");
      Ip("link set port0 up master soft0");
    }
    Ip("route add 198.51.100.10/32 dev soft0");
    EXPECT_EQ(outcome("http://198.51.100.10/hello"), "no network that may be used") << command;
    EXPECT_EQ(sent("soft0"), 0) << command;
    Ip("link del soft0");
  }
  EXPECT_EQ(sent("pdp_ip0"), 0);
}

TEST_F(OffCellular, ATunnelThatOnlyItsDeviceTypeTellsIsNotTaken) {
  DeviceTypes types;
  types.set("wlan0", "DEVTYPE=wlan\nINTERFACE=wlan0\n");
  EXPECT_EQ(outcome("http://198.51.100.10/hello"), "hello");
  types.set("wlan0", "DEVTYPE=l2tpeth\nINTERFACE=wlan0\n");
  EXPECT_EQ(outcome("http://198.51.100.10/hello"), "no network that may be used");
  types.set("wlan0", "DEVTYPE=wwan\nINTERFACE=wlan0\n");
  EXPECT_EQ(outcome("http://198.51.100.10/hello"), "no network that may be used");
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
  if (::geteuid() != 0) GTEST_SKIP() << "a mount namespace of one's own needs root";
  DeviceTypes types;
  types.set("usb0", "DEVTYPE=wwan\nINTERFACE=usb0\nIFINDEX=7\n");
  types.set("wlan0", "DEVTYPE=wlan\nINTERFACE=wlan0\nIFINDEX=8\n");
  EXPECT_TRUE(platform::IsCellularInterface("usb0"));
  EXPECT_FALSE(platform::IsCellularInterface("wlan0"));
  EXPECT_FALSE(platform::IsCellularInterface("absent0"));
}

}  // namespace
