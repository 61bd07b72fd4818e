// SPDX-License-Identifier: Apache-2.0
//
// The kinds of LASD databases, one per radio technology. Pure; any thread.
#pragma once

#include <array>
#include <cstdint>

/// The bit that stands for a database in a mask.
enum class LASDDatabaseType : std::int32_t {
  kUmts = 1,
  kCdma = 2,
  kLte = 4,
  kGsm = 8,
  kScdma = 16,
};

/// The types in the order in which they are read, updated and reported.
inline constexpr std::array kLASDTypesInOrder{LASDDatabaseType::kGsm, LASDDatabaseType::kUmts,
                                              LASDDatabaseType::kCdma, LASDDatabaseType::kLte,
                                              LASDDatabaseType::kScdma};

/// The type's text: its key in manifests and preferences, its word in the log. "unknown" for any
/// other value.
[[nodiscard]] constexpr const char* typeName(LASDDatabaseType type) {
  switch (type) {
    case LASDDatabaseType::kUmts:
      return "umts";
    case LASDDatabaseType::kCdma:
      return "cdma";
    case LASDDatabaseType::kLte:
      return "lte";
    case LASDDatabaseType::kGsm:
      return "gsm";
    case LASDDatabaseType::kScdma:
      return "scdma";
  }
  return "unknown";
}

/// The type's bit.
[[nodiscard]] constexpr std::uint32_t BitOf(LASDDatabaseType type) {
  return static_cast<std::uint32_t>(type);
}
