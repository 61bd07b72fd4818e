// SPDX-License-Identifier: Apache-2.0
//
// The platform's string and its way into C strings, buffer by buffer.
#include "Helper/Platform/String.h"

#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <string>

namespace {

using platform::String;
using platform::StringEncoding;

/// Counts what is out, and gives nothing when told so.
class CountingAllocator final : public platform::Allocator {
 public:
  void* allocate(std::size_t size) noexcept override {
    lastSize = size;
    if (fails) return nullptr;
    ++blocks;
    return platform::DefaultAllocator().allocate(size);
  }
  void deallocate(void* memory) noexcept override {
    --blocks;
    platform::DefaultAllocator().deallocate(memory);
  }
  bool fails = false;
  int blocks = 0;
  std::size_t lastSize = 0;
};

class CString : public ::testing::Test {
 protected:
  char* convert(const String& string, char* to, std::size_t* size,
                StringEncoding encoding = StringEncoding::kUtf8) {
    return CFStringGetOrCreateCString(&allocator, &string, to, size, encoding);
  }
  /// Converts into a new block without a buffer and gives its text.
  std::string created(const String& string, StringEncoding encoding = StringEncoding::kUtf8) {
    std::size_t size = 99;
    char* block = convert(string, nullptr, &size, encoding);
    const std::string text = block ? block : "(null)";
    EXPECT_EQ(size, text.size());
    allocator.deallocate(block);
    return text;
  }
  CountingAllocator allocator;
  std::array<char, 32> buffer{"untouched"};
  const String mobile{"mobile"};
};

TEST_F(CString, OfMobileInABufferOf32BytesIsTheBufferAndStores6) {
  std::size_t size = buffer.size();
  EXPECT_EQ(convert(mobile, buffer.data(), &size), buffer.data());
  EXPECT_EQ(size, 6U);
  EXPECT_STREQ(buffer.data(), "mobile");
  EXPECT_EQ(allocator.blocks, 0);
}

TEST_F(CString, FitsWhenTheZeroFitsToo) {
  std::size_t size = 7;
  EXPECT_EQ(convert(mobile, buffer.data(), &size), buffer.data());
  EXPECT_EQ(size, 6U);
}

TEST_F(CString, ThatDoesNotFitIsANewBlockAndLeavesTheBufferUntouched) {
  for (const std::size_t capacity : {1U, 5U, 6U}) {
    std::size_t size = capacity;
    char* block = convert(mobile, buffer.data(), &size);
    ASSERT_NE(block, buffer.data());
    EXPECT_STREQ(block, "mobile");
    EXPECT_EQ(size, 6U);
    EXPECT_STREQ(buffer.data(), "untouched");
    EXPECT_EQ(allocator.blocks, 1);
    EXPECT_EQ(allocator.lastSize, 7U) << "its bytes and one for the zero";
    allocator.deallocate(block);
  }
}

TEST_F(CString, WithASizeOf0IgnoresTheBuffer) {
  std::size_t size = 0;
  char* block = convert(mobile, buffer.data(), &size);
  EXPECT_NE(block, buffer.data());
  EXPECT_STREQ(block, "mobile");
  EXPECT_EQ(size, 6U);
  EXPECT_STREQ(buffer.data(), "untouched");
  allocator.deallocate(block);
}

TEST_F(CString, WithoutASizeIgnoresTheBuffer) {
  char* block = convert(mobile, buffer.data(), nullptr);
  EXPECT_NE(block, buffer.data());
  EXPECT_STREQ(block, "mobile");
  EXPECT_STREQ(buffer.data(), "untouched");
  allocator.deallocate(block);
}

TEST_F(CString, WithoutABufferIsANewBlockWhateverTheSizeSays) {
  EXPECT_EQ(created(mobile), "mobile");
  char* block = convert(mobile, nullptr, nullptr);
  EXPECT_STREQ(block, "mobile");
  allocator.deallocate(block);
  EXPECT_EQ(allocator.blocks, 0);
}

TEST_F(CString, WithoutMemoryIsTheBufferEmptiedAndStores0) {
  allocator.fails = true;
  std::size_t size = 3;
  EXPECT_EQ(convert(mobile, buffer.data(), &size), buffer.data());
  EXPECT_EQ(size, 0U);
  EXPECT_STREQ(buffer.data(), "");
  EXPECT_EQ(buffer[1], 'n') << "only the first byte is written";
}

TEST_F(CString, WithoutMemoryAndSizeIsTheBufferEmptied) {
  allocator.fails = true;
  EXPECT_EQ(convert(mobile, buffer.data(), nullptr), buffer.data());
  EXPECT_STREQ(buffer.data(), "");
}

TEST_F(CString, WithoutMemoryAndBufferIsNoneAndStores0) {
  allocator.fails = true;
  std::size_t size = 9;
  EXPECT_EQ(convert(mobile, nullptr, &size), nullptr);
  EXPECT_EQ(size, 0U);
  EXPECT_EQ(convert(mobile, nullptr, nullptr), nullptr);
}

TEST_F(CString, NeedsNoMemoryWhereTheBufferIsEnough) {
  allocator.fails = true;
  std::size_t size = buffer.size();
  EXPECT_EQ(convert(mobile, buffer.data(), &size), buffer.data());
  EXPECT_STREQ(buffer.data(), "mobile");
}

TEST_F(CString, OfAnEmptyTextIsEmpty) {
  EXPECT_EQ(created(String("")), "");
  std::size_t size = 1;
  EXPECT_EQ(convert(String(""), buffer.data(), &size), buffer.data());
  EXPECT_EQ(size, 0U);
}

TEST_F(CString, CountsBytesAndNotCharacters) {
  const String text("ü€");
  std::size_t size = 5;
  char* block = convert(text, buffer.data(), &size);
  EXPECT_NE(block, buffer.data());
  EXPECT_EQ(size, 5U);
  allocator.deallocate(block);
  size = 6;
  EXPECT_EQ(convert(text, buffer.data(), &size), buffer.data());
}

TEST_F(CString, EndsBeforeTheFirstCharacterThatTheEncodingLacks) {
  EXPECT_EQ(created(String("abüc"), StringEncoding::kAscii), "ab");
  EXPECT_EQ(created(String("abc"), StringEncoding::kAscii), "abc");
  std::size_t size = buffer.size();
  char* block = convert(String("abüc"), buffer.data(), &size, StringEncoding::kAscii);
  EXPECT_NE(block, buffer.data()) << "a buffer takes whole texts only";
  EXPECT_STREQ(buffer.data(), "untouched");
  allocator.deallocate(block);
}

TEST_F(CString, ComesFromTheDefaultAllocatorWhereNoneIsNamed) {
  char* block =
      CFStringGetOrCreateCString(nullptr, &mobile, nullptr, nullptr, StringEncoding::kUtf8);
  EXPECT_STREQ(block, "mobile");
  platform::DefaultAllocator().deallocate(block);
}

TEST(PlatformString, DecodesUtf8AndRefusesWhatIsNotUtf8) {
  const auto text = String::Decode("Grüße", StringEncoding::kUtf8);
  ASSERT_TRUE(text);
  EXPECT_EQ(text->utf8(), "Grüße");
  for (const char* bytes : {"\xff", "\xc0\x80", "\xed\xa0\x80", "a\xe2\x82"}) {
    EXPECT_FALSE(String::Decode(bytes, StringEncoding::kUtf8));
  }
  EXPECT_FALSE(String::Decode(std::string_view("a\0b", 3), StringEncoding::kUtf8));
}

TEST(PlatformString, DecodesAsciiAndRefusesAnEighthBit) {
  const auto text = String::Decode("plain", StringEncoding::kAscii);
  ASSERT_TRUE(text);
  EXPECT_EQ(text->utf8(), "plain");
  EXPECT_FALSE(String::Decode("Grüße", StringEncoding::kAscii)) << "valid UTF-8 is not enough";
  EXPECT_FALSE(String::Decode("\x80", StringEncoding::kAscii));
}

TEST(PlatformString, CopiesOutliveTheirOrigin) {
  std::optional<String> origin = String::Decode(std::string(100, 'x'), StringEncoding::kUtf8);
  ASSERT_TRUE(origin);
  const String copy = *origin;
  origin.reset();
  EXPECT_EQ(copy.utf8(), std::string(100, 'x'));
}

}  // namespace
