// SPDX-License-Identifier: Apache-2.0
//
// Reads the binary form of a property list. Every offset, count and reference is checked against
// the bytes at hand. References may be shared or circular: each use counts as a value of its own,
// and the limits of depth, nodes and bytes end what would not end by itself.
#include <bit>

#include "Helper/Platform/PropertyListText.h"

namespace platform::detail {

namespace {

constexpr std::size_t kHeaderLength = 8;
constexpr std::size_t kTrailerLength = 32;

class BinaryReader {
 public:
  BinaryReader(std::span<const std::byte> bytes, std::string* reason,
               const PropertyListLimits& limits)
      : bytes_(bytes), reason_(reason), limits_(limits) {}

  std::optional<PropertyList> read() {
    if (!readTrailer() || place(top_) == nullptr) return std::nullopt;
    while (!open_.empty()) {
      if (!step()) return std::nullopt;
    }
    return std::move(root_);
  }

 private:
  // An open array or dictionary: `refs` is where its references begin, keys before values.
  struct Container {
    PropertyList* value;
    std::size_t refs;
    std::size_t count;
    std::size_t next;
  };

  // What stands behind an object's marker byte: `count` of the kind's units from `start`.
  struct Extent {
    std::size_t start;
    std::size_t count;
  };

  bool fail(const char* why) {
    *reason_ = why;
    return false;
  }

  // Big-endian unsigned number of 1 to 8 bytes; the caller has checked that they are there.
  [[nodiscard]] std::uint64_t number(std::size_t at, std::size_t width) const {
    std::uint64_t value = 0;
    for (const std::byte byte : bytes_.subspan(at, width)) {
      value = value << 8 | std::to_integer<std::uint64_t>(byte);
    }
    return value;
  }

  bool readTrailer() {
    if (bytes_.size() < kHeaderLength + kTrailerLength) return fail("shorter than its trailer");
    const std::size_t trailer = bytes_.size() - kTrailerLength;
    offsetWidth_ = number(trailer + 6, 1);
    refWidth_ = number(trailer + 7, 1);
    const std::uint64_t objects = number(trailer + 8, 8);
    const std::uint64_t top = number(trailer + 16, 8);
    const std::uint64_t table = number(trailer + 24, 8);
    if (offsetWidth_ < 1 || offsetWidth_ > 8 || refWidth_ < 1 || refWidth_ > 8) {
      return fail("width of offsets or references out of range");
    }
    if (table <= kHeaderLength || table > trailer) return fail("offset table out of place");
    // The table fills exactly what lies between the objects and the trailer.
    const std::uint64_t room = trailer - table;
    if (objects == 0 || objects > room || objects * offsetWidth_ != room) {
      return fail("offset table of another length");
    }
    if (top >= objects) return fail("top object does not exist");
    objects_ = static_cast<std::size_t>(objects);
    table_ = static_cast<std::size_t>(table);
    top_ = static_cast<std::size_t>(top);
    return true;
  }

  // Whether `length` bytes from `at` lie among the objects.
  [[nodiscard]] bool holds(std::size_t at, std::size_t length) const {
    return at <= table_ && length <= table_ - at;
  }

  // Where object `index` stands; 0 when its offset leaves the objects.
  [[nodiscard]] std::size_t offsetOf(std::size_t index) const {
    const std::uint64_t offset = number(table_ + index * offsetWidth_, offsetWidth_);
    return offset >= kHeaderLength && offset < table_ ? static_cast<std::size_t>(offset) : 0;
  }

  [[nodiscard]] std::optional<std::size_t> refAt(const Container& container, std::size_t i) {
    const std::uint64_t index = number(container.refs + i * refWidth_, refWidth_);
    if (index < objects_) return static_cast<std::size_t>(index);
    fail("reference to no object");
    return std::nullopt;
  }

