// SPDX-License-Identifier: Apache-2.0
//
// The handset's log daemon: the datagram socket /dev/log, every message kept byte for byte. Runs
// on the event loop of the handset's first process. One thread, no lock.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Tools/handset/EventLoop.h"

namespace handset {

/// One message of the system log. `text` is what the writer wrote, trailing newlines and blanks
/// included; the header in front of it (RFC 3164, section 4.1: "<PRI>TIMESTAMP TAG: ") is taken
/// apart into the other fields.
struct LogEntry {
  int facility = 0;
  int priority = 0;        ///< 0 to 7 (RFC 5424, section 6.2.1).
  std::string identifier;  ///< The tag without its process id; empty where there is none.
  std::string text;
  std::string raw;        ///< The datagram as it came.
  pid_t sender = 0;       ///< As the kernel attests it.
  uid_t senderUser = 0;   ///< Likewise.
  bool isCutOff = false;  ///< The datagram was longer than 256 KiB.
};

/// Takes a datagram apart. A missing or malformed piece of the header is left in the text; without
/// a priority the entry is a notice of the user facility, as RFC 3164, section 4.3.3 has it.
[[nodiscard]] LogEntry ParseLogDatagram(std::string_view datagram);

/// The entry as one line of JSON: facility, priority, identifier, text, pid, uid, raw; where the
/// datagram is not UTF-8 also text_hex and raw_hex, which are exact.
[[nodiscard]] std::string LogEntryJson(const LogEntry& entry);

/// "<PRIORITY>TEXT" with exactly one newline at its end, for people.
[[nodiscard]] std::string LogEntryLine(const LogEntry& entry);

class SystemLogCapture {
 public:
  /// Entries also go to `file` as JSON lines, where that is a descriptor, and to standard error
  /// where `verbose` says so.
  SystemLogCapture(EventLoop& loop, int file, bool verbose)
      : loop_(loop), file_(file), verbose_(verbose), buffer_(kLongestDatagram) {}

  /// Creates /dev/log, writable by everybody, and starts to read it; throws Failure.
  void open();

  /// Takes everything that is queued now. What a writer sent before the call is in entries()
  /// afterwards.
  void drain();

  [[nodiscard]] const std::vector<LogEntry>& entries() const { return entries_; }

  /// Called after new entries came.
  void onEntry(std::function<void()> action) { changed_ = std::move(action); }

 private:
  static constexpr std::size_t kLongestDatagram = std::size_t{256} * 1024;

  [[nodiscard]] bool receiveOne();
  void keep(LogEntry entry);

  EventLoop& loop_;
  int file_;
  bool verbose_;
  platform::FileDescriptor socket_;
  std::vector<char> buffer_;
  std::vector<LogEntry> entries_;
  std::function<void()> changed_;
};

}  // namespace handset
