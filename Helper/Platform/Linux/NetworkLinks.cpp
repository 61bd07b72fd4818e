// SPDX-License-Identifier: Apache-2.0
//
// Interfaces from getifaddrs(3), routes by asking the kernel what it would do (rtnetlink(7)): that
// counts every routing table and rule, which reading one table does not.
#include "Helper/Platform/Linux/NetworkLinks.h"

#include <fnmatch.h>
#include <ifaddrs.h>
#include <linux/if_packet.h>
#include <linux/rtnetlink.h>
#include <net/if.h>
#include <net/if_arp.h>
#include <netinet/in.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstring>
#include <limits>
#include <memory>
#include <span>
#include <string_view>
#include <vector>

#include "Helper/Platform/RegularFile.h"

namespace platform {
namespace {

constexpr std::array kCellularNames{"pdp_ip*", "rmnet*", "wwan*", "ccmni*", "ppp*"};
constexpr std::size_t kLongestUevent = 4096;

struct Address {
  std::span<const std::byte> bytes;  // in the caller's structure
  bool loopback = false;
  int scope = 0;  // the interface that a link-local address names, else 0
};

Address AddressOf(const sockaddr& destination) {
  if (destination.sa_family == AF_INET) {
    const auto& address = reinterpret_cast<const sockaddr_in&>(destination).sin_addr;
    const bool loopback = (ntohl(address.s_addr) >> 24) == IN_LOOPBACKNET;
    return {std::as_bytes(std::span(&address, 1)), loopback, 0};
  }
  if (destination.sa_family == AF_INET6) {
    const auto& whole = reinterpret_cast<const sockaddr_in6&>(destination);
    return {std::as_bytes(std::span(&whole.sin6_addr, 1)),
            IN6_IS_ADDR_LOOPBACK(&whole.sin6_addr) != 0, static_cast<int>(whole.sin6_scope_id)};
  }
  return {};
}

struct RouteQuery {
  nlmsghdr header{};
  rtmsg route{};
  // Two attributes, the interface's index and the destination: each a head and at most 16 bytes.
  std::array<std::byte, 2 * sizeof(rtattr) + sizeof(int) + sizeof(in6_addr)> attributes{};
};

void AppendAttribute(RouteQuery& query, unsigned short type, std::span<const std::byte> value) {
  const rtattr head{static_cast<unsigned short>(sizeof(rtattr) + value.size()), type};
  std::byte* to =
      query.attributes.data() + (query.header.nlmsg_len - offsetof(RouteQuery, attributes));
  std::memcpy(to, &head, sizeof head);
  std::memcpy(to + sizeof head, value.data(), value.size());
  query.header.nlmsg_len += head.rta_len;
}

/// How well a route fits: a longer prefix, then a lower metric, is the better one.
struct Fitness {
  int prefix = -1;
  std::uint32_t metric = 0;
  [[nodiscard]] bool betterThan(const Fitness& other) const {
    return prefix != other.prefix ? prefix > other.prefix : metric < other.metric;
  }
};

std::optional<Fitness> FitnessOf(std::span<const std::byte> reply) {
  nlmsghdr header;
  rtmsg route;
  if (reply.size() < sizeof header + sizeof route) return std::nullopt;
  std::memcpy(&header, reply.data(), sizeof header);
  if (header.nlmsg_type != RTM_NEWROUTE || header.nlmsg_len > reply.size()) return std::nullopt;
  std::memcpy(&route, reply.data() + sizeof header, sizeof route);
  if (route.rtm_type != RTN_UNICAST && route.rtm_type != RTN_LOCAL) return std::nullopt;
  Fitness fitness{route.rtm_dst_len, 0};
  auto rest =
      reply.subspan(sizeof header + sizeof route, header.nlmsg_len - sizeof header - sizeof route);
  rtattr head;
  while (rest.size() >= sizeof head) {
    std::memcpy(&head, rest.data(), sizeof head);
    if (head.rta_len < sizeof head || head.rta_len > rest.size()) break;
    if (head.rta_type == RTA_PRIORITY && head.rta_len == sizeof head + sizeof fitness.metric) {
      std::memcpy(&fitness.metric, rest.data() + sizeof head, sizeof fitness.metric);
    }
    rest = rest.subspan(std::min(rest.size(), std::size_t{RTA_ALIGN(head.rta_len)}));
  }
  return fitness;
}

/// The route to `address` through the interface of that index; none when there is none.
std::optional<Fitness> RouteThrough(int index, sa_family_t family, const Address& address) {
  const FileDescriptor netlink(::socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_ROUTE));
  if (!netlink) return std::nullopt;
  RouteQuery query;
  query.header.nlmsg_len = offsetof(RouteQuery, attributes);
  query.header.nlmsg_type = RTM_GETROUTE;
  query.header.nlmsg_flags = NLM_F_REQUEST;
  query.route.rtm_family = static_cast<unsigned char>(family);
  query.route.rtm_dst_len = static_cast<unsigned char>(address.bytes.size() * 8);
  // The entry of the table, because without one the kernel pretends that the destination is on the
  // link itself.
  query.route.rtm_flags = RTM_F_FIB_MATCH;
  AppendAttribute(query, RTA_OIF, std::as_bytes(std::span(&index, 1)));
  AppendAttribute(query, RTA_DST, address.bytes);
  std::array<std::byte, 4096> reply;
  if (::send(netlink.get(), &query, query.header.nlmsg_len, 0) < 0) return std::nullopt;
  // The kernel has answered by the time that send returns.
  const ssize_t length = ::recv(netlink.get(), reply.data(), reply.size(), MSG_DONTWAIT);
  if (length < 0) return std::nullopt;
  return FitnessOf(std::span(reply).first(static_cast<std::size_t>(length)));
}

bool IsEligible(const ifaddrs& interface, bool loopback) {
  constexpr unsigned int kUp = IFF_UP | IFF_RUNNING;
  if (!interface.ifa_addr || interface.ifa_addr->sa_family != AF_PACKET) return false;
  if ((interface.ifa_flags & kUp) != kUp) return false;
  const auto kind = reinterpret_cast<const sockaddr_ll*>(interface.ifa_addr)->sll_hatype;
  if (loopback) return kind == ARPHRD_LOOPBACK;
  return kind == ARPHRD_ETHER && !IsCellularInterface(interface.ifa_name);
}

}  // namespace

