// SPDX-License-Identifier: Apache-2.0
//
// What passes the far sides of the links: packet(7) sockets in the world, read on the event loop of
// the handset's first process. One thread, no lock.
#pragma once

#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Tools/handset/EventLoop.h"
#include "Tools/handset/Links.h"
#include "Tools/handset/Packet.h"

namespace handset {

class Capture {
 public:
  Capture(EventLoop& loop, const World& world) : loop_(loop), world_(world), buffer_(kLongest) {}

  /// Keeps the IPv4 packets of this link from now on; nothing changes where it does so already.
  /// Throws Failure where the link is not there.
  void start(const Link& link);

  /// To be called before a link goes and after it came: a capture outlives the interface.
  void suspend(const Link& link);
  void resume(const Link& link);

  /// Takes everything that is queued now. What was sent before the call is in packets() afterwards.
  void drain();

  /// In the order of reading.
  [[nodiscard]] const std::vector<Packet>& packets() const { return packets_; }

  /// How many packets came too fast to be kept.
  [[nodiscard]] unsigned lost();

  /// Called after new packets came.
  void onPacket(std::function<void()> action) { changed_ = std::move(action); }

  /// Sends `bytes`, which begin with an IP header, from the far side of the link to the handset;
  /// throws Failure.
  void inject(const Link& link, std::string_view bytes) const;

 private:
  static constexpr std::size_t kLongest = 2048;  ///< Bytes kept of one packet.

  struct Tap {
    platform::FileDescriptor socket;  ///< None while the link is gone.
    EventLoop::Ticket watch = 0;
  };

  void open(const Link& link, Tap& tap);
  void drainTap(const std::string& link, const Tap& tap);
  [[nodiscard]] bool receiveOne(const std::string& link, const Tap& tap);

  EventLoop& loop_;
  const World& world_;
  std::vector<char> buffer_;
  std::map<std::string, Tap> taps_;
  std::vector<Packet> packets_;
  unsigned lost_ = 0;
  std::function<void()> changed_;
};

}  // namespace handset
