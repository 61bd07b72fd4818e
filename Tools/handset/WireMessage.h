// SPDX-License-Identifier: Apache-2.0
//
// One-way port messages as bytes (little endian), taken apart and put together apart from the
// helper's own port layer, so that the two witness each other:
//
//   offset 0   bits, 32 bits: 0, or bit 31 where the message carries a port
//          4   size of the whole message, 32 bits
//          8   three 32-bit port names, 0 on the wire
//         20   message id, 32 bits
//         24   only with bit 31: descriptor count 1, 32 bits, then the port's descriptor, 12 bytes
//   then       payload length, 32 bits; the payload; zero bytes up to a multiple of 4
//
// Pure functions, any thread.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace handset {

struct WireMessage {
  std::uint32_t id = 0;
  bool carriesPort = false;  ///< The right itself travels beside the bytes.
  std::string payload;
};

/// Takes a message apart. Nothing, and in `reason` what is wrong, unless every byte is as above.
[[nodiscard]] std::optional<WireMessage> ParseWireMessage(std::string_view bytes,
                                                          std::string& reason);

/// A message without a port, ready to be sent.
[[nodiscard]] std::string PayloadMessage(std::uint32_t id, std::string_view payload);

/// The four bytes of `value`, and the value of the four bytes at `offset`, which must be there.
[[nodiscard]] std::string WireWord(std::uint32_t value);
[[nodiscard]] std::uint32_t WireWordAt(std::string_view bytes, std::size_t offset);

}  // namespace handset
