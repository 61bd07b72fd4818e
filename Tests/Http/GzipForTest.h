// SPDX-License-Identifier: Apache-2.0
//
// Gzip members for tests, made by zlib itself.
#pragma once

#include <gtest/gtest.h>
#include <zlib.h>

#include <cstdint>
#include <string>
#include <vector>

namespace support {

/// One gzip member that holds `text`.
inline std::vector<std::uint8_t> Gzip(const std::string& text) {
  z_stream stream{};
  EXPECT_EQ(
      deflateInit2(&stream, Z_BEST_COMPRESSION, Z_DEFLATED, MAX_WBITS + 16, 9, Z_DEFAULT_STRATEGY),
      Z_OK);
  std::vector<std::uint8_t> bytes(deflateBound(&stream, text.size()));
  stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(text.data()));  // only read
  stream.avail_in = static_cast<uInt>(text.size());
  stream.next_out = bytes.data();
  stream.avail_out = static_cast<uInt>(bytes.size());
  EXPECT_EQ(deflate(&stream, Z_FINISH), Z_STREAM_END);
  bytes.resize(stream.total_out);
  EXPECT_EQ(deflateEnd(&stream), Z_OK);
  return bytes;
}

}  // namespace support
