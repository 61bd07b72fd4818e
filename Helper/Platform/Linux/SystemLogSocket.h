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

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/SystemLog.h"

namespace platform {

/// The sender. A daemon that does not read costs at most 50 ms once; from then on lines are
/// dropped without waiting until one gets through. A daemon that was restarted is found again.
class SystemLogSocket final : public SystemLog {
 public:
  /// `path`: the daemon's datagram socket. Nothing is opened before the first line.
  explicit SystemLogSocket(std::string path) : path_(std::move(path)) {}

  /// One datagram `<PRI>Mmm dd hh:mm:ss HalvecMobileHelper[pid]: text`, in local time. A text too
  /// long for one datagram is cut to its first 64 KiB.
  void write(LogPriority priority, std::string_view text) override;

 private:
  [[nodiscard]] bool connect();
  /// 0 when the line is sent, else the error number.
  [[nodiscard]] int send(std::string_view head, std::string_view text) const;
  [[nodiscard]] std::string_view timeStamp();

  const std::string path_;
  std::mutex mutex_;
  // Under mutex_:
  FileDescriptor socket_;
  bool dropping_ = false;
  std::time_t stampedSecond_ = -1;
  bool connected_ = false;
  std::array<char, 64> stamp_{};
  std::size_t stampLength_ = 0;
};

}  // namespace platform
