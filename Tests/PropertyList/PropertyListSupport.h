// SPDX-License-Identifier: Apache-2.0
//
// Small helpers of the property-list tests: texts as bytes, bytes as texts. Pure functions.
#pragma once

#include <cstddef>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "Helper/Platform/PropertyList.h"

namespace property_list_test {

using platform::PropertyList;

[[nodiscard]] inline std::optional<PropertyList> Parse(std::string_view text,
                                                       std::string* reason = nullptr) {
  return platform::ParsePropertyList(std::as_bytes(std::span(text)), reason);
}

/// The XML document whose root value is written as `value`.
[[nodiscard]] inline std::string Document(std::string_view value) {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n" +
         std::string(value) + "\n</plist>\n";
}

[[nodiscard]] inline std::string TextOf(std::span<const std::byte> bytes) {
  return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

[[nodiscard]] inline PropertyList::Data DataOf(std::string_view text) {
  const auto bytes = std::as_bytes(std::span(text));
  return {bytes.begin(), bytes.end()};
}

/// `count` arrays inside one another, the innermost empty.
[[nodiscard]] inline PropertyList Nested(std::size_t count) {
  PropertyList value{PropertyList::Array{}};
  while (--count > 0) {
    PropertyList::Array outer;
    outer.push_back(std::move(value));
    value = PropertyList(std::move(outer));
  }
  return value;
}

}  // namespace property_list_test
