// SPDX-License-Identifier: Apache-2.0
//
// The file of the offline geocoder, mapped for reading: its header and table of sections are
// checked when it is opened, and everything read later is checked against the bounds of its section
// (Documentation/location.md gives the format byte for byte). Any thread; nothing changes after the
// opening.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <variant>

namespace platform {

using AtlasBytes = std::span<const std::byte>;

/// The little-endian number at `offset`, or nothing when it does not lie inside `bytes`.
template <class Number>
[[nodiscard]] std::optional<Number> ReadAtlas(AtlasBytes bytes, std::size_t offset) {
  if (offset > bytes.size() || bytes.size() - offset < sizeof(Number)) return std::nullopt;
  Number number;
  std::memcpy(&number, bytes.data() + offset, sizeof number);
  return number;
}

/// The sections of an atlas, in the order of their table.
enum class AtlasSection : std::size_t {
  kCountryCodes,
  kCountryNodes,
  kCountryLeaves,
  kStates,
  kStateNodes,
  kStateLeaves,
  kGrid,
  kPlaces,
  kNames,
  kAbout,
  kCount
};

class AtlasFile {
 public:
  /// Maps the file at `path`. Instead of the file, a text that says why it cannot be used: missing,
  /// no regular file, no atlas of this version, of another length than its header says, or with
  /// sections that are missing, misplaced or of an impossible size. The contents of the sections
  /// are not read.
  [[nodiscard]] static std::variant<AtlasFile, std::string> open(const std::string& path);

  AtlasFile(AtlasFile&& other) noexcept;
  AtlasFile& operator=(AtlasFile&&) = delete;
  ~AtlasFile();

  [[nodiscard]] AtlasBytes section(AtlasSection which) const {
    return sections_[static_cast<std::size_t>(which)];
  }

 private:
  explicit AtlasFile(AtlasBytes mapping) : mapping_(mapping) {}
  [[nodiscard]] bool findSections();

  AtlasBytes mapping_;  // owned; empty after a move
  std::array<AtlasBytes, static_cast<std::size_t>(AtlasSection::kCount)> sections_;
};

}  // namespace platform
