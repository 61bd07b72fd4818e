// SPDX-License-Identifier: Apache-2.0
//
// Decodes a side-car: the file "._NAME" in which an archive carries what belongs to the item NAME
// beyond its bytes. A header file of RFC 1740 (appendix B): big endian, a table of parts by number.
// Pure; any thread.
#pragma once

#include <cstddef>
#include <optional>
#include <span>
#include <string>
#include <vector>

namespace platform {

/// One extended attribute: a UTF-8 name without a name space, and its bytes.
struct SideCarAttribute {
  std::string name;
  std::span<const std::byte> value;
};

/// What a side-car holds; its parts lie in the bytes that were parsed.
struct SideCar {
  std::span<const std::byte> resourceData;  // part 2; empty when there is none
  std::span<const std::byte> finderInfo;    // part 9, its first 32 bytes; empty when all are zero
  std::vector<SideCarAttribute>
      attributes;  // the table behind the finder information, in its order
};

/// At most so many parts and attributes are decoded.
inline constexpr std::size_t kMostSideCarParts = 64;
inline constexpr std::size_t kMostSideCarAttributes = 256;

/// Decodes all of `bytes`. None when it is no header file, when anything in it lies outside of it,
/// or when a name is empty or not UTF-8. Parts of other numbers are passed over.
///
/// The attribute table stands 2 bytes behind the finder information: "ATTR", 4 unused bytes, the
/// length of the whole side-car, then the start and the length of the values, 12 unused bytes, 2 of
/// flags, and the 2-byte number of attributes. Each attribute is the offset of its value from the
/// side-car's start, the value's length, 2 bytes of flags, the length of the name with its zero (1
/// byte), the name, and zero bytes up to a multiple of 4.
[[nodiscard]] std::optional<SideCar> ParseSideCar(std::span<const std::byte> bytes);

}  // namespace platform
