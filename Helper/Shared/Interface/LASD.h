// SPDX-License-Identifier: Apache-2.0
//
// What the helper, its clients and the telephony daemon agree on about LASD databases: the kinds,
// where files and recorded versions are, the names of the notifications. Pure; any thread.
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

/// Where the database files are.
inline constexpr char kLASDDirectory[] = "/var/mobile/Library/LASD";
/// The preference domain of the recorded versions: per type's text the dictionary that the manifest
/// had when the type was installed last.
inline constexpr char kLASDDomain[] = "com.zarvo.lasd";
/// Texts of such a dictionary.
inline constexpr char kLASDVersionKey[] = "Version";
inline constexpr char kLASDContentURLKey[] = "ContentURL";

/// The telephony daemon's port for notifications. They are one-way messages with id 0, whose
/// payload is a binary property list: a dictionary of texts.
inline constexpr char kLASDNotificationPort[] = "com.zarvo.Halvec.lasd";
inline constexpr std::int32_t kLASDNotificationId = 0;
/// Its key for the event, one of the three names, and for the type's text.
inline constexpr char kLASDNotificationKey[] = "Notification";
inline constexpr char kLASDTypeKey[] = "DBType";
inline constexpr char kLASDUpdateAvailable[] = "com.zarvo.lasd.UpdateAvailable";
inline constexpr char kLASDNoUpdateRequired[] = "com.zarvo.lasd.NoUpdateRequired";
inline constexpr char kLASDUpdateFailed[] = "com.zarvo.lasd.UpdateFailed";
