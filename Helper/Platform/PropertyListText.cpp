// SPDX-License-Identifier: Apache-2.0
//
// Text checks, numbers, dates, base64 and the hash seed of the property-list codec.
#include "Helper/Platform/PropertyListText.h"

#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <chrono>
#include <cmath>

namespace platform::detail {

namespace {

constexpr std::uint32_t kBadDigit = 0x01000000;

constexpr std::string_view kBase64Digits =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

// The value of each base64 digit at each of its four places; anything else has kBadDigit set.
using DigitTable = std::array<std::array<std::uint32_t, 256>, 4>;
constexpr DigitTable MakeDigitTable() {
  DigitTable table{};
  for (auto& place : table) place.fill(kBadDigit);
  for (std::uint32_t value = 0; value < kBase64Digits.size(); ++value) {
    const auto digit = static_cast<unsigned char>(kBase64Digits[value]);
    for (std::uint32_t place = 0; place < 4; ++place) {
      table[place][digit] = value << (18 - 6 * place);
    }
  }
  return table;
}
constexpr DigitTable kDigitTable = MakeDigitTable();

// Two base64 digits for every twelve bits.
using PairTable = std::array<std::array<char, 2>, 4096>;
constexpr PairTable MakePairTable() {
  PairTable table{};
  for (std::size_t bits = 0; bits < table.size(); ++bits) {
    table[bits] = {kBase64Digits[bits >> 6], kBase64Digits[bits & 63]};
  }
  return table;
}
constexpr PairTable kPairTable = MakePairTable();

constexpr bool IsBlank(char c) noexcept { return c == ' ' || c == '\n' || c == '\t' || c == '\r'; }

constexpr unsigned char Byte(char c) noexcept { return static_cast<unsigned char>(c); }

bool IsContinuation(char c) noexcept { return (Byte(c) & 0xC0) == 0x80; }

// Digits of a date field; negative when one is not a digit.
int DigitsAt(std::string_view text, std::size_t first, std::size_t count) noexcept {
  int value = 0;
  for (const char c : text.substr(first, count)) {
    if (c < '0' || c > '9') return -1;
    value = value * 10 + (c - '0');
  }
  return value;
}

void AppendDigits(std::int64_t value, std::size_t width, std::string& text) {
  const std::size_t start = text.size();
  text.resize(start + width, '0');
  for (std::size_t place = width; place-- > 0; value /= 10) {
    text[start + place] = static_cast<char>('0' + value % 10);
  }
}

constexpr std::chrono::sys_days kEpoch{std::chrono::year{2001} / 1 / 1};
constexpr std::int64_t kSecondsPerDay = 86'400;

}  // namespace

std::size_t MultibyteLength(const char* text, const char* end) noexcept {
  const std::ptrdiff_t left = end - text;
  if (left < 2) return 0;
  const unsigned char first = Byte(text[0]);
  const unsigned char second = Byte(text[1]);
  if (first < 0xC2 || !IsContinuation(text[1])) return 0;
  if (first < 0xE0) return 2;
  if (left < 3 || !IsContinuation(text[2])) return 0;
  if (first < 0xF0) {
    const bool overlong = first == 0xE0 && second < 0xA0;
    const bool surrogate = first == 0xED && second >= 0xA0;
    return overlong || surrogate ? 0 : 3;
  }
  if (left < 4 || !IsContinuation(text[3]) || first > 0xF4) return 0;
  const bool overlong = first == 0xF0 && second < 0x90;
  const bool beyond = first == 0xF4 && second >= 0x90;
  return overlong || beyond ? 0 : 4;
}

bool IsPropertyListText(std::string_view text, bool* ascii) noexcept {
  bool onlyAscii = true;
  const char* const end = text.data() + text.size();
  for (const char* at = text.data(); at != end;) {
    if (*at == '\0') return false;
    if (Byte(*at) < 0x80) {
      ++at;
      continue;
    }
    onlyAscii = false;
    const std::size_t length = MultibyteLength(at, end);
    if (length == 0) return false;
    at += length;
  }
  if (ascii != nullptr) *ascii = onlyAscii;
  return true;
}

bool AppendUtf16(std::span<const std::byte> units, std::string& text) {
  const auto unit = [units](std::size_t i) {
    return (std::to_integer<std::uint32_t>(units[2 * i]) << 8) |
           std::to_integer<std::uint32_t>(units[2 * i + 1]);
  };
  const auto put = [&text](std::uint32_t bits) { text.push_back(static_cast<char>(bits)); };
  const std::size_t count = units.size() / 2;
  for (std::size_t i = 0; i < count; ++i) {
    std::uint32_t code = unit(i);
    if (code == 0) return false;
    if (code >= 0xD800 && code < 0xE000) {
      if (code >= 0xDC00 || i + 1 == count) return false;
      const std::uint32_t low = unit(++i);
      if (low < 0xDC00 || low >= 0xE000) return false;
      code = 0x10000 + ((code - 0xD800) << 10) + (low - 0xDC00);
    }
    if (code < 0x80) {
      put(code);
      continue;
    }
    if (code < 0x800) {
      put(0xC0 | (code >> 6));
    } else {
      if (code < 0x10000) {
        put(0xE0 | (code >> 12));
      } else {
        put(0xF0 | (code >> 18));
        put(0x80 | ((code >> 12) & 0x3F));
      }
      put(0x80 | ((code >> 6) & 0x3F));
    }
    put(0x80 | (code & 0x3F));
  }
  return true;
}

std::optional<PropertyList> ParseInteger(std::string_view text) noexcept {
  bool negative = false;
  if (!text.empty() && (text.front() == '-' || text.front() == '+')) {
    negative = text.front() == '-';
    text.remove_prefix(1);
  }
  int base = 10;
  if (text.starts_with("0x") || text.starts_with("0X")) {
    base = 16;
    text.remove_prefix(2);
  }
  std::uint64_t magnitude = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, magnitude, base);
  if (error != std::errc{} || stop != end) return std::nullopt;
  if (!negative) return PropertyList(magnitude);
  constexpr std::uint64_t kLowest = std::uint64_t{1} << 63;
  if (magnitude > kLowest) return std::nullopt;
  return PropertyList(static_cast<std::int64_t>(0 - magnitude));
}

