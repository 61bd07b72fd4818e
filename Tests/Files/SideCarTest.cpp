// SPDX-License-Identifier: Apache-2.0
//
// The side-car parser on bytes written here by hand.
#include "Helper/Platform/SideCar.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>

namespace {

using platform::ParseSideCar;
using platform::SideCar;

/// Big-endian bytes, put together piece by piece.
class Bytes {
 public:
  Bytes& number(std::uint32_t value, int size) {
    while (size-- > 0) bytes_.push_back(static_cast<std::byte>(value >> (8 * size)));
    return *this;
  }
  Bytes& text(std::string_view text) {
    for (const char c : text) bytes_.push_back(static_cast<std::byte>(c));
    return *this;
  }
  Bytes& zeros(std::size_t count) {
    bytes_.resize(bytes_.size() + count);
    return *this;
  }
  Bytes& set(std::size_t offset, std::uint8_t value) {
    bytes_.at(offset) = static_cast<std::byte>(value);
    return *this;
  }
  [[nodiscard]] std::span<const std::byte> span() const { return bytes_; }
  [[nodiscard]] std::size_t size() const { return bytes_.size(); }

 private:
  std::vector<std::byte> bytes_;
};

Bytes Header(std::uint32_t parts) {
  return Bytes().number(0x00051607, 4).number(0x00020000, 4).zeros(16).number(parts, 2);
}

/// Finder information, one attribute "com.example" = "value", and the resource data "fork".
Bytes Whole() {
  Bytes bytes = Header(2);
  bytes.number(9, 4).number(50, 4).number(99, 4);
  bytes.number(2, 4).number(149, 4).number(4, 4);
  bytes.text("TYPECREA").zeros(24).zeros(2);
  bytes.text("ATTR").number(7, 4).number(149, 4).number(144, 4).number(5, 4).zeros(12).number(0, 2);
  bytes.number(1, 2).number(144, 4).number(5, 4).number(0, 2).number(12, 1);
  bytes.text("com.example").zeros(1).zeros(1).text("value").text("fork");
  return bytes;
}

std::string Text(std::span<const std::byte> bytes) {
  return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

TEST(SideCar, HoldsResourceDataFinderInformationAndAttributes) {
  const Bytes bytes = Whole();
  ASSERT_EQ(bytes.size(), 153U);
  const auto sideCar = ParseSideCar(bytes.span());
  ASSERT_TRUE(sideCar);
  EXPECT_EQ(Text(sideCar->resourceData), "fork");
  EXPECT_EQ(Text(sideCar->finderInfo), std::string("TYPECREA") + std::string(24, '\0'));
  ASSERT_EQ(sideCar->attributes.size(), 1U);
  EXPECT_EQ(sideCar->attributes[0].name, "com.example");
  EXPECT_EQ(Text(sideCar->attributes[0].value), "value");
}

TEST(SideCar, WithoutPartsHoldsNothing) {
  const Bytes bytes = Header(0);
  const auto sideCar = ParseSideCar(bytes.span());
  ASSERT_TRUE(sideCar);
  EXPECT_TRUE(sideCar->resourceData.empty());
  EXPECT_TRUE(sideCar->finderInfo.empty());
  EXPECT_TRUE(sideCar->attributes.empty());
}

TEST(SideCar, WithFinderInformationOfZerosHasNone) {
  const Bytes bytes = Header(1).number(9, 4).number(38, 4).number(32, 4).zeros(32);
  const auto sideCar = ParseSideCar(bytes.span());
  ASSERT_TRUE(sideCar);
  EXPECT_TRUE(sideCar->finderInfo.empty());
}

TEST(SideCar, MayHaveAnAttributeWithoutBytes) {
  Bytes bytes = Whole();
  bytes.set(127, 0);  // the length of the value
  const auto sideCar = ParseSideCar(bytes.span());
  ASSERT_TRUE(sideCar);
  EXPECT_TRUE(sideCar->attributes.at(0).value.empty());
}

TEST(SideCar, PassesOverPartsThatItDoesNotKnow) {
  const Bytes bytes = Header(1).number(8, 4).number(38, 4).number(4, 4).text("date");
  EXPECT_TRUE(ParseSideCar(bytes.span()));
}

TEST(SideCar, IsNoneWhenCutAnywhere) {
  const Bytes bytes = Whole();
  for (std::size_t length = 0; length < bytes.size(); ++length) {
    EXPECT_FALSE(ParseSideCar(bytes.span().first(length))) << length;
  }
}

struct Damage {
  std::size_t offset;
  std::uint8_t value;
  const char* what;
};

TEST(SideCar, IsNoneWhenAnythingInItIsOutOfBounds) {
  for (const Damage& damage : std::vector<Damage>{{3, 0x00, "another magic number"},
                                                  {5, 0x01, "another version"},
                                                  {24, 0xff, "more parts than may be"},
                                                  {25, 3, "a part that is not there"},
                                                  {31, 0xff, "a part that begins outside"},
                                                  {34, 0x01, "a part that ends outside"},
                                                  {37, 31, "half the finder information"},
                                                  {37, 60, "half the attribute table"},
                                                  {118, 0x02, "more attributes than may be"},
                                                  {119, 2, "an attribute that is not there"},
                                                  {120, 0x80, "a value that begins outside"},
                                                  {127, 200, "a value that ends outside"},
                                                  {130, 0, "no name"},
                                                  {130, 1, "a name of one byte"},
                                                  {130, 11, "a name without its zero"},
                                                  {130, 255, "a name that ends outside"},
                                                  {131, 0xff, "a name that is not UTF-8"},
                                                  {133, 0, "a name with a zero in it"}}) {
    Bytes bytes = Whole();
    bytes.set(damage.offset, damage.value);
    EXPECT_FALSE(ParseSideCar(bytes.span())) << damage.what;
  }
}

}  // namespace
