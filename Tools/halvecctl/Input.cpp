// SPDX-License-Identifier: Apache-2.0
//
// std::from_chars alone decides what a number is: no locale, no blanks, nothing left over.
#include "Tools/halvecctl/Input.h"

#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <limits>
#include <optional>
#include <string_view>

#include "Client/SealedMemory.h"
#include "Helper/Platform/FileDescriptor.h"
#include "Tools/halvecctl/Exit.h"

namespace halvecctl {
namespace {

std::optional<std::uint64_t> Magnitude(std::string_view text) {
  const bool hexadecimal = text.starts_with("0x") || text.starts_with("0X");
  if (hexadecimal) text.remove_prefix(2);
  std::uint64_t value = 0;
  const char* end = text.data() + text.size();
  const auto result = std::from_chars(text.data(), end, value, hexadecimal ? 16 : 10);
  if (result.ec != std::errc{} || result.ptr != end) return std::nullopt;
  return value;
}

Failure NotANumber(const std::string& text, const std::string& range) {
  return UsageFailure("'" + text + "' is not an integer " + range);
}

}  // namespace

std::vector<std::byte> ReadInput(const std::string& path) {
  const bool standard = path == "-";
  platform::FileDescriptor file;
  if (!standard) {
    file.reset(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
    if (!file) throw UsageFailure("cannot open " + path + ": " + ::strerrordesc_np(errno));
  }
  const std::string name = standard ? "standard input" : path;
  std::vector<std::byte> content;
  std::array<std::byte, 65536> block;
  for (;;) {
    const ssize_t got = ::read(standard ? STDIN_FILENO : file.get(), block.data(), block.size());
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) throw UsageFailure("cannot read " + name + ": " + ::strerrordesc_np(errno));
    if (got == 0) return content;
    content.insert(content.end(), block.begin(), block.begin() + got);
    if (content.size() > halvec::kMaxOutOfLineBytes) {
      throw UsageFailure(name + " is longer than 16 MiB");
    }
  }
}

std::int64_t ParseInteger(const std::string& text, std::int64_t least, std::int64_t most) {
  const bool negative = text.starts_with('-');
  const auto magnitude = Magnitude(std::string_view(text).substr(negative ? 1 : 0));
  const auto limit = negative ? std::uint64_t{0} - static_cast<std::uint64_t>(least)
                              : static_cast<std::uint64_t>(most);
  if (!magnitude || *magnitude > limit) {
    throw NotANumber(text, "from " + std::to_string(least) + " to " + std::to_string(most));
  }
  return static_cast<std::int64_t>(negative ? std::uint64_t{0} - *magnitude : *magnitude);
}

std::uint64_t ParseUnsigned(const std::string& text, std::uint64_t most, const std::string& least) {
  const auto magnitude = Magnitude(text);
  if (!magnitude || *magnitude > most) {
    throw NotANumber(text, "from " + least + " to " + std::to_string(most));
  }
  return *magnitude;
}

double ParseReal(const std::string& text) {
  double value = 0;
  const char* end = text.data() + text.size();
  const auto result = std::from_chars(text.data(), end, value);
  if (result.ec != std::errc{} || result.ptr != end) {
    throw UsageFailure("'" + text + "' is not a number");
  }
  return value;
}

}  // namespace halvecctl
