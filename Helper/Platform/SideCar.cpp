// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/SideCar.h"

#include <algorithm>
#include <cstdint>

#include "Helper/Platform/Utf8.h"

namespace platform {
namespace {

using Bytes = std::span<const std::byte>;

constexpr std::uint32_t kHeaderFileMagic = 0x00051607;
constexpr std::uint32_t kVersion2 = 0x00020000;
constexpr std::size_t kFillerSize = 16;
constexpr std::uint32_t kResourcePart = 2;
constexpr std::uint32_t kFinderPart = 9;
constexpr std::size_t kFinderInfoSize = 32;
constexpr std::size_t kPaddingBeforeTable = 2;
constexpr std::uint32_t kTableMagic = 0x41545452;  // "ATTR"
constexpr std::size_t kUnusedBeforeCount = 30;     // between the table's magic and its count

/// Takes big-endian numbers off the front; once something was missing it is no good any more.
class Reader {
 public:
  explicit Reader(Bytes rest) : rest_(rest) {}

  std::uint32_t number(std::size_t size) {
    std::uint32_t value = 0;
    for (const std::byte byte : bytes(size)) value = value << 8 | std::to_integer<unsigned>(byte);
    return value;
  }
  Bytes bytes(std::size_t count) {
    good_ = good_ && count <= rest_.size();
    if (!good_) return {};
    const Bytes taken = rest_.first(count);
    rest_ = rest_.subspan(count);
    return taken;
  }
  [[nodiscard]] bool good() const { return good_; }

 private:
  Bytes rest_;
  bool good_ = true;
};

/// A piece of the whole; none when it is not all inside.
std::optional<Bytes> Piece(Bytes whole, std::uint32_t offset, std::uint32_t length) {
  if (offset > whole.size() || length > whole.size() - offset) return std::nullopt;
  return whole.subspan(offset, length);
}

std::optional<SideCarAttribute> ParseAttribute(Bytes whole, Reader& table) {
  const std::uint32_t offset = table.number(4);
  const std::uint32_t length = table.number(4);
  (void)table.number(2);
  const std::uint32_t nameLength = table.number(1);
  const Bytes name = table.bytes(nameLength);
  // The fixed fields have 11 bytes.
  (void)table.bytes((4 - (11 + nameLength) % 4) % 4);
  const std::optional<Bytes> value = Piece(whole, offset, length);
  if (!table.good() || !value || name.size() < 2 || name.back() != std::byte{0}) {
    return std::nullopt;
  }
  SideCarAttribute attribute{.name = {reinterpret_cast<const char*>(name.data()), name.size() - 1},
                             .value = *value};
  if (!IsUtf8(attribute.name)) return std::nullopt;
  return attribute;
}

/// Whether the finder part, and the attribute table that may follow in it, could be decoded.
bool ParseFinderPart(Bytes whole, Bytes part, SideCar& sideCar) {
  Reader reader(part);
  const Bytes info = reader.bytes(kFinderInfoSize);
  if (!reader.good()) return false;
  if (std::any_of(info.begin(), info.end(), [](std::byte byte) { return byte != std::byte{0}; })) {
    sideCar.finderInfo = info;
  }
  (void)reader.bytes(kPaddingBeforeTable);
  if (reader.number(4) != kTableMagic) return true;
  (void)reader.bytes(kUnusedBeforeCount);
  const std::uint32_t count = reader.number(2);
  if (!reader.good() || count > kMostSideCarAttributes) return false;
  for (std::uint32_t i = 0; i < count; ++i) {
    std::optional<SideCarAttribute> attribute = ParseAttribute(whole, reader);
    if (!attribute) return false;
    sideCar.attributes.push_back(std::move(*attribute));
  }
  return true;
}

}  // namespace

std::optional<SideCar> ParseSideCar(Bytes bytes) {
  Reader reader(bytes);
  if (reader.number(4) != kHeaderFileMagic || reader.number(4) != kVersion2) return std::nullopt;
  (void)reader.bytes(kFillerSize);
  const std::uint32_t parts = reader.number(2);
  if (!reader.good() || parts > kMostSideCarParts) return std::nullopt;
  SideCar sideCar;
  for (std::uint32_t i = 0; i < parts; ++i) {
    const std::uint32_t number = reader.number(4);
    const std::uint32_t offset = reader.number(4);
    const std::uint32_t length = reader.number(4);
    const std::optional<Bytes> part = Piece(bytes, offset, length);
    if (!reader.good() || !part) return std::nullopt;
    if (number == kResourcePart) sideCar.resourceData = *part;
    if (number == kFinderPart && !ParseFinderPart(bytes, *part, sideCar)) return std::nullopt;
  }
  return sideCar;
}

}  // namespace platform
