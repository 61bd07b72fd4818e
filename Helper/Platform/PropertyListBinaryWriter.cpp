// SPDX-License-Identifier: Apache-2.0
//
// Writes the binary form of a property list. A first pass numbers the objects level by level, equal
// texts only once; a second one writes them in that order.
#include <bit>
#include <cmath>

#include "Helper/Platform/PropertyListText.h"

namespace platform {

namespace {

constexpr std::string_view kMagic = "bplist00";

// Bytes that an unsigned number needs, of 1, 2, 4 or 8.
std::size_t WidthOf(std::uint64_t number) noexcept {
  if (number <= 0xFF) return 1;
  if (number <= 0xFFFF) return 2;
  return number <= 0xFFFFFFFF ? 4 : 8;
}

class BinaryWriter {
 public:
  explicit BinaryWriter(const PropertyListLimits& limits) : limits_(limits) {}

  std::optional<std::vector<std::byte>> write(const PropertyList& root) {
    if (!collect(root)) return std::nullopt;
    refWidth_ = WidthOf(objects_.size() - 1);
    for (const char c : kMagic) out_.push_back(static_cast<std::byte>(c));
    offsets_.reserve(objects_.size());
    for (const Object& object : objects_) {
      offsets_.push_back(out_.size());
      if (!emit(object) || out_.size() > limits_.bytes) return std::nullopt;
    }
    finish();
    if (out_.size() > limits_.bytes) return std::nullopt;
    return std::move(out_);
  }

 private:
  // A text (of a value or a key) or another value; `refs` is where a container's references begin.
  struct Object {
    const PropertyList* value = nullptr;
    std::string_view text;
    std::size_t depth = 0;
    std::size_t refs = 0;
  };

  bool collect(const PropertyList& root) {
    if (!add(root, 1)) return false;
    for (std::size_t i = 0; i < objects_.size(); ++i) {
      const PropertyList* value = objects_[i].value;
      if (value == nullptr) continue;
      const std::size_t depth = objects_[i].depth + 1;
      objects_[i].refs = refs_.size();
      if (const PropertyList::Array* items = value->array()) {
        for (const PropertyList& item : *items) {
          if (!refer(item, depth)) return false;
        }
      } else if (const PropertyList::Dictionary* entries = value->dictionary()) {
        for (const PropertyList::Entry& entry : *entries) {
          if (!referText(entry.key)) return false;
        }
        for (const PropertyList::Entry& entry : *entries) {
          if (!refer(entry.value, depth)) return false;
        }
      }
    }
    return true;
  }

  bool refer(const PropertyList& value, std::size_t depth) {
    if (const std::string* text = value.string()) return referText(*text);
    refs_.push_back(static_cast<std::uint32_t>(objects_.size()));
    return add(value, depth);
  }

  bool referText(std::string_view text) {
    if (++nodes_ > limits_.nodes || !charge(text.size())) return false;
    const std::uint64_t hash = detail::HashText(text);
    const auto isSame = [this, text](std::size_t i) { return objects_[i].text == text; };
    std::optional<std::size_t> position = texts_.find(hash, isSame);
    if (!position) {
      position = objects_.size();
      texts_.add(hash, *position);
      objects_.push_back({nullptr, text, 0, 0});
    }
    refs_.push_back(static_cast<std::uint32_t>(*position));
    return true;
  }

  bool add(const PropertyList& value, std::size_t depth) {
    const bool isContainer = value.array() != nullptr || value.dictionary() != nullptr;
    if (++nodes_ > limits_.nodes || (isContainer && depth > limits_.depth)) return false;
    if (const std::string* text = value.string()) {
      if (!charge(text->size())) return false;
      objects_.push_back({nullptr, *text, depth, 0});
    } else {
      if (value.data() != nullptr && !charge(value.data()->size())) return false;
      objects_.push_back({&value, {}, depth, 0});
    }
    return true;
  }

  // Counts a text each time it is used, as the reader will.
  bool charge(std::size_t length) {
    if (length > limits_.bytes - length_) return false;
    length_ += length;
    return true;
  }

