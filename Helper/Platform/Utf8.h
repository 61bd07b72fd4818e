// SPDX-License-Identifier: Apache-2.0
//
// Whether text from a message can become a string of the platform. Pure; any thread.
#pragma once

#include <string_view>

#include "Helper/Platform/PropertyListText.h"

namespace platform {

/// Valid UTF-8 (RFC 3629) without NUL.
[[nodiscard]] inline bool IsUtf8(std::string_view text) noexcept {
  return detail::IsPropertyListText(text);
}

}  // namespace platform
