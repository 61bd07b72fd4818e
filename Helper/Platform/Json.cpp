// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Json.h"

#include <charconv>
#include <set>
#include <string>
#include <utility>

#include "Helper/Platform/Utf8.h"

namespace platform {
namespace {

constexpr int kMaxDepth = 32;

bool IsDigit(char c) { return c >= '0' && c <= '9'; }

void AppendUtf8(std::string& text, std::uint32_t code) {
  const auto tail = [&](int shift) {
    text += static_cast<char>(0x80U | ((code >> shift) & 0x3fU));
  };
  if (code < 0x80) {
    text += static_cast<char>(code);
  } else if (code < 0x800) {
    text += static_cast<char>(0xc0U | (code >> 6U));
    tail(0);
  } else if (code < 0x10000) {
    text += static_cast<char>(0xe0U | (code >> 12U));
    tail(6);
    tail(0);
  } else {
    text += static_cast<char>(0xf0U | (code >> 18U));
    tail(12);
    tail(6);
    tail(0);
  }
}

/// Reads from the front of the text; every function is false, or none, at the first mistake.
class Reader {
 public:
  explicit Reader(std::string_view text) : rest_(text) {}

  std::optional<PropertyList> document() {
    std::optional<PropertyList> result;
    if (!value(result, 0)) return std::nullopt;
    skipBlanks();
    if (!rest_.empty()) return std::nullopt;
    return result ? std::move(result) : PropertyList(PropertyList::Dictionary());
  }

 private:
  void skipBlanks() {
    rest_.remove_prefix(std::min(rest_.find_first_not_of(" \t\r\n"), rest_.size()));
  }
  bool take(char c) {
    if (rest_.empty() || rest_.front() != c) return false;
    rest_.remove_prefix(1);
    return true;
  }
  bool takeWord(std::string_view word) {
    if (!rest_.starts_with(word)) return false;
    rest_.remove_prefix(word.size());
    return true;
  }

  /// `result` stays empty for null.
  bool value(std::optional<PropertyList>& result, int depth) {
    skipBlanks();
    if (rest_.empty()) return false;
    switch (rest_.front()) {
      case '{':
        return object(result, depth);
      case '[':
        return array(result, depth);
      case '"': {
        std::string text;
        if (!string(text)) return false;
        result = std::move(text);
        return true;
      }
      case 't':
        result = true;
        return takeWord("true");
      case 'f':
        result = false;
        return takeWord("false");
      case 'n':
        return takeWord("null");
      default:
        return number(result);
    }
  }

  /// `depth` is the number of arrays and objects around this one.
  bool object(std::optional<PropertyList>& result, int depth) {
    (void)take('{');
    if (depth == kMaxDepth) return false;
    PropertyList::Dictionary dictionary;
    std::set<std::string> keys;  // those of nulls, too
    skipBlanks();
    if (!take('}')) {
      do {
        std::string key;
        std::optional<PropertyList> member;
        skipBlanks();
        if (!string(key) || !keys.insert(key).second) return false;
        skipBlanks();
        if (!take(':') || !value(member, depth + 1)) return false;
        if (member) dictionary.set(std::move(key), *std::move(member));
        skipBlanks();
      } while (take(','));
      if (!take('}')) return false;
    }
    result = PropertyList(std::move(dictionary));
    return true;
  }

  bool array(std::optional<PropertyList>& result, int depth) {
    (void)take('[');
    if (depth == kMaxDepth) return false;
    PropertyList::Array elements;
    skipBlanks();
    if (!take(']')) {
      do {
        std::optional<PropertyList> element;
        if (!value(element, depth + 1)) return false;
        elements.push_back(element ? *std::move(element) : PropertyList::Dictionary());
        skipBlanks();
      } while (take(','));
      if (!take(']')) return false;
    }
    result = PropertyList(std::move(elements));
    return true;
  }

  bool string(std::string& text) {
    if (!take('"')) return false;
    while (!take('"')) {
      if (rest_.empty() || static_cast<unsigned char>(rest_.front()) < 0x20) return false;
      if (take('\\')) {
        if (!escape(text)) return false;
      } else {
        text += rest_.front();
        rest_.remove_prefix(1);
      }
    }
    return IsUtf8(text);
  }

  bool escape(std::string& text) {
    if (rest_.empty()) return false;
    const char kind = rest_.front();
    rest_.remove_prefix(1);
    if (kind == 'u') return unicodeEscape(text);
    constexpr std::string_view kKinds = "\"\\/bfnrt";
    constexpr std::string_view kMeanings = "\"\\/\b\f\n\r\t";
    const std::size_t at = kKinds.find(kind);
    if (at == std::string_view::npos) return false;
    text += kMeanings[at];
    return true;
  }

  /// Characters beyond 16 bits are written as two surrogates; a lone one is none.
  bool unicodeEscape(std::string& text) {
    std::uint32_t code = 0;
    if (!fourDigits(code)) return false;
    if (code >= 0xd800 && code < 0xdc00) {
      std::uint32_t low = 0;
      if (!takeWord("\\u") || !fourDigits(low) || low < 0xdc00 || low > 0xdfff) return false;
      code = 0x10000 + ((code - 0xd800) << 10U) + (low - 0xdc00);
    } else if (code >= 0xdc00 && code <= 0xdfff) {
      return false;
    }
    AppendUtf8(text, code);
    return true;
  }

  bool fourDigits(std::uint32_t& code) {
    const std::string_view digits = rest_.substr(0, 4);
    const auto [end, error] =
        std::from_chars(digits.data(), digits.data() + digits.size(), code, 16);
    if (error != std::errc{} || end != digits.data() + 4) return false;
    rest_.remove_prefix(4);
    return true;
  }

  bool digits(std::size_t& length) const {
    const std::size_t start = length;
    while (length < rest_.size() && IsDigit(rest_[length])) ++length;
    return length > start;
  }

  bool number(std::optional<PropertyList>& result) {
    std::size_t length = rest_.front() == '-' ? 1 : 0;
    const std::size_t first = length;
    if (!digits(length)) return false;
    if (rest_[first] == '0' && length > first + 1) return false;
    bool whole = true;
    if (length < rest_.size() && rest_[length] == '.') {
      whole = false;
      if (!digits(++length)) return false;
    }
    if (length < rest_.size() && (rest_[length] == 'e' || rest_[length] == 'E')) {
      whole = false;
      ++length;
      if (length < rest_.size() && (rest_[length] == '+' || rest_[length] == '-')) ++length;
      if (!digits(length)) return false;
    }
    const char* const begin = rest_.data();
    rest_.remove_prefix(length);
    std::int64_t integer = 0;
    if (whole && std::from_chars(begin, begin + length, integer).ec == std::errc{}) {
      result = integer;
      return true;
    }
    double real = 0;
    if (std::from_chars(begin, begin + length, real).ec != std::errc{}) return false;
    result = real;
    return true;
  }

  std::string_view rest_;
};

}  // namespace

std::optional<PropertyList> ParseJson(std::string_view text) { return Reader(text).document(); }

}  // namespace platform
