// SPDX-License-Identifier: Apache-2.0
//
// Property lists drawn at random, the same ones for the same seed. One thread.
#pragma once

#include <cstdint>
#include <random>

#include "Helper/Platform/PropertyList.h"

namespace property_list_test {

using Random = std::mt19937_64;

/// A value of any kind that both forms can carry, dates in whole seconds of the years 1 to 9999;
/// containers nested at most `depth` deep.
[[nodiscard]] platform::PropertyList RandomPropertyList(Random& random, int depth);

/// `text` with a few bytes changed, removed, doubled or moved.
[[nodiscard]] std::string Mutated(std::string text, Random& random);

}  // namespace property_list_test
