// SPDX-License-Identifier: Apache-2.0
//
// Fuzz target of the JSON reader, which reads what a geocoding service on the network answers. One
// thread.
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "Helper/Platform/Json.h"

namespace {

void Require(bool holds) {
  if (!holds) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using platform::ParseJson;
  const std::string text(reinterpret_cast<const char*>(data), size);
  const auto value = ParseJson(text);
  if (!value) return 0;

  Require(ParseJson(" \t\r\n" + text + "\n ") == value);
  Require(!ParseJson(text + "]"));
  Require(!ParseJson(text + "0 0"));
  const auto inArray = ParseJson("[" + text + "]");
  const auto binary = platform::SerializeBinary(*value);
  Require(binary.has_value());
  Require(platform::ParsePropertyList(*binary) == value);
  // Only the limit of the nesting may stand against one array more around it.
  if (inArray) Require(inArray->array() && inArray->array()->size() == 1);
  return 0;
}
