// SPDX-License-Identifier: Apache-2.0
//
// What the helper tells the telephony daemon: the names of the daemon's ports, the message ids on
// each, and a message turned into what people and tests read. Pure functions, any thread.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace handset {

inline constexpr const char* kUpdatePort = "com.zarvo.Halvec.lasd";
inline constexpr const char* kConnectionPort = "com.zarvo.Halvec.connection";
inline constexpr const char* kRadioPort = "com.zarvo.radio-manager";

inline constexpr std::uint32_t kUpdateMessage = 0;  ///< Property list: what came of an update.
inline constexpr std::uint32_t kConnectMessage = 5501000;  ///< Property list: identifiers.
inline constexpr std::uint32_t kCivicMessage = 5501001;    ///< Property list: a place.
inline constexpr std::uint32_t kNotifyMessage = 5501002;   ///< From the daemon, empty.
inline constexpr std::uint32_t kCivicAnswer = 5501101;     ///< From the daemon: domain, code.
inline constexpr std::uint32_t kLogToFileMessage = 1;      ///< 32-bit 0 or 1.

/// One message that arrived.
struct TelephonyEntry {
  std::int64_t nanoseconds = 0;        ///< CLOCK_MONOTONIC when it was read.
  std::string port;                    ///< Name of the port that it came to.
  std::optional<unsigned> connection;  ///< The connection that it opens or came over, from 1.
  std::string bytes;                   ///< The whole message.
  std::optional<std::uint32_t> id;     ///< Nothing where the bytes are no message.
  std::string payload;                 ///< As JSON; "null" where it is not what the id promises.
  std::string fault;                   ///< What is wrong with the message; empty: nothing.
  std::string summary;                 ///< In a few words.
};

/// The entry of `bytes`, which came to `port` itself or over one of its connections; the time is
/// the caller's to add. `rights` is the number of rights that came beside the bytes.
[[nodiscard]] TelephonyEntry DescribeTelephonyMessage(std::string_view port,
                                                      std::optional<unsigned> connection,
                                                      std::string_view bytes, std::size_t rights);

/// One line of JSON: monotonic_ns, port, connection (where there is one), id, payload, error (where
/// there is one), hex (the whole message).
[[nodiscard]] std::string TelephonyEntryJson(const TelephonyEntry& entry);

/// One line for people: port, two blanks, summary.
[[nodiscard]] std::string TelephonyEntryLine(const TelephonyEntry& entry);

}  // namespace handset