  // The count in the marker's low half, or in the integer behind it; `unit` is the length of one
  // counted thing, all of which must be there.
  [[nodiscard]] std::optional<Extent> extentAt(std::size_t at, std::size_t unit) {
    Extent extent{at + 1, std::to_integer<std::size_t>(bytes_[at] & std::byte{0x0F})};
    if (extent.count == 0x0F) {
      const std::size_t marker = holds(at + 1, 1) ? number(at + 1, 1) : 0;
      const std::size_t width = std::size_t{1} << (marker & 0x0F);
      if ((marker & 0xF0) != 0x10 || width > 8 || !holds(at + 2, width)) {
        fail("count is no integer");
        return std::nullopt;
      }
      const std::uint64_t count = number(at + 2, width);
      if (count > table_) {
        fail("count beyond the end");
        return std::nullopt;
      }
      extent = {at + 2 + width, static_cast<std::size_t>(count)};
    }
    if (!holds(extent.start, extent.count * unit)) {
      fail("count beyond the end");
      return std::nullopt;
    }
    return extent;
  }

  bool charge(std::size_t nodes, std::size_t length) {
    if (nodes > limits_.nodes - nodes_) return fail("too many values");
    nodes_ += nodes;
    if (length > limits_.bytes - length_) return fail("too much text and data");
    length_ += length;
    return true;
  }

  // Text of object marker 0x5n or 0x6n at `at`.
  [[nodiscard]] std::optional<std::string> textAt(std::size_t at) {
    const bool wide = (bytes_[at] & std::byte{0xF0}) == std::byte{0x60};
    const auto extent = extentAt(at, wide ? 2 : 1);
    if (!extent) return std::nullopt;
    std::string text;
    if (wide) {
      // Checked before the copy: one text may be referred to very often.
      if (extent->count > limits_.bytes - length_) {
        fail("too much text and data");
        return std::nullopt;
      }
      if (!AppendUtf16(bytes_.subspan(extent->start, 2 * extent->count), text)) {
        fail("text is not UTF-16");
        return std::nullopt;
      }
      if (!charge(0, text.size())) return std::nullopt;
      return text;
    }
    if (!charge(0, extent->count)) return std::nullopt;
    text.assign(reinterpret_cast<const char*>(bytes_.data() + extent->start), extent->count);
    bool ascii = false;
    if (!IsPropertyListText(text, &ascii) || !ascii) {
      fail("text is not ASCII");
      return std::nullopt;
    }
    return text;
  }

  // Reads object `index` to where it belongs: the root, or the innermost open container. A
  // container is opened there, its contents follow. Null after a failure.
  PropertyList* place(std::size_t index) {
    const std::size_t at = offsetOf(index);
    if (at == 0) {
      fail("object out of place");
      return nullptr;
    }
    const auto marker = std::to_integer<unsigned>(bytes_[at]);
    if ((marker >> 4) != 0xA && (marker >> 4) != 0xD) {
      auto scalar = scalarAt(at, marker);
      return scalar ? add(std::move(*scalar)) : nullptr;
    }
    const bool isDictionary = (marker >> 4) == 0xD;
    const auto extent = extentAt(at, isDictionary ? 2 * refWidth_ : refWidth_);
    if (!extent) return nullptr;
    if (open_.size() >= limits_.depth) {
      fail("nested too deeply");
      return nullptr;
    }
    // The contents are counted before room is made for them.
    if (!charge(isDictionary ? 2 * extent->count : extent->count, 0)) return nullptr;
    PropertyList* container = nullptr;
    if (isDictionary) {
      container = add(PropertyList(PropertyList::Dictionary{}));
      if (container) container->dictionary()->reserve(extent->count);
    } else {
      container = add(PropertyList(PropertyList::Array{}));
      if (container) container->array()->reserve(extent->count);
    }
    if (container) open_.push_back({container, extent->start, extent->count, 0});
    return container;
  }

  PropertyList* add(PropertyList&& value) {
    if (open_.empty()) return &root_.emplace(std::move(value));
    if (PropertyList::Array* array = open_.back().value->array()) {
      return &array->emplace_back(std::move(value));
    }
    PropertyList* added =
        open_.back().value->dictionary()->insert(std::move(key_), std::move(value));
    if (added == nullptr) fail("key twice");
    return added;
  }

