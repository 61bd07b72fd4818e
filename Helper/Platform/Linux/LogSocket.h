// SPDX-License-Identifier: Apache-2.0
//
// The datagram socket of a log daemon: found again when the daemon restarts, never waited for when
// it does not read. One thread at a time.
#pragma once

#include <cstddef>
#include <span>
#include <string>
#include <string_view>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {

class LogSocket {
 public:
  /// A text longer than this is cut where a whole line does not fit into one datagram.
  static constexpr std::size_t kLongestCutText = std::size_t{64} << 10;

  /// `path`: the daemon's datagram socket. Nothing is opened before the first line.
  explicit LogSocket(std::string path) : path_(std::move(path)) {}

  /// Sends the parts as one datagram. False when it is too long to travel; a datagram that nobody
  /// takes counts as sent. A daemon that does not read costs at most 50 ms once; from then on lines
  /// are dropped without waiting until one gets through.
  [[nodiscard]] bool deliver(std::span<const std::string_view> parts);

 private:
  [[nodiscard]] bool connect();
  [[nodiscard]] int send(std::span<const std::string_view> parts) const;

  const std::string path_;
  FileDescriptor socket_;
  bool connected_ = false;
  bool dropping_ = false;
};

}  // namespace platform
