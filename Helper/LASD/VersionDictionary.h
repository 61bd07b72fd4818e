// SPDX-License-Identifier: Apache-2.0
//
// Reading manifests, and what the preferences hold of them. Pure; any thread.
#pragma once

#include <string>
#include <string_view>

#include "Helper/Platform/PropertyList.h"

/// The value of `key` when it is a dictionary, else null.
[[nodiscard]] inline const platform::PropertyList* DictionaryAt(const platform::PropertyList& list,
                                                                std::string_view key) {
  const platform::PropertyList* value = list.find(key);
  return value && value->dictionary() ? value : nullptr;
}

/// The value of `key` when it is a string, else null.
[[nodiscard]] inline const std::string* TextAt(const platform::PropertyList& list,
                                               std::string_view key) {
  const platform::PropertyList* value = list.find(key);
  return value ? value->string() : nullptr;
}
