// SPDX-License-Identifier: Apache-2.0
//
// Reads the XML form of a property list in one pass over expat's events. The value grows in place;
// open containers stand on a stack of pointers, so nesting costs no call stack.
#include <expat.h>

#include <algorithm>
#include <memory>
#include <type_traits>

#include "Helper/Platform/PropertyListText.h"

namespace platform::detail {

namespace {

enum class Element : std::uint8_t {
  kUnknown,
  kPlist,
  kDictionary,
  kArray,
  kKey,
  kString,
  kInteger,
  kReal,
  kTrue,
  kFalse,
  kData,
  kDate
};

Element ElementNamed(const char* name) noexcept {
  const auto is = [name](const char* other) { return std::strcmp(name, other) == 0; };
  switch (name[0]) {
    case 'a':
      return is("array") ? Element::kArray : Element::kUnknown;
    case 'd':
      if (is("dict")) return Element::kDictionary;
      if (is("data")) return Element::kData;
      return is("date") ? Element::kDate : Element::kUnknown;
    case 'f':
      return is("false") ? Element::kFalse : Element::kUnknown;
    case 'i':
      return is("integer") ? Element::kInteger : Element::kUnknown;
    case 'k':
      return is("key") ? Element::kKey : Element::kUnknown;
    case 'p':
      return is("plist") ? Element::kPlist : Element::kUnknown;
    case 'r':
      return is("real") ? Element::kReal : Element::kUnknown;
    case 's':
      return is("string") ? Element::kString : Element::kUnknown;
    case 't':
      return is("true") ? Element::kTrue : Element::kUnknown;
    default:
      return Element::kUnknown;
  }
}

bool IsBlankText(const char* text, int length) noexcept {
  return std::all_of(text, text + length,
                     [](char c) { return c == '\n' || c == '\t' || c == ' ' || c == '\r'; });
}

class XmlReader {
 public:
  XmlReader(XML_Parser parser, std::string* reason, const PropertyListLimits& limits)
      : parser_(parser), reason_(reason), limits_(limits) {
    XML_SetUserData(parser, this);
    XML_SetElementHandler(parser, &Start, &End);
    XML_SetCharacterDataHandler(parser, &Text);
    XML_SetStartDoctypeDeclHandler(parser, &Doctype);
    // Behind an external subset that is not read, expat passes over unknown entities.
    XML_SetSkippedEntityHandler(parser, &SkippedEntity);
  }

  std::optional<PropertyList> read(std::span<const std::byte> bytes) {
    const XML_Status status = XML_Parse(parser_, reinterpret_cast<const char*>(bytes.data()),
                                        static_cast<int>(bytes.size()), XML_TRUE);
    if (status != XML_STATUS_OK && !failed_) fail(XML_ErrorString(XML_GetErrorCode(parser_)));
    if (failed_) return std::nullopt;
    return std::move(root_);
  }

 private:
  static XmlReader& Self(void* self) { return *static_cast<XmlReader*>(self); }
  static void XMLCALL Start(void* self, const XML_Char* name, const XML_Char** attributes) {
    Self(self).start(name, attributes);
  }
  static void XMLCALL End(void* self, const XML_Char* /*name*/) { Self(self).end(); }
  static void XMLCALL Text(void* self, const XML_Char* text, int length) {
    Self(self).text(text, length);
  }
  static void XMLCALL Doctype(void* self, const XML_Char* /*name*/, const XML_Char* /*system*/,
                              const XML_Char* /*public*/, int hasInternalSubset) {
    if (hasInternalSubset) Self(self).fail("internal document type subset");
  }
  static void XMLCALL SkippedEntity(void* self, const XML_Char* /*name*/, int /*parameter*/) {
    Self(self).fail("unknown entity");
  }

  void fail(const char* why) {
    if (failed_) return;
    failed_ = true;
    *reason_ = "line " + std::to_string(XML_GetCurrentLineNumber(parser_)) + ": " + why;
    XML_StopParser(parser_, XML_FALSE);
  }