  // Reads the next value of the innermost container, or closes it.
  bool step() {
    Container& container = open_.back();
    if (container.next == container.count) {
      open_.pop_back();
      return true;
    }
    const std::size_t i = container.next++;
    if (container.value->array()) {
      const auto item = refAt(container, i);
      return item && place(*item) != nullptr;
    }
    const auto key = refAt(container, i);
    const auto value = refAt(container, container.count + i);
    if (!key || !value) return false;
    const std::size_t at = offsetOf(*key);
    const unsigned kind = at == 0 ? 0 : std::to_integer<unsigned>(bytes_[at]) >> 4;
    if (kind != 0x5 && kind != 0x6) return fail("key is no text");
    auto text = textAt(at);
    if (!text) return false;
    key_ = std::move(*text);
    return place(*value) != nullptr;
  }

  [[nodiscard]] std::optional<PropertyList> scalarAt(std::size_t at, unsigned marker) {
    switch (marker >> 4) {
      case 0x0:
        if (marker == 0x08 || marker == 0x09) return PropertyList(marker == 0x09);
        break;
      case 0x1:
        return integerAt(at, marker & 0x0F);
      case 0x2:
        if (marker == 0x22 && holds(at + 1, 4)) {
          const auto bits = static_cast<std::uint32_t>(number(at + 1, 4));
          return PropertyList(static_cast<double>(std::bit_cast<float>(bits)));
        }
        if (marker == 0x23 && holds(at + 1, 8)) {
          return PropertyList(std::bit_cast<double>(number(at + 1, 8)));
        }
        break;
      case 0x3:
        if (marker == 0x33 && holds(at + 1, 8)) {
          const PropertyList::Date date{std::bit_cast<double>(number(at + 1, 8))};
          // A NaN differs from itself.
          if (date.seconds == date.seconds) return PropertyList(date);
        }
        break;
      case 0x4: {
        const auto extent = extentAt(at, 1);
        if (!extent || !charge(0, extent->count)) return std::nullopt;
        const auto contents = bytes_.subspan(extent->start, extent->count);
        return PropertyList(PropertyList::Data(contents.begin(), contents.end()));
      }
      case 0x5:
      case 0x6: {
        auto text = textAt(at);
        if (!text) return std::nullopt;
        return PropertyList(std::move(*text));
      }
      case 0x8: {
        const std::size_t width = (marker & 0x0F) + 1;
        if (width <= 8 && holds(at + 1, width)) {
          return PropertyList(PropertyList::Uid{number(at + 1, width)});
        }
        break;
      }
      default:
        break;
    }
    fail("object of unknown or broken kind");
    return std::nullopt;
  }

  // Widths of 1, 2 and 4 bytes are unsigned, 8 and 16 are signed.
  [[nodiscard]] std::optional<PropertyList> integerAt(std::size_t at, unsigned power) {
    const std::size_t width = std::size_t{1} << power;
    if (width <= 16 && holds(at + 1, width)) {
      if (width < 8) return PropertyList(number(at + 1, width));
      if (width == 8) return PropertyList(static_cast<std::int64_t>(number(at + 1, 8)));
      const std::uint64_t high = number(at + 1, 8);
      const std::uint64_t low = number(at + 9, 8);
      if (high == 0) return PropertyList(low);
      if (high == ~std::uint64_t{0} && low >> 63 != 0) {
        return PropertyList(static_cast<std::int64_t>(low));
      }
    }
    fail("integer out of range");
    return std::nullopt;
  }

  std::span<const std::byte> bytes_;
  std::string* reason_;
  const PropertyListLimits& limits_;
  std::size_t offsetWidth_ = 0;
  std::size_t refWidth_ = 0;
  std::size_t objects_ = 0;
  std::size_t table_ = 0;
  std::size_t top_ = 0;
  std::size_t nodes_ = 1;  // the root
  std::size_t length_ = 0;
  std::optional<PropertyList> root_;
  std::vector<Container> open_;
  std::string key_;
};

}  // namespace

std::optional<PropertyList> ParseBinary(std::span<const std::byte> bytes, std::string* reason,
                                        const PropertyListLimits& limits) {
  return BinaryReader(bytes, reason, limits).read();
}

}  // namespace platform::detail
