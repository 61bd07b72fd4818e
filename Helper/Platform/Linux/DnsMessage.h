// SPDX-License-Identifier: Apache-2.0
//
// The two messages of a name query (RFC 1035, section 4; AAAA: RFC 3596), over bytes that nobody
// vouches for. Any thread; no state.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

namespace platform {

enum class DnsType : std::uint16_t { kA = 1, kAaaa = 28 };

/// A recursive query for `host`; empty when that is no name: its labels have 1 to 63 characters
/// each and at most 253 together with the dots, a dot at the end left aside.
[[nodiscard]] std::vector<std::uint8_t> EncodeDnsQuery(std::uint16_t id, const std::string& host,
                                                       DnsType type);

struct DnsReply {
  enum class Kind {
    kForeign,     // no reply to this query
    kRefused,     // the server cannot tell
    kTruncated,   // to be asked again over TCP
    kNoSuchName,  // for no type
    kAnswered,    // with these addresses, or with none of this type
  };
  Kind kind = Kind::kForeign;
  std::vector<std::string> addresses;  // numeric text, in the order of the reply
};

/// Reads `packet` as the reply to `query`. Follows aliases inside the reply; records of other names
/// do not count.
[[nodiscard]] DnsReply DecodeDnsReply(std::span<const std::uint8_t> packet,
                                      std::span<const std::uint8_t> query);

}  // namespace platform
