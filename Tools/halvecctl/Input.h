// SPDX-License-Identifier: Apache-2.0
//
// What the user gives as a value: numbers as text, bytes from a file or standard input.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace halvecctl {

/// Reads all of the file, or of standard input for "-". Throws Failure when it cannot be read or is
/// longer than a request can carry (16 MiB).
[[nodiscard]] std::vector<std::byte> ReadInput(const std::string& path);

/// Numbers of the whole text: decimal or, behind "0x", hexadecimal; a sign only where negative
/// numbers exist. Throw Failure for anything else and beyond the range.
[[nodiscard]] std::int64_t ParseInteger(const std::string& text, std::int64_t least,
                                        std::int64_t most);
/// `least` only stands in the failure's text, for a range that another call covers below 0.
[[nodiscard]] std::uint64_t ParseUnsigned(const std::string& text, std::uint64_t most,
                                          const std::string& least = "0");
[[nodiscard]] double ParseReal(const std::string& text);

}  // namespace halvecctl
