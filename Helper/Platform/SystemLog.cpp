// SPDX-License-Identifier: Apache-2.0
//
// The formatting front of the system log. Any thread; no state.
#include "Helper/Platform/SystemLog.h"

#include <array>
#include <cstdarg>
#include <cstdio>
#include <string>

namespace platform {

void Log(LogPriority priority, const char* format, ...) {
  std::array<char, 512> line;
  va_list arguments;
  va_start(arguments, format);
  va_list again;
  va_copy(again, arguments);
  const int length = std::vsnprintf(line.data(), line.size(), format, arguments);
  if (length >= 0) {
    const auto size = static_cast<std::size_t>(length);
    if (size < line.size()) {
      Shared<SystemLog>().write(priority, std::string_view(line.data(), size));
    } else {
      std::string text(size, '\0');
      // Writes its terminator over the string's own.
      std::vsnprintf(text.data(), size + 1, format, again);
      Shared<SystemLog>().write(priority, text);
    }
  }
  va_end(again);
  va_end(arguments);
}

}  // namespace platform
