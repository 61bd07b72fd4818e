// SPDX-License-Identifier: Apache-2.0
//
// The telephony utility library's decompression. Any thread; no state.
#pragma once

#include <cstdint>
#include <fstream>
#include <vector>

namespace vlu::Compression {

/// The most that Decompress() writes: gzip can announce a thousand times its own size.
inline constexpr std::uint64_t kLongestOutput = std::uint64_t{2} << 30;

/// Gunzips `data` (RFC 1952) into `out` and closes it. Takes what gzip takes: one member or several
/// in a row, and zero bytes behind the last. False when `data` is anything else (cut short, a wrong
/// check sum, other bytes behind it), when it has more than `longest` bytes, when `out` cannot take
/// them all (a full disk, noticed at the close at the latest), or when there is no zlib; `out` has
/// then received a part.
[[nodiscard]] bool Decompress(const std::vector<std::uint8_t>& data, std::ofstream& out,
                              std::uint64_t longest = kLongestOutput);

}  // namespace vlu::Compression
