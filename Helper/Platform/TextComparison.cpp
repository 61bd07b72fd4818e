// SPDX-License-Identifier: Apache-2.0
//
// Comparison unit by unit: a run of digits without its leading zeros, or one folded character.
#include "Helper/Platform/TextComparison.h"

#include <locale.h>
#include <wctype.h>

#include <algorithm>
#include <cstdint>

#include "Helper/Platform/Utf8.h"

namespace platform {
namespace {

constexpr std::uint32_t kFirstBeyondAscii = 0x80;

bool IsDigit(char c) { return c >= '0' && c <= '9'; }

/// Takes the run of digits in front of `text`, which begins with one, and gives it without leading
/// zeros: equal numbers become equal texts.
std::string_view TakeNumber(std::string_view& text) {
  const auto end = std::find_if_not(text.begin(), text.end(), IsDigit);
  const auto first = std::find_if(text.begin(), end, [](char c) { return c != '0'; });
  const std::string_view number(first, end);
  text.remove_prefix(static_cast<std::size_t>(end - text.begin()));
  return number;
}

/// Takes the character in front of `text`, which is valid UTF-8 and not empty.
std::uint32_t TakeCharacter(std::string_view& text) {
  const auto lead = static_cast<unsigned char>(text.front());
  const std::size_t length = lead < 0x80 ? 1 : lead < 0xe0 ? 2 : lead < 0xf0 ? 3 : 4;
  constexpr std::uint32_t kLeadBits[] = {0, 0x7f, 0x1f, 0x0f, 0x07};
  std::uint32_t character = lead & kLeadBits[length];
  for (std::size_t at = 1; at < length; ++at) {
    character = character << 6 | (static_cast<unsigned char>(text[at]) & 0x3f);
  }
  text.remove_prefix(length);
  return character;
}

/// One for all characters that differ in case only. Upper case first, because letters such as the
/// two small sigmas meet only there.
std::uint32_t Fold(std::uint32_t character) {
  if (character < kFirstBeyondAscii) {
    return character >= 'A' && character <= 'Z' ? character + ('a' - 'A') : character;
  }
  static const locale_t letters = ::newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr);
  if (!letters) return character;
  return ::towlower_l(::towupper_l(character, letters), letters);
}

}  // namespace

bool EqualIgnoringCaseWithNumbers(std::string_view left, std::string_view right) {
  if (!IsUtf8(left) || !IsUtf8(right)) return left == right;
  while (!left.empty() && !right.empty()) {
    if (IsDigit(left.front()) && IsDigit(right.front())) {
      if (TakeNumber(left) != TakeNumber(right)) return false;
    } else if (Fold(TakeCharacter(left)) != Fold(TakeCharacter(right))) {
      return false;
    }
  }
  return left.empty() && right.empty();
}

}  // namespace platform
