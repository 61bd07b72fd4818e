// SPDX-License-Identifier: Apache-2.0
//
// The journal's sender, and the choice of the log daemon that this system has.
#include "Helper/Platform/Linux/SystemLogJournal.h"

#include <unistd.h>

#include <array>
#include <bit>
#include <cstdint>
#include <cstring>

#include "Helper/Platform/CurrentWork.h"
#include "Helper/Platform/Linux/SystemLogSocket.h"

namespace platform {
namespace {

void AppendField(std::string& fields, std::string_view name, std::string_view value) {
  fields.append(name).append("=").append(value).append("\n");
}

std::string Fields(LogPriority priority) {
  std::string fields;
  AppendField(fields, "PRIORITY", std::to_string(static_cast<int>(priority)));
  AppendField(fields, "SYSLOG_FACILITY", "3");
  AppendField(fields, "SYSLOG_IDENTIFIER", "HalvecMobileHelper");
  const CurrentWork& work = WorkOfThisThread();
  if (work.requestId != 0) {
    AppendField(fields, "HALVEC_REQUEST", std::to_string(work.requestId));
    AppendField(fields, "HALVEC_CALLER_PID", std::to_string(work.process));
    AppendField(fields, "HALVEC_CALLER_UID", std::to_string(work.user));
  } else if (work.queue) {
    AppendField(fields, "HALVEC_QUEUE", work.queue);
  }
  return fields.append("MESSAGE\n");
}

/// The length that stands before a value which may have line ends: 64 bits, little endian.
std::array<char, 8> LengthOf(std::string_view text) {
  static_assert(std::endian::native == std::endian::little);
  return std::bit_cast<std::array<char, 8>>(std::uint64_t{text.size()});
}

bool Deliver(LogSocket& socket, std::string_view fields, std::string_view text) {
  const std::array<char, 8> length = LengthOf(text);
  return socket.deliver(std::array{fields, std::string_view(length.data(), length.size()), text,
                                   std::string_view("\n")});
}

}  // namespace

void SystemLogJournal::write(LogPriority priority, std::string_view text) {
  const std::string fields = Fields(priority);
  const std::lock_guard lock(mutex_);
  if (Deliver(socket_, fields, text)) return;
  (void)Deliver(socket_, fields, text.substr(0, LogSocket::kLongestCutText));
}

template <>
SystemLog& DefaultProvider<SystemLog>() {
  static SystemLog& log = ::access(kJournalSocket, F_OK) == 0
                              ? static_cast<SystemLog&>(*new SystemLogJournal(kJournalSocket))
                              : *new SystemLogSocket("/dev/log");
  return log;
}

}  // namespace platform