std::optional<double> ParseReal(std::string_view text) noexcept {
  if (text.starts_with('+')) {
    text.remove_prefix(1);
    if (text.starts_with('-')) return std::nullopt;
  }
  // from_chars also takes "nan(...)".
  if (text.find('(') != std::string_view::npos) return std::nullopt;
  double value = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, value);
  if (error != std::errc{} || stop != end) return std::nullopt;
  return value;
}

std::optional<PropertyList::Date> ParseDate(std::string_view text) noexcept {
  constexpr std::string_view kShape = "0000-00-00T00:00:00Z";
  if (text.size() != kShape.size()) return std::nullopt;
  for (std::size_t i = 0; i < kShape.size(); ++i) {
    if (kShape[i] != '0' && kShape[i] != text[i]) return std::nullopt;
  }
  const int year = DigitsAt(text, 0, 4);
  const int month = DigitsAt(text, 5, 2);
  const int day = DigitsAt(text, 8, 2);
  const int hour = DigitsAt(text, 11, 2);
  const int minute = DigitsAt(text, 14, 2);
  const int second = DigitsAt(text, 17, 2);
  if (year < 0 || month < 0 || day < 0) return std::nullopt;
  if (hour < 0 || hour > 23 || minute < 0 || minute > 59 || second < 0 || second > 59) {
    return std::nullopt;
  }
  const std::chrono::year_month_day date{std::chrono::year{year},
                                         std::chrono::month{static_cast<unsigned>(month)},
                                         std::chrono::day{static_cast<unsigned>(day)}};
  if (!date.ok()) return std::nullopt;
  const std::int64_t days = (std::chrono::sys_days{date} - kEpoch).count();
  const std::int64_t seconds =
      days * kSecondsPerDay + hour * std::int64_t{3600} + minute * std::int64_t{60} + second;
  return PropertyList::Date{static_cast<double>(seconds)};
}

