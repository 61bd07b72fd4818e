// SPDX-License-Identifier: Apache-2.0
//
// What the property-list readers and writers share: text checks, numbers, dates, base64 and a hash
// that a sender of keys cannot predict. Private to the codec; pure functions, any thread.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "Helper/Platform/PropertyList.h"

namespace platform::detail {

/// Length of the UTF-8 sequence of two to four bytes at `text` (RFC 3629: no surrogates, shortest
/// form, up to U+10FFFF); 0 when there is none before `end`.
[[nodiscard]] std::size_t MultibyteLength(const char* text, const char* end) noexcept;

/// Valid UTF-8 without NUL. `ascii`, when given, tells whether it is all ASCII.
[[nodiscard]] bool IsPropertyListText(std::string_view text, bool* ascii = nullptr) noexcept;

/// Appends big-endian UTF-16 as UTF-8; false at an unpaired surrogate or a NUL.
[[nodiscard]] bool AppendUtf16(std::span<const std::byte> units, std::string& text);

[[nodiscard]] std::optional<PropertyList> ParseInteger(std::string_view text) noexcept;
[[nodiscard]] std::optional<double> ParseReal(std::string_view text) noexcept;
[[nodiscard]] std::optional<PropertyList::Date> ParseDate(std::string_view text) noexcept;
[[nodiscard]] std::optional<PropertyList::Data> ParseBase64(std::string_view text);

/// Appends the shortest text that reads back as the same real.
void AppendReal(double value, std::string& text);
/// Appends the date in whole seconds; false outside the years 0000 to 9999.
[[nodiscard]] bool AppendDate(PropertyList::Date date, std::string& text);
void AppendBase64(std::span<const std::byte> data, std::string& text);

/// Two random words, drawn once per process: keys that collide cannot be prepared beforehand.
struct HashSeed {
  std::uint64_t start = 0;
  std::uint64_t factor = 0;
};
[[nodiscard]] const HashSeed& ProcessHashSeed() noexcept;

[[nodiscard]] inline std::uint64_t HashText(std::string_view text) noexcept {
  const HashSeed& seed = ProcessHashSeed();
  const auto fold = [&seed](std::uint64_t word) {
    __extension__ using Wide = unsigned __int128;
    const Wide product = static_cast<Wide>(word) * seed.factor;
    return static_cast<std::uint64_t>(product) ^ static_cast<std::uint64_t>(product >> 64);
  };
  std::uint64_t hash = seed.start ^ text.size();
  while (text.size() >= sizeof(std::uint64_t)) {
    std::uint64_t word = 0;
    std::memcpy(&word, text.data(), sizeof word);
    hash = fold(hash ^ word);
    text.remove_prefix(sizeof word);
  }
  std::uint64_t word = 0;
  if (!text.empty()) std::memcpy(&word, text.data(), text.size());
  return fold(hash ^ word);
}

/// The two readers behind ParsePropertyList; `reason` is never null.
[[nodiscard]] std::optional<PropertyList> ParseXml(std::span<const std::byte> bytes,
                                                   std::string* reason,
                                                   const PropertyListLimits& limits);
[[nodiscard]] std::optional<PropertyList> ParseBinary(std::span<const std::byte> bytes,
                                                      std::string* reason,
                                                      const PropertyListLimits& limits);

}  // namespace platform::detail
