// SPDX-License-Identifier: Apache-2.0
//
// Writes the XML form of a property list. Open containers stand on an explicit stack; the output is
// bounded, because indentation makes a small but deep list long.
#include <array>
#include <charconv>

#include "Helper/Platform/PropertyListText.h"

namespace platform {

namespace {

constexpr std::string_view kHead =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n";
constexpr std::string_view kTail = "</plist>\n";

enum class CharacterClass : std::uint8_t { kPlain, kEscaped, kMultibyte, kForbidden };

constexpr std::array<CharacterClass, 256> MakeCharacterClasses() {
  std::array<CharacterClass, 256> classes{};
  for (std::size_t c = 0; c < 0x20; ++c) classes[c] = CharacterClass::kForbidden;
  for (std::size_t c = 0x80; c < 0x100; ++c) classes[c] = CharacterClass::kMultibyte;
  classes['\t'] = classes['\n'] = CharacterClass::kPlain;
  // A bare carriage return would be read back as a line feed (XML 1.0, section 2.11).
  classes['\r'] = classes['&'] = classes['<'] = classes['>'] = CharacterClass::kEscaped;
  return classes;
}
constexpr std::array<CharacterClass, 256> kCharacterClasses = MakeCharacterClasses();

CharacterClass ClassOf(char c) noexcept { return kCharacterClasses[static_cast<unsigned char>(c)]; }

std::string_view EscapeOf(char c) noexcept {
  switch (c) {
    case '&':
      return "&amp;";
    case '<':
      return "&lt;";
    case '>':
      return "&gt;";
    default:
      return "&#13;";
  }
}

class XmlWriter {
 public:
  explicit XmlWriter(const PropertyListLimits& limits) : limits_(limits) {}

  std::optional<std::string> write(const PropertyList& root) {
    out_ = kHead;
    if (!value(root)) return std::nullopt;
    while (!open_.empty()) {
      if (!step()) return std::nullopt;
    }
    out_ += kTail;
    if (out_.size() > limits_.bytes) return std::nullopt;
    return std::move(out_);
  }

 private:
  struct Container {
    const PropertyList::Entry* entry = nullptr;  // next pair of a dictionary
    const PropertyList* item = nullptr;          // next item of an array
    std::size_t left = 0;
    bool isDictionary = false;
  };

  // Writes the next value of the innermost container, or its end.
  bool step() {
    Container& container = open_.back();
    if (container.left == 0) {
      const bool isDictionary = container.isDictionary;
      open_.pop_back();
      indent();
      out_ += isDictionary ? "</dict>\n" : "</array>\n";
      return true;
    }
    --container.left;
    if (!container.isDictionary) return value(*container.item++);
    const PropertyList::Entry& entry = *container.entry++;
    if (++nodes_ > limits_.nodes) return false;
    indent();
    out_ += "<key>";
    if (!text(entry.key)) return false;
    out_ += "</key>\n";
    return value(entry.value);
  }

  bool value(const PropertyList& value) {
    if (++nodes_ > limits_.nodes || out_.size() > limits_.bytes) return false;
    indent();
    switch (value.kind()) {
      case PropertyList::Kind::kBoolean:
        out_ += *value.boolean() ? "<true/>\n" : "<false/>\n";
        return true;
      case PropertyList::Kind::kInteger:
        integer(value);
        return true;
      case PropertyList::Kind::kReal:
        out_ += "<real>";
        detail::AppendReal(*value.real(), out_);
        out_ += "</real>\n";
        return true;
      case PropertyList::Kind::kString:
        out_ += "<string>";
        if (!text(*value.string())) return false;
        out_ += "</string>\n";
        return true;
      case PropertyList::Kind::kData:
        if (value.data()->size() > limits_.bytes) return false;
        out_ += "<data>";
        detail::AppendBase64(*value.data(), out_);
        out_ += "</data>\n";
        return true;
      case PropertyList::Kind::kDate:
        out_ += "<date>";
        if (!detail::AppendDate(*value.date(), out_)) return false;
        out_ += "</date>\n";
        return true;
      case PropertyList::Kind::kUid:
        return false;
      case PropertyList::Kind::kArray: {
        const PropertyList::Array& items = *value.array();
        return open({nullptr, items.data(), items.size(), false}, "array");
      }
      case PropertyList::Kind::kDictionary: {
        const PropertyList::Dictionary& entries = *value.dictionary();
        return open({entries.begin(), nullptr, entries.size(), true}, "dict");
      }
    }
    return false;
  }

  bool open(Container container, std::string_view name) {
    if (open_.size() >= limits_.depth) return false;
    out_ += '<';
    out_ += name;
    if (container.left == 0) {
      out_ += "/>\n";
    } else {
      out_ += ">\n";
      open_.push_back(container);
    }
    return true;
  }

  void indent() { out_.append(open_.size(), '\t'); }

  void integer(const PropertyList& value) {
    std::array<char, 24> digits;
    char* const last = digits.data() + digits.size();
    const auto written = value.integer()
                             ? std::to_chars(digits.data(), last, *value.integer())
                             : std::to_chars(digits.data(), last, *value.unsignedInteger());
    out_ += "<integer>";
    out_.append(digits.data(), written.ptr);
    out_ += "</integer>\n";
  }

  bool text(std::string_view text) {
    if (text.size() > limits_.bytes) return false;
    const char* at = text.data();
    const char* const end = at + text.size();
    const char* plain = at;  // not copied yet
    while (at != end) {
      switch (ClassOf(*at)) {
        case CharacterClass::kPlain:
          ++at;
          break;
        case CharacterClass::kEscaped:
          out_.append(plain, at);
          out_ += EscapeOf(*at);
          plain = ++at;
          break;
        case CharacterClass::kMultibyte: {
          const std::size_t length = detail::MultibyteLength(at, end);
          if (length == 0) return false;
          // U+FFFE and U+FFFF are no characters of XML.
          if (length == 3 && std::string_view(at, 2) == "\xEF\xBF" && at[2] >= '\xBE') return false;
          at += length;
          break;
        }
        case CharacterClass::kForbidden:
          return false;
      }
    }
    out_.append(plain, end);
    return true;
  }

  const PropertyListLimits& limits_;
  std::string out_;
  std::vector<Container> open_;
  std::size_t nodes_ = 0;
};

}  // namespace

std::optional<std::string> SerializeXml(const PropertyList& value,
                                        const PropertyListLimits& limits) {
  return XmlWriter(limits).write(value);
}

}  // namespace platform
