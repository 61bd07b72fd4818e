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
#include <utility>
#include <vector>

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

/// Finds positions in somebody else's list of texts: open addressing, at most half full. It holds
/// part of each hash, so that a miss rarely looks at a text, and growing never does.
class TextIndex {
 public:
  /// The position recorded for a text of this hash that `isSame(position)` confirms; none when
  /// there is none.
  template <class IsSame>
  [[nodiscard]] std::optional<std::size_t> find(std::uint64_t hash, const IsSame& isSame) const {
    if (slots_.empty()) return std::nullopt;
    const auto part = static_cast<std::uint32_t>(hash);
    const std::size_t mask = slots_.size() - 1;
    for (std::size_t i = part & mask; slots_[i].position != 0; i = (i + 1) & mask) {
      const std::size_t position = slots_[i].position - 1;
      if (slots_[i].hash == part && isSame(position)) return position;
    }
    return std::nullopt;
  }

  /// Records `position` for a text of this hash that is not recorded yet.
  void add(std::uint64_t hash, std::size_t position) {
    if (++count_ * 2 > slots_.size()) grow();
    put({static_cast<std::uint32_t>(hash), static_cast<std::uint32_t>(position + 1)});
  }

 private:
  struct Slot {
    std::uint32_t hash = 0;
    std::uint32_t position = 0;  // plus one; 0 in an empty slot
  };

  void put(Slot slot) {
    const std::size_t mask = slots_.size() - 1;
    std::size_t i = slot.hash & mask;
    while (slots_[i].position != 0) i = (i + 1) & mask;
    slots_[i] = slot;
  }

  void grow() {
    constexpr std::size_t kFirstSize = 64;
    const std::vector<Slot> old =
        std::exchange(slots_, std::vector<Slot>(slots_.empty() ? kFirstSize : slots_.size() * 2));
    for (const Slot& slot : old) {
      if (slot.position != 0) put(slot);
    }
  }

  std::vector<Slot> slots_;
  std::size_t count_ = 0;
};

/// The two readers behind ParsePropertyList; `reason` is never null.
[[nodiscard]] std::optional<PropertyList> ParseXml(std::span<const std::byte> bytes,
                                                   std::string* reason,
                                                   const PropertyListLimits& limits);
[[nodiscard]] std::optional<PropertyList> ParseBinary(std::span<const std::byte> bytes,
                                                      std::string* reason,
                                                      const PropertyListLimits& limits);

}  // namespace platform::detail
