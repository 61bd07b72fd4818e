// SPDX-License-Identifier: Apache-2.0
//
// The property-list value: a variant, and a dictionary that keeps its order and finds its keys
// through a small hash table. No state beyond the values themselves.
#include "Helper/Platform/PropertyList.h"

#include <algorithm>
#include <bit>
#include <limits>

#include "Helper/Platform/PropertyListText.h"

namespace platform {

namespace {

constexpr std::size_t kAbsent = std::numeric_limits<std::size_t>::max();
// Up to here comparing one key after the other is as quick as hashing.
constexpr std::size_t kEntriesWithoutIndex = 12;

bool SameBits(double left, double right) noexcept {
  return std::bit_cast<std::uint64_t>(left) == std::bit_cast<std::uint64_t>(right);
}

}  // namespace

struct PropertyList::Dictionary::Index : detail::TextIndex {};

PropertyList::Dictionary::Dictionary() noexcept = default;
PropertyList::Dictionary::Dictionary(const Dictionary& other)
    : entries_(other.entries_),
      index_(other.index_ ? std::make_unique<Index>(*other.index_) : nullptr) {}
PropertyList::Dictionary::Dictionary(Dictionary&& other) noexcept = default;
PropertyList::Dictionary& PropertyList::Dictionary::operator=(const Dictionary& other) {
  if (this != &other) *this = Dictionary(other);
  return *this;
}
PropertyList::Dictionary& PropertyList::Dictionary::operator=(Dictionary&& other) noexcept =
    default;
PropertyList::Dictionary::~Dictionary() = default;

std::size_t PropertyList::Dictionary::position(std::string_view key) const noexcept {
  const auto isKey = [this, key](std::size_t i) { return entries_[i].key == key; };
  if (index_) return index_->find(detail::HashText(key), isKey).value_or(kAbsent);
  std::size_t i = 0;
  while (i < entries_.size() && !isKey(i)) ++i;
  return i < entries_.size() ? i : kAbsent;
}

void PropertyList::Dictionary::reindex() {
  index_.reset();
  if (entries_.size() <= kEntriesWithoutIndex) return;
  index_ = std::make_unique<Index>();
  for (std::size_t i = 0; i < entries_.size(); ++i) {
    index_->add(detail::HashText(entries_[i].key), i);
  }
}

const PropertyList* PropertyList::Dictionary::find(std::string_view key) const noexcept {
  const std::size_t found = position(key);
  return found == kAbsent ? nullptr : &entries_[found].value;
}

PropertyList* PropertyList::Dictionary::find(std::string_view key) noexcept {
  const std::size_t found = position(key);
  return found == kAbsent ? nullptr : &entries_[found].value;
}

PropertyList* PropertyList::Dictionary::insert(std::string key, PropertyList value) {
  if (!index_) {
    if (position(key) != kAbsent) return nullptr;
  } else {
    const std::uint64_t hash = detail::HashText(key);
    const auto isKey = [this, &key](std::size_t i) { return entries_[i].key == key; };
    if (index_->find(hash, isKey)) return nullptr;
    index_->add(hash, entries_.size());
  }
  entries_.push_back({std::move(key), std::move(value)});
  if (!index_) reindex();
  return &entries_.back().value;
}

void PropertyList::Dictionary::set(std::string key, PropertyList value) {
  if (PropertyList* old = find(key)) {
    *old = std::move(value);
    return;
  }
  insert(std::move(key), std::move(value));
}

bool PropertyList::Dictionary::erase(std::string_view key) {
  const std::size_t found = position(key);
  if (found == kAbsent) return false;
  entries_.erase(entries_.begin() + static_cast<std::ptrdiff_t>(found));
  reindex();
  return true;
}

void PropertyList::Dictionary::reserve(std::size_t count) { entries_.reserve(count); }

bool operator==(const PropertyList::Dictionary& left, const PropertyList::Dictionary& right) {
  if (left.size() != right.size()) return false;
  return std::all_of(left.begin(), left.end(), [&right](const PropertyList::Entry& entry) {
    const PropertyList* other = right.find(entry.key);
    return other != nullptr && entry.value == *other;
  });
}

PropertyList::PropertyList(Array value) noexcept : value_(std::move(value)) {}
PropertyList::PropertyList(Dictionary value) noexcept : value_(std::move(value)) {}
PropertyList::PropertyList(const PropertyList& other) = default;
PropertyList::PropertyList(PropertyList&& other) noexcept = default;
PropertyList& PropertyList::operator=(const PropertyList& other) {
  // By way of a copy: `other` may be a part of this very value.
  if (this != &other) *this = PropertyList(other);
  return *this;
}
PropertyList& PropertyList::operator=(PropertyList&& other) noexcept {
  // By way of a temporary, for the same reason.
  Value taken = std::move(other.value_);
  value_ = std::move(taken);
  return *this;
}
PropertyList::~PropertyList() = default;

PropertyList::Kind PropertyList::kind() const noexcept {
  // In the order of the variant's alternatives: both widths of integer are one kind.
  constexpr std::array kKinds{Kind::kBoolean, Kind::kInteger,   Kind::kInteger, Kind::kReal,
                              Kind::kString,  Kind::kData,      Kind::kDate,    Kind::kUid,
                              Kind::kArray,   Kind::kDictionary};
  static_assert(kKinds.size() == std::variant_size_v<Value>);
  return kKinds[value_.index()];
}

std::optional<bool> PropertyList::boolean() const noexcept {
  const bool* value = std::get_if<bool>(&value_);
  return value ? std::optional(*value) : std::nullopt;
}

std::optional<std::int64_t> PropertyList::integer() const noexcept {
  const std::int64_t* value = std::get_if<std::int64_t>(&value_);
  return value ? std::optional(*value) : std::nullopt;
}

std::optional<std::uint64_t> PropertyList::unsignedInteger() const noexcept {
  if (const std::uint64_t* value = std::get_if<std::uint64_t>(&value_)) return *value;
  const std::int64_t* value = std::get_if<std::int64_t>(&value_);
  if (value == nullptr || *value < 0) return std::nullopt;
  return static_cast<std::uint64_t>(*value);
}

std::optional<double> PropertyList::real() const noexcept {
  const double* value = std::get_if<double>(&value_);
  return value ? std::optional(*value) : std::nullopt;
}

std::optional<PropertyList::Date> PropertyList::date() const noexcept {
  const Date* value = std::get_if<Date>(&value_);
  return value ? std::optional(*value) : std::nullopt;
}

std::optional<PropertyList::Uid> PropertyList::uid() const noexcept {
  const Uid* value = std::get_if<Uid>(&value_);
  return value ? std::optional(*value) : std::nullopt;
}

const std::string* PropertyList::string() const noexcept {
  return std::get_if<std::string>(&value_);
}
const PropertyList::Data* PropertyList::data() const noexcept { return std::get_if<Data>(&value_); }
const PropertyList::Array* PropertyList::array() const noexcept {
  return std::get_if<Array>(&value_);
}
PropertyList::Array* PropertyList::array() noexcept { return std::get_if<Array>(&value_); }
const PropertyList::Dictionary* PropertyList::dictionary() const noexcept {
  return std::get_if<Dictionary>(&value_);
}
PropertyList::Dictionary* PropertyList::dictionary() noexcept {
  return std::get_if<Dictionary>(&value_);
}

const PropertyList* PropertyList::find(std::string_view key) const noexcept {
  const Dictionary* entries = dictionary();
  return entries ? entries->find(key) : nullptr;
}

bool operator==(const PropertyList& left, const PropertyList& right) {
  if (left.value_.index() != right.value_.index()) return false;
  return std::visit(
      [&right](const auto& value) {
        using Held = std::remove_cvref_t<decltype(value)>;
        const Held& other = *std::get_if<Held>(&right.value_);
        if constexpr (std::same_as<Held, double>) {
          return SameBits(value, other);
        } else if constexpr (std::same_as<Held, PropertyList::Date>) {
          return SameBits(value.seconds, other.seconds);
        } else if constexpr (std::same_as<Held, PropertyList::Uid>) {
          return value.number == other.number;
        } else {
          return value == other;
        }
      },
      left.value_);
}

std::optional<PropertyList> ParsePropertyList(std::span<const std::byte> bytes, std::string* reason,
                                              const PropertyListLimits& limits) {
  std::string discarded;
  if (reason == nullptr) reason = &discarded;
  if (bytes.size() > limits.bytes) {
    *reason = "longer than a property list may be";
    return std::nullopt;
  }
  constexpr std::string_view kBinaryMagic = "bplist00";
  const std::string_view text(reinterpret_cast<const char*>(bytes.data()), bytes.size());
  return text.starts_with(kBinaryMagic) ? detail::ParseBinary(bytes, reason, limits)
                                        : detail::ParseXml(bytes, reason, limits);
}

}  // namespace platform
