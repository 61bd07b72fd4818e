// SPDX-License-Identifier: Apache-2.0
//
// Atlas files of a few places, put together byte by byte for tests. One thread.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace atlas_test {

/// Little-endian numbers, one after the other.
std::string U16(std::initializer_list<std::uint16_t> numbers);
std::string U32(std::initializer_list<std::uint32_t> numbers);

// Nodes of a tree.
constexpr std::uint32_t Whole(std::uint32_t id) { return 1U << 30 | id; }
constexpr std::uint32_t Leaf(std::uint32_t offset) { return 2U << 30 | offset; }
constexpr std::uint32_t kNothing = Whole(0);

/// A place of 16 bytes; degrees are rounded to 10^-5.
std::string Place(double latitude, double longitude, std::uint32_t name, std::uint16_t state,
                  std::uint16_t weight);

/// The sections of a file. As it is made: two countries, AA in the west and BB in the east of the
/// northern hemisphere, no states, no places, the sea in the south.
struct TinyAtlas {
  std::string codes = std::string("\0\0AABB", 6);
  std::string countryNodes = U32({kNothing, kNothing, Whole(1), Whole(2)});
  std::string countryLeaves;
  std::string states = std::string(8, '\0');
  std::string stateNodes = U32({kNothing, kNothing, kNothing, kNothing});
  std::string stateLeaves;
  /// With the half-degree cell that each stands in; in the order of the cells.
  std::vector<std::pair<std::uint32_t, std::string>> places;
  std::string names = std::string(1, '\0');
  std::string about = "made for a test";

  /// Appends a name to the pool and answers its offset.
  std::uint32_t name(std::string_view text);
  /// Appends a state and answers its id.
  std::uint16_t state(std::uint32_t nameOffset, std::uint16_t country);
  /// Appends a place in the right cell; cells must ascend.
  void place(double latitude, double longitude, std::string_view name, std::uint16_t state,
             std::uint16_t weight);

  /// The whole file.
  [[nodiscard]] std::string bytes() const;
};

/// `file` with the checksum of its header and table put right.
std::string WithChecksum(std::string file);

/// `file` with the number at `offset` replaced, and the checksum put right.
std::string WithNumber(std::string file, std::size_t offset, std::uint32_t number);

// Where things are in the file.
constexpr std::size_t kVersionOffset = 8;
constexpr std::size_t kChecksumOffset = 32;
constexpr std::size_t kTableOffset = 40;
constexpr std::size_t kTableEnd = 200;

}  // namespace atlas_test
