// SPDX-License-Identifier: Apache-2.0
//
// Requests to the kernel's routing subsystem (netlink(7), rtnetlink(7)): interfaces, addresses,
// routes. A socket belongs to the network namespace in which it was made, wherever it is used. One
// thread, no lock.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "Helper/Platform/FileDescriptor.h"

namespace handset {

/// One request, put together from front to back.
class NetlinkRequest {
 public:
  /// `type` and `flags` as in rtnetlink(7).
  NetlinkRequest(std::uint16_t type, unsigned flags);

  /// Appends the fixed part that belongs to the type, or to an attribute that begins with one.
  template <typename Fixed>
  void append(const Fixed& fixed) {
    appendBytes({reinterpret_cast<const char*>(&fixed), sizeof fixed});
  }
  /// Appends an attribute that holds `bytes`.
  void attribute(unsigned type, std::string_view bytes);
  /// Appends an attribute that holds the text and its closing NUL.
  void attributeText(unsigned type, const std::string& text);
  /// Appends an attribute that holds the number as it stands in memory.
  template <typename Number>
  void attributeNumber(unsigned type, Number number) {
    attribute(type, {reinterpret_cast<const char*>(&number), sizeof number});
  }

  /// Begins an attribute that holds what is appended until close(), to which the answer belongs.
  [[nodiscard]] std::size_t open(unsigned type);
  void close(std::size_t attribute);

  /// The finished request.
  [[nodiscard]] const std::string& bytes();

 private:
  void appendBytes(std::string_view bytes);

  std::string bytes_;
};

class RouteSocket {
 public:
  /// In the caller's network namespace. Throws Failure.
  RouteSocket();

  /// Sends the request and waits for the kernel's verdict; throws Failure, "`doing`: reason".
  void call(NetlinkRequest& request, const std::string& doing) const;

  /// Returns when the interface, which is up and whose other side is, can send: the kernel connects
  /// it to its queue a moment after that. Throws Failure where that does not come about.
  void waitUntilReady(unsigned index) const;

  /// The index of the interface called `name`; 0 where there is none.
  [[nodiscard]] unsigned indexOf(const std::string& name) const;

 private:
  [[nodiscard]] std::string exchange(NetlinkRequest& request, const std::string& doing) const;
  [[nodiscard]] unsigned operationalState(unsigned index) const;

  platform::FileDescriptor socket_;
};

}  // namespace handset
