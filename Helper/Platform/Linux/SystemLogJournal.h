// SPDX-License-Identifier: Apache-2.0
//
// Sends log lines to the journal by its own protocol, so that texts travel unchanged and each line
// carries the request or the queue that it came from as fields. Any thread; one mutex guards the
// socket.
#pragma once

#include <mutex>
#include <string>
#include <string_view>

#include "Helper/Platform/Linux/LogSocket.h"
#include "Helper/Platform/SystemLog.h"

namespace platform {

/// Where the journal listens on a system that has one.
inline constexpr const char* kJournalSocket = "/run/systemd/journal/socket";

class SystemLogJournal final : public SystemLog {
 public:
  /// `path`: the journal's datagram socket.
  explicit SystemLogJournal(std::string path) : socket_(std::move(path)) {}

  /// One datagram of fields (systemd.journal-fields(7)): PRIORITY, SYSLOG_FACILITY (daemon),
  /// SYSLOG_IDENTIFIER, then HALVEC_REQUEST, HALVEC_CALLER_PID and HALVEC_CALLER_UID while a
  /// message is served, or HALVEC_QUEUE in the work of a queue, and MESSAGE with its length in
  /// front, so that line ends in it are kept. A text too long for one datagram is cut to its first
  /// 64 KiB.
  void write(LogPriority priority, std::string_view text) override;

 private:
  std::mutex mutex_;
  LogSocket socket_;  // under mutex_
};

}  // namespace platform
