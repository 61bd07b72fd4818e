// SPDX-License-Identifier: Apache-2.0
//
// Sends log lines as datagrams to the log daemon's socket, in the form of RFC 3164 with facility
// daemon. Any thread; one mutex guards the socket and the cached time stamp.
#pragma once

#include <array>
#include <cstddef>
#include <ctime>
#include <mutex>
#include <string>
#include <string_view>

#include "Helper/Platform/Linux/LogSocket.h"
#include "Helper/Platform/SystemLog.h"

namespace platform {

class SystemLogSocket final : public SystemLog {
 public:
  /// `path`: the daemon's datagram socket.
  explicit SystemLogSocket(std::string path) : socket_(std::move(path)) {}

  /// One datagram `<PRI>Mmm dd hh:mm:ss HalvecMobileHelper[pid]: text`, in local time. A text too
  /// long for one datagram is cut to its first 64 KiB.
  void write(LogPriority priority, std::string_view text) override;

 private:
  [[nodiscard]] std::string_view timeStamp();

  std::mutex mutex_;
  // Under mutex_:
  LogSocket socket_;
  std::time_t stampedSecond_ = -1;
  std::array<char, 64> stamp_{};
  std::size_t stampLength_ = 0;
};

}  // namespace platform
