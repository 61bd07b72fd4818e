// SPDX-License-Identifier: Apache-2.0
//
// Text is checked against UTF-8 by the platform's own rule, so that JSON never carries other bytes.
#include "Tools/halvecctl/Json.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <optional>

#include "Helper/Platform/Utf8.h"

namespace halvecctl {
namespace {

using platform::PropertyList;

std::string_view AsText(std::span<const std::byte> bytes) {
  return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

/// Length of the valid sequence that begins at the start of `text`; 0 when there is none.
std::size_t SequenceLength(std::string_view text) {
  constexpr std::size_t kLongest = 4;
  for (std::size_t length = 1; length <= std::min(kLongest, text.size()); ++length) {
    if (platform::IsUtf8(text.substr(0, length))) return length;
  }
  return 0;
}

/// The control character that `text` begins with: of C0, DEL, or of C1, which terminals obey too.
std::optional<unsigned> ControlAt(std::string_view text) {
  const auto byte = static_cast<unsigned char>(text.front());
  if (byte < 0x20 || byte == 0x7f) return byte;
  if (byte != 0xc2 || text.size() < 2) return std::nullopt;
  const auto second = static_cast<unsigned char>(text[1]);
  return second < 0xa0 ? std::optional<unsigned>(second) : std::nullopt;
}

void AppendEscaped(std::string& out, std::string_view sequence) {
  const char first = sequence.front();
  switch (first) {
    case '"':
    case '\\':
      out += '\\';
      out += first;
      return;
    case '\n':
      out += "\\n";
      return;
    case '\r':
      out += "\\r";
      return;
    case '\t':
      out += "\\t";
      return;
    default:
      break;
  }
  const std::optional<unsigned> control = ControlAt(sequence);
  if (!control) {
    out += sequence;
    return;
  }
  std::array<char, 8> code{};
  (void)std::snprintf(code.data(), code.size(), "\\u%04x", *control);  // always fits
  out += code.data();
}

std::string NumberText(double value) {
  std::array<char, 40> text;
  const auto end = std::to_chars(text.data(), text.data() + text.size(), value).ptr;
  return {text.data(), end};
}

std::string IntegerText(const PropertyList& value) {
  if (const auto number = value.integer()) return std::to_string(*number);
  return std::to_string(value.unsignedInteger().value_or(0));
}

/// ISO 8601 in UTC, whole seconds.
std::string DateText(PropertyList::Date date) {
  using std::chrono::sys_days, std::chrono::seconds, std::chrono::days;
  constexpr double kCentury = 3'155'760'000;
  // The calendar below counts in 64 bits; years beyond four digits are no dates of a handset.
  if (!(std::abs(date.seconds) < kCentury * 80)) return "out of range";
  constexpr sys_days kEpoch = std::chrono::year{2001} / 1 / 1;
  const auto moment = kEpoch + seconds(static_cast<std::int64_t>(std::floor(date.seconds)));
  const sys_days day = std::chrono::floor<days>(moment);
  const std::chrono::year_month_day calendar(day);
  const std::chrono::hh_mm_ss time(moment - day);
  std::array<char, 64> text{};
  (void)std::snprintf(text.data(), text.size(), "%04d-%02u-%02uT%02d:%02d:%02dZ",
                      static_cast<int>(calendar.year()), static_cast<unsigned>(calendar.month()),
                      static_cast<unsigned>(calendar.day()), static_cast<int>(time.hours().count()),
                      static_cast<int>(time.minutes().count()),
                      static_cast<int>(time.seconds().count()));
  return text.data();
}

void AppendValue(std::string& out, const PropertyList& value) {
  if (const PropertyList::Array* array = value.array()) {
    out += '[';
    for (const PropertyList& item : *array) {
      if (&item != array->data()) out += ',';
      AppendValue(out, item);
    }
    out += ']';
  } else if (const PropertyList::Dictionary* dictionary = value.dictionary()) {
    out += '{';
    for (const PropertyList::Entry& entry : *dictionary) {
      if (&entry != dictionary->begin()) out += ',';
      out += JsonString(entry.key) + ':';
      AppendValue(out, entry.value);
    }
    out += '}';
  } else {
    const bool bare = value.kind() == PropertyList::Kind::kBoolean ||
                      value.kind() == PropertyList::Kind::kInteger ||
                      value.kind() == PropertyList::Kind::kUid ||
                      (value.real() && std::isfinite(*value.real()));
    const std::string text = PlainScalar(value).value_or("");
    out += bare ? text : JsonString(text);
  }
}

}  // namespace

std::string JsonString(std::string_view text) {
  std::string out = "\"";
  while (!text.empty()) {
    // The platform's texts have no zero; in JSON it is a character like any other.
    const std::size_t length = text.front() == '\0' ? 1 : SequenceLength(text);
    if (length == 0) {
      out += "\xef\xbf\xbd";
      text.remove_prefix(1);
    } else {
      AppendEscaped(out, text.substr(0, length));
      text.remove_prefix(length);
    }
  }
  out += '"';
  return out;
}

std::string Base64(std::span<const std::byte> bytes) {
  constexpr std::string_view kDigits =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  std::string out;
  out.reserve((bytes.size() + 2) / 3 * 4);
  for (std::size_t at = 0; at < bytes.size(); at += 3) {
    std::uint32_t group = 0;
    for (std::size_t index = 0; index < 3; ++index) {
      group <<= 8;
      if (at + index < bytes.size()) group |= std::to_integer<std::uint32_t>(bytes[at + index]);
    }
    for (std::size_t index = 0; index < 4; ++index) {
      const bool padding = at + index > bytes.size();
      out += padding ? '=' : kDigits[(group >> (18 - 6 * index)) & 63];
    }
  }
  return out;
}

std::string Shown(const std::string& text) { return IsPrintable(text) ? text : JsonString(text); }

bool IsPrintable(std::string_view text) {
  constexpr std::string_view kHarmless = "\t\n\r";
  if (!platform::IsUtf8(text)) return false;
  for (; !text.empty(); text.remove_prefix(SequenceLength(text))) {
    if (ControlAt(text) && kHarmless.find(text.front()) == kHarmless.npos) return false;
  }
  return true;
}

std::string JsonData(std::span<const std::byte> bytes) {
  const std::string count = "{\"bytes\":" + std::to_string(bytes.size());
  if (IsPrintable(AsText(bytes))) return count + ",\"text\":" + JsonString(AsText(bytes)) + "}";
  return count + ",\"base64\":\"" + Base64(bytes) + "\"}";
}

std::string JsonPropertyList(const PropertyList& value) {
  std::string out;
  AppendValue(out, value);
  return out;
}

std::optional<std::string> PlainScalar(const PropertyList& value) {
  switch (value.kind()) {
    case PropertyList::Kind::kBoolean:
      return *value.boolean() ? "true" : "false";
    case PropertyList::Kind::kInteger:
      return IntegerText(value);
    case PropertyList::Kind::kReal:
      return NumberText(*value.real());
    case PropertyList::Kind::kString:
      return *value.string();
    case PropertyList::Kind::kData:
      return Base64(*value.data());
    case PropertyList::Kind::kDate:
      return DateText(*value.date());
    case PropertyList::Kind::kUid:
      return std::to_string(value.uid()->number);
    case PropertyList::Kind::kArray:
    case PropertyList::Kind::kDictionary:
      break;
  }
  return std::nullopt;
}

}  // namespace halvecctl
