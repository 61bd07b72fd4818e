// SPDX-License-Identifier: Apache-2.0
//
// Fuzz target of the side-car parser: everything that it finds lies in the bytes that it was given,
// and is no more than it promises. One thread.
#include <cstdint>
#include <cstdlib>

#include "Helper/Platform/SideCar.h"
#include "Helper/Platform/Utf8.h"

namespace {

using Bytes = std::span<const std::byte>;

void Require(bool holds) {
  if (!holds) std::abort();
}

void RequireInside(Bytes whole, Bytes part) {
  if (part.empty()) return;
  Require(part.data() >= whole.data() && part.data() + part.size() <= whole.data() + whole.size());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const Bytes whole = std::as_bytes(std::span(data, size));
  const auto sideCar = platform::ParseSideCar(whole);
  if (!sideCar) return 0;
  RequireInside(whole, sideCar->resourceData);
  RequireInside(whole, sideCar->finderInfo);
  Require(sideCar->finderInfo.empty() || sideCar->finderInfo.size() == 32);
  Require(sideCar->attributes.size() <=
          platform::kMostSideCarAttributes * platform::kMostSideCarParts);
  for (const platform::SideCarAttribute& attribute : sideCar->attributes) {
    RequireInside(whole, attribute.value);
    Require(!attribute.name.empty() && platform::IsUtf8(attribute.name));
  }
  return 0;
}
