// SPDX-License-Identifier: Apache-2.0
//
// JSON as text (RFC 8259): strings, data, property lists. Pure functions.
#pragma once

#include <cstddef>
#include <span>
#include <string>
#include <string_view>

#include "Helper/Platform/PropertyList.h"

namespace halvecctl {

/// A JSON string. A byte that is no part of valid UTF-8 becomes U+FFFD.
[[nodiscard]] std::string JsonString(std::string_view text);

/// Base64 with padding (RFC 4648, section 4).
[[nodiscard]] std::string Base64(std::span<const std::byte> bytes);

/// An object with the number of bytes, and the bytes as "text" when they are printable text or as
/// "base64" otherwise.
[[nodiscard]] std::string JsonData(std::span<const std::byte> bytes);

/// Whether `text` is valid UTF-8 without control characters other than tab and line ends.
[[nodiscard]] bool IsPrintable(std::string_view text);

/// Text that a terminal cannot mistake for commands: as it is where it is printable, else as JSON.
[[nodiscard]] std::string Shown(const std::string& text);

/// A property list as JSON. Data is a base64 string, a date a string in ISO 8601, a UID its number,
/// and a number that JSON lacks the string "nan", "inf" or "-inf".
[[nodiscard]] std::string JsonPropertyList(const platform::PropertyList& value);

/// A number, boolean, text, date or data in one line without decoration; none for a container.
[[nodiscard]] std::optional<std::string> PlainScalar(const platform::PropertyList& value);

}  // namespace halvecctl
