// SPDX-License-Identifier: Apache-2.0
//
// Fuzz target of the reader of name replies: the first byte picks the type that was asked for, the
// rest is the packet. What it takes for an address is one, and of that type. One thread.
#include <arpa/inet.h>

#include <array>
#include <cstdlib>

#include "Helper/Platform/Linux/DnsMessage.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using platform::DnsType;
  if (size == 0) return 0;
  const bool four = data[0] % 2 == 0;
  const auto query =
      platform::EncodeDnsQuery(0x1234, "web.io", four ? DnsType::kA : DnsType::kAaaa);
  const auto reply = platform::DecodeDnsReply(std::span(data + 1, size - 1), query);
  for (const std::string& address : reply.addresses) {
    std::array<std::uint8_t, 16> bytes;
    if (reply.kind != platform::DnsReply::Kind::kAnswered ||
        ::inet_pton(four ? AF_INET : AF_INET6, address.c_str(), bytes.data()) != 1) {
      std::abort();
    }
  }
  return 0;
}