bool IsCellularInterface(const std::string& name) {
  if (std::any_of(kCellularNames.begin(), kCellularNames.end(),
                  [&](const char* pattern) { return ::fnmatch(pattern, name.c_str(), 0) == 0; })) {
    return true;
  }
  const auto uevent =
      ReadRegularFile(("/sys/class/net/" + name + "/uevent").c_str(), kLongestUevent);
  if (!uevent) return false;
  const std::string_view text(reinterpret_cast<const char*>(uevent->data()), uevent->size());
  return text.find("DEVTYPE=wwan\n") != std::string_view::npos;
}

std::optional<int> EligibleInterface(const sockaddr& destination) {
  const Address address = AddressOf(destination);
  if (address.bytes.empty()) return std::nullopt;
  ifaddrs* list = nullptr;
  if (::getifaddrs(&list) != 0) return std::nullopt;
  const std::unique_ptr<ifaddrs, decltype(&::freeifaddrs)> owner(list, &::freeifaddrs);
  std::optional<int> best;
  Fitness bestFitness;
  for (const ifaddrs* each = list; each; each = each->ifa_next) {
    if (!IsEligible(*each, address.loopback)) continue;
    const int index = reinterpret_cast<const sockaddr_ll*>(each->ifa_addr)->sll_ifindex;
    if (address.scope != 0 && address.scope != index) continue;
    const auto fitness = RouteThrough(index, destination.sa_family, address);
    if (fitness && fitness->betterThan(bestFitness)) {
      best = index;
      bestFitness = *fitness;
    }
  }
  return best;
}

FileDescriptor EligibleSocket(const sockaddr& destination, int type, int protocol) {
  const auto index = EligibleInterface(destination);
  if (!index) return {};
  FileDescriptor socket(::socket(destination.sa_family, type | SOCK_CLOEXEC, protocol));
  if (socket &&
      ::setsockopt(socket.get(), SOL_SOCKET, SO_BINDTOIFINDEX, &*index, sizeof *index) != 0) {
    socket.reset();
  }
  return socket;
}

}  // namespace platform
