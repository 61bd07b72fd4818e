// SPDX-License-Identifier: Apache-2.0
//
// Whose data the offline geocoder answers from. Any thread; no state.
#pragma once

#include <string>
#include <variant>

#include "Helper/Platform/ReverseGeocoder.h"

namespace platform {

/// The text, as UTF-8, in the atlas at `path` that tells when it was made, from whose data, and
/// under which licences; or why the file cannot be used.
[[nodiscard]] std::variant<std::string, GeocodeError> ReadMapAttributions(const std::string& path);

}  // namespace platform