  bool emit(const Object& object) {
    if (object.value == nullptr) return emitText(object.text);
    const PropertyList& value = *object.value;
    switch (value.kind()) {
      case PropertyList::Kind::kBoolean:
        put(*value.boolean() ? 0x09 : 0x08, 1);
        return true;
      case PropertyList::Kind::kInteger:
        emitInteger(value);
        return true;
      case PropertyList::Kind::kReal:
        put(0x23, 1);
        put(std::bit_cast<std::uint64_t>(*value.real()), 8);
        return true;
      case PropertyList::Kind::kDate:
        if (std::isnan(value.date()->seconds)) return false;
        put(0x33, 1);
        put(std::bit_cast<std::uint64_t>(value.date()->seconds), 8);
        return true;
      case PropertyList::Kind::kUid: {
        const std::size_t width = WidthOf(value.uid()->number);
        put(0x80 | (width - 1), 1);
        put(value.uid()->number, width);
        return true;
      }
      case PropertyList::Kind::kData:
        marker(0x40, value.data()->size());
        out_.insert(out_.end(), value.data()->begin(), value.data()->end());
        return true;
      case PropertyList::Kind::kArray:
        marker(0xA0, value.array()->size());
        emitRefs(object.refs, value.array()->size());
        return true;
      case PropertyList::Kind::kDictionary:
        marker(0xD0, value.dictionary()->size());
        emitRefs(object.refs, 2 * value.dictionary()->size());
        return true;
      case PropertyList::Kind::kString:
        break;  // collected as text
    }
    return false;
  }

  bool emitText(std::string_view text) {
    bool ascii = false;
    if (!detail::IsPropertyListText(text, &ascii)) return false;
    if (ascii) {
      marker(0x50, text.size());
      const auto bytes = std::as_bytes(std::span(text));
      out_.insert(out_.end(), bytes.begin(), bytes.end());
      return true;
    }
    units_.clear();
    const char* const end = text.data() + text.size();
    for (const char* at = text.data(); at != end;) {
      const auto first = static_cast<unsigned char>(*at);
      if (first < 0x80) {
        units_.push_back(static_cast<char16_t>(first));
        ++at;
        continue;
      }
      const std::size_t length = detail::MultibyteLength(at, end);
      std::uint32_t code = first & (0x7FU >> length);
      for (std::size_t i = 1; i < length; ++i) {
        code = code << 6 | (static_cast<unsigned char>(at[i]) & 0x3FU);
      }
      at += length;
      if (code >= 0x10000) {
        units_.push_back(static_cast<char16_t>(0xD800 + ((code - 0x10000) >> 10)));
        code = 0xDC00 + (code & 0x3FF);
      }
      units_.push_back(static_cast<char16_t>(code));
    }
    marker(0x60, units_.size());
    for (const char16_t unit : units_) put(unit, 2);
    return true;
  }

  void emitInteger(const PropertyList& value) {
    if (const auto number = value.integer()) {
      const auto bits = static_cast<std::uint64_t>(*number);
      const std::size_t width = WidthOf(bits);  // 8 for every negative number
      put(0x10 | static_cast<std::uint64_t>(std::countr_zero(width)), 1);
      put(bits, width);
    } else {
      // Eight bytes are signed, so these numbers need sixteen.
      put(0x14, 1);
      put(0, 8);
      put(*value.unsignedInteger(), 8);
    }
  }

  void emitRefs(std::size_t first, std::size_t count) {
    for (std::size_t i = first; i < first + count; ++i) put(refs_[i], refWidth_);
  }

  void marker(std::uint64_t kind, std::size_t count) {
    if (count < 0x0F) {
      put(kind | count, 1);
      return;
    }
    put(kind | 0x0F, 1);
    const std::size_t width = WidthOf(count);
    put(0x10 | static_cast<std::uint64_t>(std::countr_zero(width)), 1);
    put(count, width);
  }

  void put(std::uint64_t number, std::size_t width) {
    std::array<std::byte, 8> bytes;
    for (std::size_t i = 0; i < width; ++i) {
      bytes[i] = static_cast<std::byte>(number >> (8 * (width - 1 - i)));
    }
    out_.insert(out_.end(), bytes.data(), bytes.data() + width);
  }

  void finish() {
    const std::size_t table = out_.size();
    const std::size_t width = WidthOf(table);
    for (const std::size_t offset : offsets_) put(offset, width);
    put(0, 6);
    put(width, 1);
    put(refWidth_, 1);
    put(objects_.size(), 8);
    put(0, 8);  // the root is the first object
    put(table, 8);
  }

  const PropertyListLimits& limits_;
  std::vector<Object> objects_;
  std::vector<std::uint32_t> refs_;
  std::vector<std::size_t> offsets_;
  detail::TextIndex texts_;
  std::u16string units_;
  std::vector<std::byte> out_;
  std::size_t refWidth_ = 1;
  std::size_t nodes_ = 0;
  std::size_t length_ = 0;
};

}  // namespace

std::optional<std::vector<std::byte>> SerializeBinary(const PropertyList& value,
                                                      const PropertyListLimits& limits) {
  return BinaryWriter(limits).write(value);
}

}  // namespace platform
