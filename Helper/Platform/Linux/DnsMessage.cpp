// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/DnsMessage.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <resolv.h>
#include <strings.h>

#include <algorithm>
#include <array>
#include <cctype>
#include <optional>
#include <string_view>

namespace platform {
namespace {

constexpr std::size_t kHeaderSize = 12;
constexpr std::size_t kRecordHeadSize = 10;  // behind the owner's name
constexpr std::size_t kLongestLabel = 63;
constexpr std::size_t kLongestName = 253;
constexpr std::uint16_t kClassInternet = 1;
constexpr std::uint16_t kTypeAlias = 5;
/// An address and the aliases before it; what a reply has beyond is of no use.
constexpr std::size_t kMostRecords = 64;
constexpr int kMostAliases = 8;

void Put16(std::vector<std::uint8_t>& bytes, unsigned int value) {
  bytes.push_back(static_cast<std::uint8_t>(value >> 8));
  bytes.push_back(static_cast<std::uint8_t>(value));
}

std::uint16_t Get16(std::span<const std::uint8_t> bytes, std::size_t at) {
  return static_cast<std::uint16_t>(bytes[at] << 8 | bytes[at + 1]);
}

/// The length of a label lies below every letter, so that this compares whole names.
bool SameWithoutCase(std::span<const std::uint8_t> left, std::span<const std::uint8_t> right) {
  return std::equal(left.begin(), left.end(), right.begin(), right.end(),
                    [](int a, int b) { return std::tolower(a) == std::tolower(b); });
}

struct Record {
  std::string owner;
  std::uint16_t type;
  std::size_t data;  // where in the packet
  std::size_t length;
};

class Reader {
 public:
  explicit Reader(std::span<const std::uint8_t> packet) : packet_(packet) {}

  /// The name at `at`, which then is behind it; none when it is broken.
  std::optional<std::string> name(std::size_t& at) const {
    std::array<char, NS_MAXDNAME> text;
    if (at >= packet_.size()) return std::nullopt;
    const std::uint8_t* begin = packet_.data();
    const int length = ::dn_expand(begin, begin + packet_.size(), begin + at, text.data(),
                                   static_cast<int>(text.size()));
    if (length < 0) return std::nullopt;
    at += static_cast<std::size_t>(length);
    return text.data();
  }

  /// The whole Internet records among the `count` from `at` on.
  std::vector<Record> records(std::size_t at, std::size_t count) const {
    std::vector<Record> found;
    for (std::size_t i = 0; i < std::min(count, kMostRecords); ++i) {
      auto owner = name(at);
      if (!owner || packet_.size() - at < kRecordHeadSize) break;
      const std::uint16_t type = Get16(packet_, at);
      const std::uint16_t recordClass = Get16(packet_, at + 2);
      const std::size_t length = Get16(packet_, at + 8);
      at += kRecordHeadSize;
      if (packet_.size() - at < length) break;
      if (recordClass == kClassInternet) found.push_back({std::move(*owner), type, at, length});
      at += length;
    }
    return found;
  }

  /// The text of an address record; none when it has not the length of its type's address.
  std::optional<std::string> address(const Record& record) const {
    const bool four = record.type == static_cast<std::uint16_t>(DnsType::kA);
    if (record.length != (four ? sizeof(in_addr) : sizeof(in6_addr))) return std::nullopt;
    std::array<char, INET6_ADDRSTRLEN> text;
    ::inet_ntop(four ? AF_INET : AF_INET6, packet_.data() + record.data, text.data(), text.size());
    return text.data();
  }

 private:
  std::span<const std::uint8_t> packet_;
};

std::vector<std::string> AddressesOf(const Reader& reader, const std::vector<Record>& records,
                                     std::string owner, std::uint16_t type) {
  std::vector<std::string> addresses;
  for (int hop = 0; hop <= kMostAliases && addresses.empty(); ++hop) {
    std::optional<std::string> alias;
    for (const Record& record : records) {
      if (::strcasecmp(record.owner.c_str(), owner.c_str()) != 0) continue;
      if (record.type == type) {
        if (auto address = reader.address(record)) addresses.push_back(std::move(*address));
      } else if (record.type == kTypeAlias) {
        std::size_t at = record.data;
        alias = reader.name(at);
      }
    }
    if (!alias) break;
    owner = std::move(*alias);
  }
  return addresses;
}

}  // namespace

std::vector<std::uint8_t> EncodeDnsQuery(std::uint16_t id, const std::string& host, DnsType type) {
  std::string_view rest = host;
  if (rest.ends_with('.')) rest.remove_suffix(1);
  if (rest.empty() || rest.size() > kLongestName) return {};
  std::vector<std::uint8_t> query;
  Put16(query, id);
  Put16(query, 0x0100);  // recursion desired
  for (const unsigned int count : {1U, 0U, 0U, 0U}) Put16(query, count);
  for (bool last = false; !last;) {
    const std::size_t dot = rest.find('.');
    const std::string_view label = rest.substr(0, dot);
    if (label.empty() || label.size() > kLongestLabel) return {};
    query.push_back(static_cast<std::uint8_t>(label.size()));
    query.insert(query.end(), label.begin(), label.end());
    last = dot == std::string_view::npos;
    if (!last) rest.remove_prefix(dot + 1);
  }
  query.push_back(0);
  Put16(query, static_cast<std::uint16_t>(type));
  Put16(query, kClassInternet);
  return query;
}

DnsReply DecodeDnsReply(std::span<const std::uint8_t> packet, std::span<const std::uint8_t> query) {
  using Kind = DnsReply::Kind;
  if (packet.size() < query.size() || Get16(packet, 0) != Get16(query, 0) ||
      (packet[2] & 0x80U) == 0 || Get16(packet, 4) != 1 ||
      !SameWithoutCase(packet.subspan(kHeaderSize, query.size() - kHeaderSize),
                       query.subspan(kHeaderSize))) {
    return {Kind::kForeign, {}};
  }
  if ((packet[2] & 0x02U) != 0) return {Kind::kTruncated, {}};
  const unsigned int code = packet[3] & 0x0fU;
  if (code == 3) return {Kind::kNoSuchName, {}};
  if (code != 0) return {Kind::kRefused, {}};
  const Reader reader(packet);
  std::size_t at = kHeaderSize;
  const auto owner = reader.name(at);
  if (!owner) return {Kind::kForeign, {}};
  const auto records = reader.records(query.size(), Get16(packet, 6));
  return {Kind::kAnswered, AddressesOf(reader, records, *owner, Get16(query, query.size() - 4))};
}

}  // namespace platform
