// SPDX-License-Identifier: Apache-2.0
//
// The system log: one line of text at one priority. Texts are fixed by the callers and travel
// unchanged, trailing newlines and blanks included. Any thread; a writer never waits for a log
// daemon that does not read.
#pragma once

#include <string_view>

#include "Helper/Platform/SharedService.h"

namespace platform {

/// Numeric priorities of syslog (RFC 5424, section 6.2.1).
enum class LogPriority : int { kError = 3, kNotice = 5, kInfo = 6 };

class SystemLog {
 public:
  virtual ~SystemLog() = default;
  /// Writes `text` as one entry. Loses it, silently, when no log daemon takes it in time.
  virtual void write(LogPriority priority, std::string_view text) = 0;
};

template <>
SystemLog& DefaultProvider<SystemLog>();

/// Formats like printf, at any length, and writes the result to the shared system log.
void Log(LogPriority priority, const char* format, ...) __attribute__((format(printf, 2, 3)));

}  // namespace platform
