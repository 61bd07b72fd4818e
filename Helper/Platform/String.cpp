// SPDX-License-Identifier: Apache-2.0
//
// Decoding into and encoding out of the platform's string. Any thread; no state.
#include "Helper/Platform/String.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "Helper/Platform/PropertyListText.h"

namespace platform {
namespace {

class MallocAllocator final : public Allocator {
 public:
  void* allocate(std::size_t size) noexcept override { return std::malloc(size); }
  void deallocate(void* memory) noexcept override { std::free(memory); }  // NOLINT: given by malloc
};

/// Writes `text` and its zero.
char* WriteText(std::string_view text, char* to, std::size_t* size) {
  std::copy(text.begin(), text.end(), to);
  to[text.size()] = '\0';
  if (size) *size = text.size();
  return to;
}

}  // namespace

std::optional<String> String::Decode(std::string_view bytes, StringEncoding encoding) {
  bool ascii = false;
  if (!detail::IsPropertyListText(bytes, &ascii)) return std::nullopt;
  if (encoding == StringEncoding::kAscii && !ascii) return std::nullopt;
  String string("");
  string.owned_ = std::make_shared<const std::string>(bytes);
  string.text_ = *string.owned_;
  return string;
}

std::string_view String::encodablePart(StringEncoding encoding) const noexcept {
  if (encoding == StringEncoding::kUtf8) return text_;
  constexpr unsigned char kFirstBeyondAscii = 0x80;
  const auto isBeyond = [](char c) { return static_cast<unsigned char>(c) >= kFirstBeyondAscii; };
  const auto beyond = std::find_if(text_.begin(), text_.end(), isBeyond);
  return text_.substr(0, static_cast<std::size_t>(beyond - text_.begin()));
}

Allocator& DefaultAllocator() noexcept {
  static MallocAllocator allocator;
  return allocator;
}

}  // namespace platform

char* CFStringGetOrCreateCString(platform::Allocator* allocator, const platform::String* string,
                                 char* buffer, std::size_t* size,
                                 platform::StringEncoding encoding) {
  const std::string_view text = string->encodablePart(encoding);
  const bool whole = text.size() == string->utf8().size();
  if (buffer && size && whole && text.size() < *size)
    return platform::WriteText(text, buffer, size);
  if (!allocator) allocator = &platform::DefaultAllocator();
  if (void* block = allocator->allocate(text.size() + 1)) {
    return platform::WriteText(text, static_cast<char*>(block), size);
  }
  if (buffer) return platform::WriteText("", buffer, size);
  if (size) *size = 0;
  return nullptr;
}
