// SPDX-License-Identifier: Apache-2.0
//
// Turns the name of a preference domain, which may be any bytes, into one safe file name. Pure
// functions, any thread.
#pragma once

#include <string>
#include <string_view>

namespace platform {

/// The file name, without folder and ending, of `domain`: different domains have different names.
/// Letters, digits, '-', '_' and '.' stand for themselves, but for a '.' in front; every other byte
/// becomes '%' and two hexadecimal digits, and the empty domain a single '%'. A name beyond 160
/// bytes is cut to 80 and ends in "%~" and the SHA-256 digest of the domain. Never hidden, never
/// ".." and without a slash.
[[nodiscard]] std::string PreferenceFileName(std::string_view domain);

/// The SHA-256 digest (FIPS 180-4) of `text` in 64 hexadecimal digits.
[[nodiscard]] std::string Sha256Digits(std::string_view text);

}  // namespace platform
