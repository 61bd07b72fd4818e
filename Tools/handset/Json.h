// SPDX-License-Identifier: Apache-2.0
//
// The one thing the tool needs of JSON (RFC 8259): a string written so that it reads back as it
// was. Pure functions, any thread.
#pragma once

#include <string>
#include <string_view>

namespace handset {

/// True where `text` is well-formed UTF-8 (RFC 3629: no overlong forms, no surrogates).
[[nodiscard]] bool IsUtf8(std::string_view text);

/// `text` as a quoted JSON string. Control characters are escaped; a byte that is not part of
/// well-formed UTF-8 becomes U+FFFD, so ask IsUtf8 first where every byte counts.
[[nodiscard]] std::string JsonString(std::string_view text);

/// Two lower-case hexadecimal digits per byte.
[[nodiscard]] std::string HexOf(std::string_view bytes);

}  // namespace handset
