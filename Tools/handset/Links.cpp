// SPDX-License-Identifier: Apache-2.0
//
// veth(4) pairs by rtnetlink(7). One thread, no lock.
#include "Tools/handset/Links.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <linux/veth.h>
#include <net/if.h>
#include <unistd.h>

#include <algorithm>
#include <optional>
#include <utility>

#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"
#include "Tools/handset/Network.h"
#include "Tools/handset/Options.h"

namespace handset {
namespace {

using platform::FileDescriptor;
using namespace std::string_view_literals;

constexpr std::uint8_t kPrefix = 24;
constexpr std::uint8_t kSingleHost = 32;

RouteSocket RoutesOf(const World& world) {
  std::optional<RouteSocket> routes;
  world.inside([&routes] { routes.emplace(); });
  return std::move(*routes);
}

/// Writes a setting of the thread's network namespace. A kernel without IPv6 lacks some.
void SetIfThere(const std::string& path, std::string_view value) {
  const FileDescriptor file(open(path.c_str(), O_WRONLY | O_CLOEXEC));
  if (!file && errno == ENOENT) return;
  if (!file || !WriteAll(file.get(), value)) throw Failure::FromErrno("write " + path);
}

void Prepare() {
  const std::string settings = "/proc/sys/net/";
  // A new namespace takes the host's values, which would make a handset depend on its host.
  SetIfThere(settings + "ipv4/conf/all/rp_filter", "0");
  SetIfThere(settings + "ipv4/conf/default/rp_filter", "0");
  // Neighbour discovery would be seen and counted on the links.
  SetIfThere(settings + "ipv6/conf/default/disable_ipv6", "1");
}

/// Without address resolution the kernel sends to the interface's own hardware address, so that
/// both sides must have the same.
ifinfomsg InterfaceWithoutArp(unsigned index) {
  ifinfomsg interface {};
  interface.ifi_index = static_cast<int>(index);
  interface.ifi_flags = IFF_NOARP;
  interface.ifi_change = IFF_NOARP;
  return interface;
}

/// The two sides never have the same index: with equal ones the kernel takes a new pair for one of
/// the interfaces whose coming up can wait for up to a second.
void MakePair(const RouteSocket& routes, const Link& link, unsigned index, int world) {
  constexpr unsigned kFarIndexOffset = 1000;
  NetlinkRequest request(RTM_NEWLINK, NLM_F_ACK | NLM_F_CREATE | NLM_F_EXCL);
  request.append(InterfaceWithoutArp(index));
  request.attributeText(IFLA_IFNAME, link.name);
  request.attribute(IFLA_ADDRESS, HardwareAddress(link));
  const std::size_t information = request.open(IFLA_LINKINFO);
  request.attributeText(IFLA_INFO_KIND, "veth");
  const std::size_t data = request.open(IFLA_INFO_DATA);
  const std::size_t peer = request.open(VETH_INFO_PEER);
  request.append(InterfaceWithoutArp(index + kFarIndexOffset));
  request.attributeText(IFLA_IFNAME, link.farName);
  request.attribute(IFLA_ADDRESS, HardwareAddress(link));
  request.attributeNumber(IFLA_NET_NS_FD, static_cast<std::uint32_t>(world));
  request.close(peer);
  request.close(data);
  request.close(information);
  routes.call(request, std::string("make ") + link.name);
}

std::uint32_t Parse(const char* address) {
  in_addr parsed{};
  if (inet_pton(AF_INET, address, &parsed) != 1) {
    throw Failure(std::string(address) + " is no IPv4 address");
  }
  return parsed.s_addr;
}

void AddAddress(const RouteSocket& routes, unsigned index, const char* address,
                std::uint8_t prefix) {
  NetlinkRequest request(RTM_NEWADDR, NLM_F_ACK | NLM_F_CREATE | NLM_F_EXCL);
  ifaddrmsg fixed{};
  fixed.ifa_family = AF_INET;
  fixed.ifa_prefixlen = prefix;
  fixed.ifa_index = index;
  request.append(fixed);
  request.attributeNumber(IFA_LOCAL, Parse(address));
  routes.call(request, std::string("add the address ") + address);
}

void SetUp(const RouteSocket& routes, unsigned index, bool isUp) {
  NetlinkRequest request(RTM_NEWLINK, NLM_F_ACK);
  ifinfomsg fixed{};
  fixed.ifi_index = static_cast<int>(index);
  if (isUp) fixed.ifi_flags = IFF_UP;
  fixed.ifi_change = IFF_UP;
  request.append(fixed);
  routes.call(request, isUp ? "take an interface up" : "take an interface down");
}

void AddDefaultRoute(const RouteSocket& routes, unsigned index, const Link& link) {
  NetlinkRequest request(RTM_NEWROUTE, NLM_F_ACK | NLM_F_CREATE | NLM_F_REPLACE);
  rtmsg fixed{};
  fixed.rtm_family = AF_INET;
  fixed.rtm_table = RT_TABLE_MAIN;
  fixed.rtm_protocol = RTPROT_STATIC;
  fixed.rtm_scope = RT_SCOPE_UNIVERSE;
  fixed.rtm_type = RTN_UNICAST;
  request.append(fixed);
  request.attributeNumber(RTA_GATEWAY, Parse(link.farAddress));
  request.attributeNumber(RTA_OIF, index);
  request.attributeNumber(RTA_PRIORITY, link.metric);
  routes.call(request, std::string("add a route over ") + link.name);
}

}  // namespace

const std::vector<Link>& AllLinks() {
  static const std::vector<Link> links{
      {"pdp_ip0", "tower", "10.64.0.2", "10.64.0.1", {HALVEC_HEARTBEAT_TARGET}, 100},
      {"wlan0", "access-point", "192.168.64.2", "192.168.64.1", {}, 600}};
  return links;
}

std::string_view HardwareAddress(const Link& link) {
  return &link == &AllLinks().front() ? "\x02\0\0\0\0\x01"sv : "\x02\0\0\0\0\x02"sv;
}

const Link& RequireLink(const std::string& name) {
  const auto found = std::find_if(AllLinks().begin(), AllLinks().end(),
                                  [&name](const Link& link) { return link.name == name; });
  if (found == AllLinks().end()) RefuseUsage("no link is called " + name);
  return *found;
}

Links::Links(const World& world) : world_(world), worldRoutes_(RoutesOf(world)) {
  Prepare();
  world_.inside([] {
    Prepare();
    Network().bringUpLoopback();
  });
  AddAddress(worldRoutes_, worldRoutes_.indexOf("lo"), kWorldAddress, kSingleHost);
}

void Links::add(const Link& link) {
  if (isThere(link)) throw Failure(std::string(link.name) + " is there already", 1);
  MakePair(handsetRoutes_, link, nextIndex_++, world_.descriptor());
  const unsigned farIndex = worldRoutes_.indexOf(link.farName);
  AddAddress(worldRoutes_, farIndex, link.farAddress, kPrefix);
  for (const char* address : link.behind) AddAddress(worldRoutes_, farIndex, address, kSingleHost);
  SetUp(worldRoutes_, farIndex, true);
  AddAddress(handsetRoutes_, requireIndex(link), link.address, kPrefix);
  up(link);
}

void Links::remove(const Link& link) const {
  NetlinkRequest request(RTM_DELLINK, NLM_F_ACK);
  ifinfomsg fixed{};
  fixed.ifi_index = static_cast<int>(requireIndex(link));
  request.append(fixed);
  handsetRoutes_.call(request, std::string("remove ") + link.name);
}

void Links::up(const Link& link) const {
  const unsigned index = requireIndex(link);
  SetUp(handsetRoutes_, index, true);
  handsetRoutes_.waitUntilReady(index);
  worldRoutes_.waitUntilReady(worldRoutes_.indexOf(link.farName));
  AddDefaultRoute(handsetRoutes_, index, link);
}

void Links::down(const Link& link) const { SetUp(handsetRoutes_, requireIndex(link), false); }

bool Links::isThere(const Link& link) const { return handsetRoutes_.indexOf(link.name) != 0; }

unsigned Links::requireIndex(const Link& link) const {
  const unsigned index = handsetRoutes_.indexOf(link.name);
  if (index == 0) throw Failure(std::string("there is no ") + link.name, 1);
  return index;
}

Counters Links::counters(const Link& link) const {
  static_cast<void>(requireIndex(link));
  const auto read = [&link](const char* name) -> std::uint64_t {
    const std::string path = std::string("/sys/class/net/") + link.name + "/statistics/" + name;
    return std::stoull(ReadWholeFile(path));
  };
  return {read("rx_packets"), read("rx_bytes"), read("tx_packets"), read("tx_bytes")};
}

void Links::setEchoReplies(bool areOn) const {
  world_.inside(
      [areOn] { SetIfThere("/proc/sys/net/ipv4/icmp_echo_ignore_all", areOn ? "0" : "1"); });
}

}  // namespace handset
