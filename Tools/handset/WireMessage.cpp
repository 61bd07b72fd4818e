// SPDX-License-Identifier: Apache-2.0
//
// Strict in what it reads: a stand-in that forgives would hide a sender's mistake. Pure functions.
#include "Tools/handset/WireMessage.h"

#include <array>
#include <cstring>

namespace handset {
namespace {

constexpr std::size_t kHeader = 24;
constexpr std::size_t kSizeField = 4;
constexpr std::size_t kPortFields = 8;
constexpr std::size_t kIdField = 20;
constexpr std::size_t kWord = 4;
constexpr std::size_t kPortBlock = 16;  // descriptor count and one descriptor
constexpr std::uint32_t kComplex = 0x80000000;

std::size_t Padding(std::size_t length) { return (kWord - length % kWord) % kWord; }

bool IsZero(std::string_view bytes) {
  return bytes.find_first_not_of('\0') == std::string_view::npos;
}

/// What is wrong with the descriptor count and the one descriptor; empty where nothing is.
std::string FaultOfPortBlock(std::string_view block) {
  constexpr std::size_t kDisposition = 14;
  constexpr std::size_t kType = 15;
  constexpr char kMoveSend = 17;
  if (WireWordAt(block, 0) != 1) return "not exactly one descriptor";
  if (block[kType] != 0) return "the descriptor is no port's";
  if (block[kDisposition] != kMoveSend) return "the port's right is not moved to the receiver";
  if (!IsZero(block.substr(kWord, kDisposition - kWord))) return "the descriptor is not zero";
  return {};
}

}  // namespace

std::string WireWord(std::uint32_t value) {
  std::array<char, kWord> bytes{};
  std::memcpy(bytes.data(), &value, sizeof value);
  return {bytes.begin(), bytes.end()};
}

std::uint32_t WireWordAt(std::string_view bytes, std::size_t offset) {
  std::uint32_t value = 0;
  std::memcpy(&value, bytes.substr(offset, kWord).data(), sizeof value);
  return value;
}

std::optional<WireMessage> ParseWireMessage(std::string_view bytes, std::string& reason) {
  const auto refuse = [&reason](std::string why) {
    reason = std::move(why);
    return std::nullopt;
  };
  if (bytes.size() < kHeader) return refuse("shorter than a header");
  const std::uint32_t bits = WireWordAt(bytes, 0);
  if ((bits & ~kComplex) != 0) return refuse("unexpected header bits");
  if (WireWordAt(bytes, kSizeField) != bytes.size()) {
    return refuse("the header's size is not the message's");
  }
  if (!IsZero(bytes.substr(kPortFields, kIdField - kPortFields))) {
    return refuse("a port name on the wire");
  }
  WireMessage message;
  message.id = WireWordAt(bytes, kIdField);
  message.carriesPort = bits == kComplex;
  bytes.remove_prefix(kHeader);
  if (message.carriesPort) {
    if (bytes.size() < kPortBlock) return refuse("shorter than its descriptor");
    if (std::string fault = FaultOfPortBlock(bytes); !fault.empty()) {
      return refuse(std::move(fault));
    }
    bytes.remove_prefix(kPortBlock);
  }
  if (bytes.size() < kWord) return refuse("no payload length");
  const std::size_t length = WireWordAt(bytes, 0);
  bytes.remove_prefix(kWord);
  if (bytes.size() != length + Padding(length)) return refuse("the payload length is wrong");
  if (!IsZero(bytes.substr(length))) return refuse("the padding is not zero");
  message.payload = bytes.substr(0, length);
  return message;
}

std::string PayloadMessage(std::uint32_t id, std::string_view payload) {
  const std::size_t padding = Padding(payload.size());
  const std::size_t size = kHeader + kWord + payload.size() + padding;
  std::string bytes(kHeader, '\0');
  bytes.replace(kSizeField, kWord, WireWord(static_cast<std::uint32_t>(size)));
  bytes.replace(kIdField, kWord, WireWord(id));
  bytes += WireWord(static_cast<std::uint32_t>(payload.size()));
  bytes += payload;
  return bytes.append(padding, '\0');
}

}  // namespace handset
