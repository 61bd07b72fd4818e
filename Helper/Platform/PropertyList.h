// SPDX-License-Identifier: Apache-2.0
//
// Property lists: the value type and its two serialized forms, XML and binary ("bplist00"). Reading
// is strict, iterative and budgeted, because the bytes come from other processes: what is not
// exactly a property list is refused, never repaired. A value belongs to one thread at a time;
// the functions have no state and may run on any thread.
#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

namespace platform {

/// One value: a scalar, an array or a dictionary. Copying, comparing and destroying follow the
/// nesting by recursion, so a value built by hand should stay within PropertyListLimits::depth.
class PropertyList {
 public:
  enum class Kind : std::uint8_t {
    kBoolean,
    kInteger,
    kReal,
    kString,
    kData,
    kDate,
    kUid,
    kArray,
    kDictionary
  };

  /// Seconds since 2001-01-01T00:00:00Z, leap seconds not counted. The XML form carries whole
  /// seconds of the years 0000 to 9999 only, so a fraction is cut off there.
  struct Date {
    double seconds = 0;
  };

  /// A reference inside an archive of objects. Only the binary form can carry it.
  struct Uid {
    std::uint64_t number = 0;
  };

  using Data = std::vector<std::byte>;
  using Array = std::vector<PropertyList>;
  struct Entry;

  /// Keys and values in the order of insertion, each key once. Look-up takes constant time.
  class Dictionary {
   public:
    Dictionary() noexcept;
    Dictionary(const Dictionary& other);
    Dictionary(Dictionary&& other) noexcept;
    Dictionary& operator=(const Dictionary& other);
    Dictionary& operator=(Dictionary&& other) noexcept;
    ~Dictionary();

    [[nodiscard]] std::size_t size() const noexcept;
    [[nodiscard]] bool empty() const noexcept;
    [[nodiscard]] const Entry* begin() const noexcept;
    [[nodiscard]] const Entry* end() const noexcept;

    /// The value of `key`, null when it is absent; valid until the dictionary changes.
    [[nodiscard]] const PropertyList* find(std::string_view key) const noexcept;
    [[nodiscard]] PropertyList* find(std::string_view key) noexcept;

    /// Appends the pair and answers where its value stands; null, with nothing changed, when the
    /// key is there already.
    PropertyList* insert(std::string key, PropertyList value);
    /// Appends the pair, or replaces the value of a key that is there already.
    void set(std::string key, PropertyList value);
    /// Removes the pair; false when the key is absent.
    bool erase(std::string_view key);
    void reserve(std::size_t count);

    /// Same keys with equal values, in whatever order.
    friend bool operator==(const Dictionary& left, const Dictionary& right);

   private:
    struct Index;
    [[nodiscard]] std::size_t position(std::string_view key) const noexcept;
    void reindex();

    std::vector<Entry> entries_;
    std::unique_ptr<Index> index_;  // only beyond a handful of entries
  };

  // Implicit on purpose: a literal stands for itself wherever a value is wanted.
  template <std::same_as<bool> Boolean>
  PropertyList(Boolean value) noexcept : value_(value) {}
  template <std::integral Integer>
  requires(!std::same_as<Integer, bool> && sizeof(Integer) <= sizeof(std::int64_t))
      PropertyList(Integer value)
  noexcept : value_(Normalized(value)) {}
  PropertyList(double value) noexcept : value_(value) {}
  /// Text must be UTF-8 without NUL; the serializers refuse any other.
  PropertyList(std::string value) noexcept : value_(std::move(value)) {}
  PropertyList(std::string_view value) : value_(std::string(value)) {}
  PropertyList(const char* value) : value_(std::string(value)) {}
  PropertyList(Data value) noexcept : value_(std::move(value)) {}
  PropertyList(Date value) noexcept : value_(value) {}
  PropertyList(Uid value) noexcept : value_(value) {}
  PropertyList(Array value) noexcept;
  PropertyList(Dictionary value) noexcept;

  PropertyList(const PropertyList& other);
  PropertyList(PropertyList&& other) noexcept;
  PropertyList& operator=(const PropertyList& other);
  PropertyList& operator=(PropertyList&& other) noexcept;
  ~PropertyList();

  [[nodiscard]] Kind kind() const noexcept;

