// SPDX-License-Identifier: Apache-2.0
//
// The handset's two links to the world, each a pair of interfaces: the cellular data interface
// pdp_ip0, whose far side is the tower, and the Wi-Fi interface wlan0, whose far side is the access
// point. No address resolution happens on either, so that every packet counted or captured is
// somebody's own. One thread, no lock.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "Tools/handset/Netlink.h"
#include "Tools/handset/World.h"

namespace handset {

/// One link as it is built. Addresses are IPv4, dotted; the prefix is 24 bits.
struct Link {
  const char* name;                 ///< The handset's side.
  const char* farName;              ///< The world's side.
  const char* address;              ///< Of the handset's side.
  const char* farAddress;           ///< Of the world's side, the way to everything else.
  std::vector<const char*> behind;  ///< Further addresses of the world's side.
  unsigned metric;                  ///< Of the default route over this link; the lowest wins.
};

/// An address of the world itself, to which either link leads: servers may listen there.
inline constexpr const char* kWorldAddress = "198.51.100.1";

/// The two links: cellular first.
[[nodiscard]] const std::vector<Link>& AllLinks();

/// The link whose handset side is called `name`; throws Failure with kStatusUsage.
[[nodiscard]] const Link& RequireLink(const std::string& name);

/// The hardware address of both interfaces of the link, six bytes.
[[nodiscard]] std::string_view HardwareAddress(const Link& link);

/// What went through an interface of the handset since it was made.
struct Counters {
  std::uint64_t receivedPackets = 0;
  std::uint64_t receivedBytes = 0;
  std::uint64_t sentPackets = 0;
  std::uint64_t sentBytes = 0;
};

class Links {
 public:
  /// Prepares both sides: the world has its own address, reverse-path filters and IPv6 of later
  /// interfaces are off. Throws Failure.
  explicit Links(const World& world);

  /// Makes both interfaces of the link, with addresses and default route, and takes them up; throws
  /// Failure, also where it is there.
  void add(const Link& link);
  /// Removes both; throws Failure where it is not there.
  void remove(const Link& link) const;
  /// Takes the handset's side up and gives it its default route again. Throws Failure where it is
  /// not there.
  void up(const Link& link) const;
  /// Takes the handset's side down, whereby its routes go. Throws Failure where it is not there.
  void down(const Link& link) const;

  [[nodiscard]] bool isThere(const Link& link) const;
  /// Throws Failure where the link is not there.
  [[nodiscard]] Counters counters(const Link& link) const;

  /// Whether the world answers echo requests; throws Failure.
  void setEchoReplies(bool areOn) const;

 private:
  [[nodiscard]] unsigned requireIndex(const Link& link) const;

  const World& world_;
  RouteSocket handsetRoutes_;
  RouteSocket worldRoutes_;
  unsigned nextIndex_ = 2;  ///< As in any system: the loopback interface is number 1.
};

}  // namespace handset
