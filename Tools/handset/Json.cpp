// SPDX-License-Identifier: Apache-2.0
//
// UTF-8 is walked by hand because the log carries whatever bytes its writers send. Pure functions.
#include "Tools/handset/Json.h"

#include <cstddef>
#include <cstdint>

namespace handset {
namespace {

constexpr std::string_view kHexDigits = "0123456789abcdef";

/// Bytes of the well-formed sequence at the start of `text`; 0 where there is none.
std::size_t SequenceLength(std::string_view text) {
  const auto byte = [&](std::size_t i) { return static_cast<std::uint8_t>(text[i]); };
  const auto continues = [&](std::size_t i, std::uint8_t low, std::uint8_t high) {
    return i < text.size() && byte(i) >= low && byte(i) <= high;
  };
  const std::uint8_t first = byte(0);
  if (first < 0x80) return 1;
  if (first >= 0xC2 && first <= 0xDF) return continues(1, 0x80, 0xBF) ? 2 : 0;
  if (first >= 0xE0 && first <= 0xEF) {
    const std::uint8_t low = first == 0xE0 ? 0xA0 : 0x80;
    const std::uint8_t high = first == 0xED ? 0x9F : 0xBF;
    return continues(1, low, high) && continues(2, 0x80, 0xBF) ? 3 : 0;
  }
  if (first >= 0xF0 && first <= 0xF4) {
    const std::uint8_t low = first == 0xF0 ? 0x90 : 0x80;
    const std::uint8_t high = first == 0xF4 ? 0x8F : 0xBF;
    return continues(1, low, high) && continues(2, 0x80, 0xBF) && continues(3, 0x80, 0xBF) ? 4 : 0;
  }
  return 0;
}

}  // namespace

bool IsUtf8(std::string_view text) {
  while (!text.empty()) {
    const std::size_t length = SequenceLength(text);
    if (length == 0) return false;
    text.remove_prefix(length);
  }
  return true;
}

std::string JsonString(std::string_view text) {
  std::string out = "\"";
  while (!text.empty()) {
    const std::size_t length = SequenceLength(text);
    if (length == 0) {
      out += "\\ufffd";
      text.remove_prefix(1);
      continue;
    }
    const char c = text.front();
    if (c == '"' || c == '\\') {
      out += '\\';
      out += c;
    } else if (c == '\n') {
      out += "\\n";
    } else if (length == 1 && (static_cast<std::uint8_t>(c) < 0x20 || c == 0x7F)) {
      out += "\\u00";
      out += HexOf(text.substr(0, 1));
    } else {
      out += text.substr(0, length);
    }
    text.remove_prefix(length);
  }
  return out + '"';
}

std::string HexOf(std::string_view bytes) {
  std::string out;
  for (const char c : bytes) {
    out += kHexDigits[static_cast<std::uint8_t>(c) >> 4U];
    out += kHexDigits[static_cast<std::uint8_t>(c) & 0x0FU];
  }
  return out;
}

}  // namespace handset