  // What the value is, when it is of that kind; none or null otherwise. Nothing is converted.
  [[nodiscard]] std::optional<bool> boolean() const noexcept;
  /// An integer of -2^63 to 2^63-1.
  [[nodiscard]] std::optional<std::int64_t> integer() const noexcept;
  /// An integer of 0 to 2^64-1.
  [[nodiscard]] std::optional<std::uint64_t> unsignedInteger() const noexcept;
  [[nodiscard]] std::optional<double> real() const noexcept;
  [[nodiscard]] std::optional<Date> date() const noexcept;
  [[nodiscard]] std::optional<Uid> uid() const noexcept;
  [[nodiscard]] const std::string* string() const noexcept;
  [[nodiscard]] const Data* data() const noexcept;
  [[nodiscard]] const Array* array() const noexcept;
  [[nodiscard]] Array* array() noexcept;
  [[nodiscard]] const Dictionary* dictionary() const noexcept;
  [[nodiscard]] Dictionary* dictionary() noexcept;

  /// The value of `key` when this is a dictionary that has it, else null.
  [[nodiscard]] const PropertyList* find(std::string_view key) const noexcept;

  /// Same kind and same value: a boolean is no number, an integer is no real. Reals and dates
  /// compare by bits, so that 0.0 differs from -0.0, and a NaN equals itself.
  friend bool operator==(const PropertyList& left, const PropertyList& right);

 private:
  // An integer is kept signed whenever it fits, so that equal numbers look alike.
  using Value = std::variant<bool, std::int64_t, std::uint64_t, double, std::string, Data, Date,
                             Uid, Array, Dictionary>;
  template <std::integral Integer>
  static Value Normalized(Integer value) noexcept {
    if (std::in_range<std::int64_t>(value)) return static_cast<std::int64_t>(value);
    return static_cast<std::uint64_t>(value);
  }

  Value value_;
};

struct PropertyList::Entry {
  std::string key;
  PropertyList value;
};

inline std::size_t PropertyList::Dictionary::size() const noexcept { return entries_.size(); }
inline bool PropertyList::Dictionary::empty() const noexcept { return entries_.empty(); }
inline const PropertyList::Entry* PropertyList::Dictionary::begin() const noexcept {
  return entries_.data();
}
inline const PropertyList::Entry* PropertyList::Dictionary::end() const noexcept {
  return entries_.data() + entries_.size();
}

/// What a reader accepts and a writer produces at most, so that whatever is written can be read.
struct PropertyListLimits {
  /// Length of the serialized form; in the binary one also of all text and data, those that are
  /// referred to several times counted each time.
  std::size_t bytes = std::size_t{16} << 20;
  /// Arrays and dictionaries inside one another, the outermost included.
  std::size_t depth = 512;
  /// Values and keys, one that is referred to several times counted each time.
  std::size_t nodes = 1'000'000;
};

/// Reads either form: binary when the bytes begin with "bplist00", else XML. None when they are not
/// exactly one property list within `limits`; `reason`, when given, then says why in a few words.
///
/// XML: one `plist` element, of version 1.0 where it says so, that holds one value. A document type
/// is skipped, an internal subset refused. Numbers, dates and base64 are the element's whole text:
///   integer  [+-] digits, or [+-] 0x hexadecimal digits; -2^63 to 2^64-1
///   real     [+-] decimal with optional exponent, or inf, infinity, nan in any case
///   date     YYYY-MM-DDThh:mm:ssZ, a date that exists
///   data     base64 (RFC 4648, section 4) with padding; blanks and line ends anywhere
/// Blanks around a number or date, text beside elements, a key without value and a key twice are
/// refused.
///
/// Binary: header, objects, offset table, trailer of 32 bytes, nothing between or behind. Integers
/// of 1, 2, 4, 8 and 16 bytes, reals of 4 and 8, ASCII and UTF-16 text, data, dates, UIDs of up to
/// 8 bytes, arrays and dictionaries with text keys. Sets, null, a NUL in text and a key twice are
/// refused. An object that no reference leads to is not looked at.
[[nodiscard]] std::optional<PropertyList> ParsePropertyList(std::span<const std::byte> bytes,
                                                            std::string* reason = nullptr,
                                                            const PropertyListLimits& limits = {});

/// The XML form: declaration, `<plist version="1.0">` without a document type, tabs, base64 on one
/// line. Reads back equal, but for the fractions of dates. None when `limits` are exceeded, or for
/// what XML 1.0 cannot carry: other than UTF-8, control characters, a UID, a date out of range.
[[nodiscard]] std::optional<std::string> SerializeXml(const PropertyList& value,
                                                      const PropertyListLimits& limits = {});

/// The binary form; equal texts are stored once. Reads back equal. None when `limits` are exceeded,
/// or a text is not UTF-8 or has a NUL, or a date is not a number.
[[nodiscard]] std::optional<std::vector<std::byte>> SerializeBinary(
    const PropertyList& value, const PropertyListLimits& limits = {});

}  // namespace platform
