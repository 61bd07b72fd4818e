// SPDX-License-Identifier: Apache-2.0
//
// Cooked packet sockets: the link's own header is the kernel's business. One thread, no lock.
#include "Tools/handset/Capture.h"

#include <arpa/inet.h>
#include <linux/if_ether.h>
#include <linux/if_packet.h>
#include <net/if.h>
#include <sys/epoll.h>
#include <sys/socket.h>

#include <cstring>
#include <ctime>
#include <utility>

#include "Tools/handset/Failure.h"

namespace handset {
namespace {

using platform::FileDescriptor;

sockaddr_ll FarSide(const Link& link, std::uint16_t protocol) {
  sockaddr_ll address{};
  address.sll_family = AF_PACKET;
  address.sll_protocol = htons(protocol);
  address.sll_ifindex = static_cast<int>(if_nametoindex(link.farName));
  if (address.sll_ifindex == 0) throw Failure(std::string("there is no ") + link.name, 1);
  return address;
}

std::int64_t Now() {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return std::int64_t{now.tv_sec} * 1'000'000'000 + now.tv_nsec;
}

}  // namespace

void Capture::start(const Link& link) {
  if (taps_.contains(link.name)) return;
  Tap tap;
  open(link, tap);
  taps_.emplace(link.name, std::move(tap));
}

void Capture::open(const Link& link, Tap& tap) {
  world_.inside([&] {
    // Protocol 0 until it is bound: a socket for everything would begin with every interface.
    FileDescriptor socket(::socket(AF_PACKET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    // A burst must not be lost while the first process is busy elsewhere.
    const int room = 8 << 20;
    const sockaddr_ll address = FarSide(link, ETH_P_ALL);
    if (!socket || setsockopt(socket.get(), SOL_SOCKET, SO_RCVBUFFORCE, &room, sizeof room) != 0 ||
        bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
      throw Failure::FromErrno(std::string("capture at ") + link.farName);
    }
    tap.socket = std::move(socket);
  });
  const std::string name = link.name;
  tap.watch = loop_.watch(tap.socket.get(), EPOLLIN,
                          [this, name](std::uint32_t) { drainTap(name, taps_.at(name)); });
}

void Capture::suspend(const Link& link) {
  const auto found = taps_.find(link.name);
  if (found == taps_.end()) return;
  Tap& tap = found->second;
  drainTap(link.name, tap);
  loop_.forget(std::exchange(tap.watch, 0));
  tap.socket.reset();
}

void Capture::resume(const Link& link) {
  const auto found = taps_.find(link.name);
  if (found != taps_.end()) open(link, found->second);
}

void Capture::drain() {
  for (const auto& [name, tap] : taps_) drainTap(name, tap);
}

void Capture::drainTap(const std::string& link, const Tap& tap) {
  bool isNew = false;
  while (tap.socket && receiveOne(link, tap)) isNew = true;
  if (isNew && changed_) changed_();
}

bool Capture::receiveOne(const std::string& link, const Tap& tap) {
  sockaddr_ll from{};
  socklen_t size = sizeof from;
  const ssize_t count = recvfrom(tap.socket.get(), buffer_.data(), buffer_.size(), MSG_DONTWAIT,
                                 reinterpret_cast<sockaddr*>(&from), &size);
  if (count < 0) return false;
  if (from.sll_protocol != htons(ETH_P_IP)) return true;
  packets_.push_back({Now(), link, from.sll_pkttype != PACKET_OUTGOING,
                      std::string(buffer_.data(), static_cast<std::size_t>(count))});
  return true;
}

unsigned Capture::lost() {
  for (const auto& [name, tap] : taps_) {
    tpacket_stats statistics{};
    socklen_t size = sizeof statistics;
    // Reading the statistics sets them to zero again.
    if (tap.socket &&
        getsockopt(tap.socket.get(), SOL_PACKET, PACKET_STATISTICS, &statistics, &size) == 0) {
      lost_ += statistics.tp_drops;
    }
  }
  return lost_;
}

void Capture::inject(const Link& link, std::string_view bytes) const {
  world_.inside([&] {
    const FileDescriptor socket(::socket(AF_PACKET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    if (!socket) throw Failure::FromErrno("socket");
    sockaddr_ll address = FarSide(link, ETH_P_IP);
    address.sll_halen = ETH_ALEN;
    const std::string_view hardware = HardwareAddress(link);
    std::memcpy(static_cast<unsigned char*>(address.sll_addr), hardware.data(), hardware.size());
    if (sendto(socket.get(), bytes.data(), bytes.size(), 0,
               reinterpret_cast<const sockaddr*>(&address), sizeof address) < 0) {
      throw Failure::FromErrno(std::string("send from ") + link.farName);
    }
  });
}

}  // namespace handset
