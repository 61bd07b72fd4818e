// SPDX-License-Identifier: Apache-2.0
//
// The platform's string: text that never changes, cheap to copy, and its way into C strings. Any
// thread; a string has no state that changes.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace platform {

enum class StringEncoding : std::uint32_t { kUtf8, kAscii };

/// Unicode text without NUL. A copy refers to the same text.
class String {
 public:
  /// A constant: `text` is UTF-8 that lives as long as the process.
  constexpr explicit String(const char* text) noexcept : text_(text) {}

  /// The text that `bytes` mean in `encoding`; none when they are not entirely valid in it (UTF-8:
  /// RFC 3629; ASCII: 7 bits) or hold a NUL.
  [[nodiscard]] static std::optional<String> Decode(std::string_view bytes,
                                                    StringEncoding encoding);

  /// Valid while a string of this text lives.
  [[nodiscard]] std::string_view utf8() const noexcept { return text_; }

  /// The text in `encoding`, up to its first character that the encoding lacks. Nothing is
  /// substituted.
  [[nodiscard]] std::string_view encodablePart(StringEncoding encoding) const noexcept;

  friend bool operator==(const String& left, const String& right) {
    return left.text_ == right.text_;
  }

 private:
  std::shared_ptr<const std::string> owned_;  // null in a constant
  std::string_view text_;
};

/// Where allocations that change hands come from.
class Allocator {
 public:
  virtual ~Allocator() = default;
  /// `size` bytes, or null.
  [[nodiscard]] virtual void* allocate(std::size_t size) noexcept = 0;
  /// Gives back what allocate() gave; null is nothing.
  virtual void deallocate(void* memory) noexcept = 0;
};

/// malloc(3) and free(3).
[[nodiscard]] Allocator& DefaultAllocator() noexcept;

}  // namespace platform

/// The text of `string` as a C string in `encoding`: in `buffer` where the whole text and its zero
/// fit, else in a new block of `allocator`, which the caller deallocates there exactly when the
/// result is not its own buffer. Exported by the program.
///
/// `allocator` may be null, for the default one. `string` may not. `size`, where given, holds the
/// capacity of `buffer` in bytes and receives the length of the result without its zero; without
/// it, or when it holds 0, the buffer is not used. A text that `encoding` cannot express is cut at
/// its first such character, and always in a new block.
///
/// Without memory: `buffer`, where there is one, as an empty text, else null; and 0 in `size`.
/// Kept: the zero of that empty text is written even into a buffer whose capacity is given as 0, so
/// a buffer has one byte at least.
extern "C" char* CFStringGetOrCreateCString(platform::Allocator* allocator,
                                            const platform::String* string, char* buffer,
                                            std::size_t* size, platform::StringEncoding encoding);