  void start(const XML_Char* name, const XML_Char** attributes) {
    if (failed_) return;
    const Element element = ElementNamed(name);
    if (element == Element::kUnknown) return fail("unknown element");
    if ((element == Element::kPlist) != !insidePlist_) return fail("misplaced plist element");
    if (element == Element::kPlist) {
      insidePlist_ = true;
      for (; *attributes != nullptr; attributes += 2) {
        if (std::strcmp(attributes[0], "version") != 0 || std::strcmp(attributes[1], "1.0") != 0) {
          return fail("plist element of another version");
        }
      }
      return;
    }
    if (*attributes != nullptr) return fail("attribute");
    if (scalar_ != Element::kUnknown) return fail("element inside a scalar");
    if (++nodes_ > limits_.nodes) return fail("too many values");
    switch (element) {
      case Element::kDictionary:
        return open(PropertyList::Dictionary{});
      case Element::kArray:
        return open(PropertyList::Array{});
      case Element::kKey:
        if (containers_.empty() || containers_.back()->dictionary() == nullptr || hasKey_) {
          return fail("misplaced key");
        }
        break;
      default:
        break;
    }
    scalar_ = element;
    text_.clear();
  }

  void text(const XML_Char* text, int length) {
    if (scalar_ != Element::kUnknown) {
      text_.append(text, static_cast<std::size_t>(length));
    } else if (!failed_ && !IsBlankText(text, length)) {
      fail("text beside elements");
    }
  }

  void end() {
    if (failed_) return;
    switch (std::exchange(scalar_, Element::kUnknown)) {
      case Element::kKey:
        key_.assign(text_);
        hasKey_ = true;
        return;
      case Element::kString:
        add(PropertyList(std::string_view(text_)));
        return;
      case Element::kInteger:
        return addParsed(ParseInteger(text_), "not an integer");
      case Element::kReal:
        return addParsed(ParseReal(text_), "not a real");
      case Element::kDate:
        return addParsed(ParseDate(text_), "not a date");
      case Element::kData:
        return addParsed(ParseBase64(text_), "not base64");
      case Element::kTrue:
        return addFlag(true);
      case Element::kFalse:
        return addFlag(false);
      default:
        return close();
    }
  }

  template <class Container>
  void open(Container container) {
    if (containers_.size() >= limits_.depth) return fail("nested too deeply");
    if (PropertyList* place = add(PropertyList(std::move(container)))) containers_.push_back(place);
  }

  // The end of a container, or of the plist element itself.
  void close() {
    if (containers_.empty()) {
      if (!root_) fail("no value");
      return;
    }
    if (hasKey_) return fail("key without value");
    containers_.pop_back();
  }

  void addFlag(bool flag) {
    if (!text_.empty()) return fail("text in a boolean");
    add(PropertyList(flag));
  }

  template <class Parsed>
  void addParsed(std::optional<Parsed> parsed, const char* why) {
    if (!parsed) return fail(why);
    add(PropertyList(std::move(*parsed)));
  }

  // Where the value now stands: a place that holds until its container is closed, because only the
  // innermost container grows. Null after a failure.
  PropertyList* add(PropertyList&& value) {
    if (containers_.empty()) {
      if (root_) {
        fail("second value");
        return nullptr;
      }
      return &root_.emplace(std::move(value));
    }
    if (PropertyList::Array* array = containers_.back()->array()) {
      return &array->emplace_back(std::move(value));
    }
    if (!std::exchange(hasKey_, false)) {
      fail("value without key");
      return nullptr;
    }
    PropertyList* place =
        containers_.back()->dictionary()->insert(std::move(key_), std::move(value));
    if (place == nullptr) fail("key twice");
    return place;
  }

  XML_Parser parser_;
  std::string* reason_;
  const PropertyListLimits& limits_;
  std::optional<PropertyList> root_;
  std::vector<PropertyList*> containers_;
  std::string text_;
  std::string key_;
  std::size_t nodes_ = 0;
  Element scalar_ = Element::kUnknown;
  bool hasKey_ = false;
  bool insidePlist_ = false;
  bool failed_ = false;
};

struct ParserDeleter {
  void operator()(XML_Parser parser) const { XML_ParserFree(parser); }
};

}  // namespace

std::optional<PropertyList> ParseXml(std::span<const std::byte> bytes, std::string* reason,
                                     const PropertyListLimits& limits) {
  const std::unique_ptr<std::remove_pointer_t<XML_Parser>, ParserDeleter> parser(
      XML_ParserCreate(nullptr));
  if (!parser) {
    *reason = "no memory for a parser";
    return std::nullopt;
  }
  if (!std::in_range<int>(bytes.size())) {
    *reason = "longer than the parser can count";
    return std::nullopt;
  }
  return XmlReader(parser.get(), reason, limits).read(bytes);
}

}  // namespace platform::detail
