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

bool HasDeviceType(const std::string& name, const std::string& type) {
  const auto uevent =
      ReadRegularFile(("/sys/class/net/" + name + "/uevent").c_str(), kLongestUevent);
  if (!uevent) return false;
  const std::string_view text(reinterpret_cast<const char*>(uevent->data()), uevent->size());
  return text.find("DEVTYPE=" + type + "\n") != std::string_view::npos;
}

struct Address {
  std::span<const std::byte> bytes;  // in the caller's structure; empty where no link leads there
  bool loopback = false;
  int scope = 0;  // the interface that a link-local address names, else 0
};

Address AddressOf(const sockaddr& destination) {
  if (destination.sa_family == AF_INET) {
    const auto& address = reinterpret_cast<const sockaddr_in&>(destination).sin_addr;
    const bool loopback = (ntohl(address.s_addr) >> 24) == IN_LOOPBACKNET;
    if (address.s_addr == htonl(INADDR_ANY)) return {};  // it stands for the handset itself
    return {std::as_bytes(std::span(&address, 1)), loopback, 0};
  }
  if (destination.sa_family == AF_INET6) {
    const auto& whole = reinterpret_cast<const sockaddr_in6&>(destination);
    // The same, and what the kernel sends by the routes of IPv4, which were not asked.
    if (IN6_IS_ADDR_UNSPECIFIED(&whole.sin6_addr) || IN6_IS_ADDR_V4MAPPED(&whole.sin6_addr)) {
      return {};
    }
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

/// A reply of the kernel: what its message begins with, and the attributes behind that.
template <class Body>
struct Reply {
  Body body;
  std::span<const std::byte> attributes;
};

/// Takes a whole message of type `type` apart; none where `bytes` is anything else.
template <class Body>
std::optional<Reply<Body>> ReplyIn(std::span<const std::byte> bytes, std::uint16_t type) {
  nlmsghdr header;
  Reply<Body> reply;
  constexpr std::size_t kHead = sizeof header + sizeof reply.body;
  if (bytes.size() < kHead) return std::nullopt;
  std::memcpy(&header, bytes.data(), sizeof header);
  if (header.nlmsg_type != type || header.nlmsg_len < kHead || header.nlmsg_len > bytes.size()) {
    return std::nullopt;
  }
  std::memcpy(&reply.body, bytes.data() + sizeof header, sizeof reply.body);
  reply.attributes = bytes.first(header.nlmsg_len).subspan(kHead);
  return reply;
}

/// The value of the first attribute of that type; empty without one.
std::span<const std::byte> AttributeIn(std::span<const std::byte> attributes, int type) {
  rtattr head;
  while (attributes.size() >= sizeof head) {
    std::memcpy(&head, attributes.data(), sizeof head);
    if (head.rta_len < sizeof head || head.rta_len > attributes.size()) break;
    if ((head.rta_type & NLA_TYPE_MASK) == type) {
      return attributes.first(head.rta_len).subspan(sizeof head);
    }
    attributes =
        attributes.subspan(std::min(attributes.size(), std::size_t{RTA_ALIGN(head.rta_len)}));
  }
  return {};
}

using ReplyBuffer = std::array<std::byte, std::size_t{16} << 10>;

/// The kernel's answer to the message that `query` begins with, in `buffer`; empty without one.
template <class Query>
std::span<const std::byte> AskKernel(const Query& query, ReplyBuffer& buffer) {
  const FileDescriptor netlink(::socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_ROUTE));
  if (!netlink || ::send(netlink.get(), &query, query.header.nlmsg_len, 0) < 0) return {};
  // The kernel has answered by the time that send returns.
  const ssize_t length = ::recv(netlink.get(), buffer.data(), buffer.size(), MSG_DONTWAIT);
  return std::span(buffer).first(length < 0 ? 0 : static_cast<std::size_t>(length));
}

/// The route to `address` through the interface of that index; none when there is none.
std::optional<Fitness> RouteThrough(int index, sa_family_t family, const Address& address) {
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
  ReplyBuffer buffer;
  const auto reply = ReplyIn<rtmsg>(AskKernel(query, buffer), RTM_NEWROUTE);
  // What is the handset's own address never leaves it, whatever link the address belongs to.
  if (!reply || reply->body.rtm_type != (address.loopback ? RTN_LOCAL : RTN_UNICAST)) {
    return std::nullopt;
  }
  Fitness fitness{reply->body.rtm_dst_len, 0};
  const auto metric = AttributeIn(reply->attributes, RTA_PRIORITY);
  if (metric.size() == sizeof fitness.metric) {
    std::memcpy(&fitness.metric, metric.data(), sizeof fitness.metric);
  }
  return fitness;
}

struct LinkQuery {
  nlmsghdr header{};
  ifinfomsg link{};
};

/// What the kernel calls the kind of a device that it makes in software ("tun", "vxlan", "veth");
/// empty for every other device, none when it does not tell.
std::optional<std::string> SoftwareKindOf(int index) {
  LinkQuery query;
  query.header = {sizeof query, RTM_GETLINK, NLM_F_REQUEST, 0, 0};
  query.link.ifi_index = index;
  ReplyBuffer buffer;
  const auto reply = ReplyIn<ifinfomsg>(AskKernel(query, buffer), RTM_NEWLINK);
  if (!reply) return std::nullopt;
  const auto kind = AttributeIn(AttributeIn(reply->attributes, IFLA_LINKINFO), IFLA_INFO_KIND);
  const std::string text(reinterpret_cast<const char*>(kind.data()), kind.size());
  return text.substr(0, text.find('\0'));
}

/// Whether frames leave the handset where this interface is, as far as the kernel knows: not a
/// tunnel, nor a bridge or the like over others. A veth is a cable, to another name space.
bool HasItsOwnWire(int index, const std::string& name) {
  const auto kind = SoftwareKindOf(index);
  if (!kind || (!kind->empty() && *kind != "veth")) return false;
  return !HasDeviceType(name, "l2tpeth");  // the one tunnel that has no kind
}

bool IsEligible(const ifaddrs& interface, bool loopback) {
  constexpr unsigned int kUp = IFF_UP | IFF_RUNNING;
  if (!interface.ifa_addr || interface.ifa_addr->sa_family != AF_PACKET) return false;
  if ((interface.ifa_flags & kUp) != kUp) return false;
  const auto& link = *reinterpret_cast<const sockaddr_ll*>(interface.ifa_addr);
  if (loopback) return link.sll_hatype == ARPHRD_LOOPBACK;
  return link.sll_hatype == ARPHRD_ETHER && !IsCellularInterface(interface.ifa_name) &&
         HasItsOwnWire(link.sll_ifindex, interface.ifa_name);
}

}  // namespace

bool IsCellularInterface(const std::string& name) {
  if (std::any_of(kCellularNames.begin(), kCellularNames.end(),
                  [&](const char* pattern) { return ::fnmatch(pattern, name.c_str(), 0) == 0; })) {
    return true;
  }
  return HasDeviceType(name, "wwan");
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
