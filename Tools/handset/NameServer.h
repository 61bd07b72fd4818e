// SPDX-License-Identifier: Apache-2.0
//
// The world's name server (RFC 1035): knows the addresses of a few hosts and of nobody else. UDP
// only, because no answer is long. Runs on the event loop of the handset's first process. One
// thread, no lock.
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Tools/handset/EventLoop.h"
#include "Tools/handset/World.h"

namespace handset {

using HostAddress = std::array<std::uint8_t, 4>;

/// The answer to a query for one name: for a name in `hosts`, in whatever case, `address` where an
/// A record is asked for and no record where another is; NXDOMAIN for any other name. Nothing where
/// `query` is no query for one name of the Internet's class, which is not answered. Pure.
[[nodiscard]] std::optional<std::string> AnswerNameQuery(std::string_view query,
                                                         const std::vector<std::string>& hosts,
                                                         const HostAddress& address);

class NameServer {
 public:
  /// Listens in the world at port 53 of `listening`, which need not be there yet, and tells that
  /// `hosts`, in lower case, have `address`. Addresses are dotted. Throws Failure.
  NameServer(EventLoop& loop, const World& world, const std::vector<std::string>& listening,
             std::vector<std::string> hosts, const std::string& address);

  /// Whether queries are answered, or read and dropped.
  void setAnswering(bool isAnswering) { isAnswering_ = isAnswering; }

  /// Takes the queries that are queued now.
  void drain() const;

 private:
  void listen(EventLoop& loop, const std::string& address);
  void serve(int socket) const;

  std::vector<std::string> hosts_;
  HostAddress address_{};
  bool isAnswering_ = true;
  std::vector<platform::FileDescriptor> sockets_;
};

}  // namespace handset
