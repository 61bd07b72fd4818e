// SPDX-License-Identifier: Apache-2.0
//
// Decoding the path, reading the file, parsing what it holds.
#include "Helper/Files/DictionaryFile.h"

#include <string>

#include "Helper/Platform/RegularFile.h"
#include "Helper/Platform/String.h"

std::optional<platform::PropertyList> CreateDictionaryFromFile(const char* path) {
  const auto decoded = platform::String::Decode(path, platform::StringEncoding::kAscii);
  if (!decoded) return std::nullopt;
  const auto bytes = platform::ReadRegularFile(std::string(decoded->utf8()).c_str(),
                                               platform::PropertyListLimits{}.bytes);
  if (!bytes) return std::nullopt;
  auto list = platform::ParsePropertyList(*bytes);
  if (!list || !list->dictionary()) return std::nullopt;
  return list;
}
