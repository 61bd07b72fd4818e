// SPDX-License-Identifier: Apache-2.0
//
// The telephony utility library's way from byte strings to platform strings. Any thread; no state.
#pragma once

#include <optional>
#include <string_view>

#include "Helper/Platform/String.h"

namespace vlu::cf {

/// The platform string of `text`, retained for the caller; null when `text` is not entirely valid
/// in `encoding` or holds a NUL.
[[nodiscard]] inline std::optional<platform::String> convert_copy(
    std::string_view text, platform::StringEncoding encoding) {
  return platform::String::Decode(text, encoding);
}

}  // namespace vlu::cf
