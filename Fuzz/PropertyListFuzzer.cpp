// SPDX-License-Identifier: Apache-2.0
//
// Fuzz target of the property-list codec: whatever is read can be written, and reads back the same.
// One thread.
#include <cstdint>
#include <cstdlib>
#include <span>

#include "Helper/Platform/PropertyList.h"

namespace {

void Require(bool holds) {
  if (!holds) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using platform::ParsePropertyList;
  const auto value = ParsePropertyList(std::as_bytes(std::span(data, size)));
  if (!value) return 0;

  // The binary form carries everything. It may be longer than what was read, where that referred to
  // one number many times.
  platform::PropertyListLimits roomy;
  roomy.bytes *= 4;
  const auto binary = platform::SerializeBinary(*value, roomy);
  Require(binary.has_value());
  const auto same = ParsePropertyList(*binary, nullptr, roomy);
  Require(same.has_value() && *same == *value);

  // The XML form cuts dates to seconds and refuses some texts: compared from the second time on.
  if (const auto xml = platform::SerializeXml(*value)) {
    const auto again = ParsePropertyList(std::as_bytes(std::span(*xml)));
    Require(again.has_value());
    Require(platform::SerializeXml(*again) == xml);
  }
  return 0;
}