std::optional<PropertyList::Data> ParseBase64(std::string_view text) {
  PropertyList::Data data;
  data.resize(text.size() / 4 * 3 + 3);
  std::byte* out = data.data();
  const char* at = text.data();
  const char* const end = at + text.size();

  std::uint32_t bits = 0;
  unsigned digits = 0;  // of the current group of four
  for (;;) {
    // Whole groups, while neither a blank nor padding is among them.
    if (digits == 0) {
      for (; end - at >= 4; at += 4, out += 3) {
        const std::uint32_t group = kDigitTable[0][Byte(at[0])] | kDigitTable[1][Byte(at[1])] |
                                    kDigitTable[2][Byte(at[2])] | kDigitTable[3][Byte(at[3])];
        if (group & kBadDigit) break;
        out[0] = static_cast<std::byte>(group >> 16);
        out[1] = static_cast<std::byte>(group >> 8);
        out[2] = static_cast<std::byte>(group);
      }
    }
    if (at == end || *at == '=') break;
    const char c = *at++;
    if (IsBlank(c)) continue;
    const std::uint32_t value = kDigitTable[digits][Byte(c)];
    if (value == kBadDigit) return std::nullopt;
    bits |= value;
    if (++digits == 4) {
      *out++ = static_cast<std::byte>(bits >> 16);
      *out++ = static_cast<std::byte>(bits >> 8);
      *out++ = static_cast<std::byte>(bits);
      bits = 0;
      digits = 0;
    }
  }

  // The last group: padded to four, unused bits zero, nothing but blanks behind it.
  unsigned padding = 0;
  for (; at != end; ++at) {
    if (*at == '=') {
      ++padding;
    } else if (!IsBlank(*at)) {
      return std::nullopt;
    }
  }
  if (digits == 0) {
    if (padding != 0) return std::nullopt;
  } else {
    if (digits == 1 || digits + padding != 4) return std::nullopt;
    const std::uint32_t unused = digits == 2 ? 0xFFFF : 0xFF;
    if (bits & unused) return std::nullopt;
    *out++ = static_cast<std::byte>(bits >> 16);
    if (digits == 3) *out++ = static_cast<std::byte>(bits >> 8);
  }
  data.resize(static_cast<std::size_t>(out - data.data()));
  return data;
}

void AppendReal(double value, std::string& text) {
  if (std::isnan(value)) {
    text += "nan";
    return;
  }
  if (std::isinf(value)) {
    text += value < 0 ? "-infinity" : "+infinity";
    return;
  }
  std::array<char, 32> digits;
  const auto [end, error] = std::to_chars(digits.data(), digits.data() + digits.size(), value);
  if (error == std::errc{}) text.append(digits.data(), end);
}

bool AppendDate(PropertyList::Date date, std::string& text) {
  constexpr double kFirst = static_cast<double>(
      (std::chrono::sys_days{std::chrono::year{0} / 1 / 1} - kEpoch).count() * kSecondsPerDay);
  constexpr double kBeyond = static_cast<double>(
      (std::chrono::sys_days{std::chrono::year{10'000} / 1 / 1} - kEpoch).count() * kSecondsPerDay);
  // False for a NaN as well.
  if (!(date.seconds >= kFirst && date.seconds < kBeyond)) return false;
  // Rounded down by hand: the one call into the mathematics library would make every start load it.
  const auto cut = static_cast<std::int64_t>(date.seconds);
  const std::int64_t seconds = static_cast<double>(cut) > date.seconds ? cut - 1 : cut;
  std::int64_t days = seconds / kSecondsPerDay;
  std::int64_t rest = seconds % kSecondsPerDay;
  if (rest < 0) {
    rest += kSecondsPerDay;
    --days;
  }
  const std::chrono::year_month_day day{kEpoch + std::chrono::days{days}};
  AppendDigits(static_cast<int>(day.year()), 4, text);
  text += '-';
  AppendDigits(static_cast<unsigned>(day.month()), 2, text);
  text += '-';
  AppendDigits(static_cast<unsigned>(day.day()), 2, text);
  text += 'T';
  AppendDigits(rest / 3600, 2, text);
  text += ':';
  AppendDigits(rest / 60 % 60, 2, text);
  text += ':';
  AppendDigits(rest % 60, 2, text);
  text += 'Z';
  return true;
}

void AppendBase64(std::span<const std::byte> data, std::string& text) {
  const std::size_t start = text.size();
  text.resize(start + (data.size() + 2) / 3 * 4);
  char* out = text.data() + start;
  const auto byte = [data](std::size_t i) { return std::to_integer<std::uint32_t>(data[i]); };
  const auto put = [&out](std::uint32_t group) {
    std::memcpy(out, kPairTable[group >> 12].data(), 2);
    std::memcpy(out + 2, kPairTable[group & 0xFFF].data(), 2);
    out += 4;
  };
  std::size_t i = 0;
  for (; i + 3 <= data.size(); i += 3) put(byte(i) << 16 | byte(i + 1) << 8 | byte(i + 2));
  const std::size_t left = data.size() - i;
  if (left == 1) {
    put(byte(i) << 16);
    out[-1] = out[-2] = '=';
  } else if (left == 2) {
    put(byte(i) << 16 | byte(i + 1) << 8);
    out[-1] = '=';
  }
}

const HashSeed& ProcessHashSeed() noexcept {
  static const HashSeed seed = [] {
    HashSeed drawn{};
    // Without randomness from the kernel, which no supported kernel lacks, any constants will do.
    if (::getentropy(&drawn, sizeof drawn) != 0) drawn = {0x9E3779B97F4A7C15, 0xD1B54A32D192ED03};
    drawn.factor |= 1;
    return drawn;
  }();
  return seed;
}

}  // namespace platform::detail
