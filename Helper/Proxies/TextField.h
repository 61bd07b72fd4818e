// SPDX-License-Identifier: Apache-2.0
//
// Texts of a request and of a reply as the platform's strings and back. Pure; any thread.
#pragma once

#include <algorithm>
#include <optional>
#include <string>
#include <string_view>

#include "Helper/Platform/Utf8.h"
#include "Helper/Shared/Interface/Request.h"

/// The text of `field`; none when it is not valid UTF-8.
template <std::size_t Size>
[[nodiscard]] std::optional<std::string> TextOf(const wire::Text<Size>& field) {
  const std::string_view text = field.view();
  if (!platform::IsUtf8(text)) return std::nullopt;
  return std::string(text);
}

/// Writes `text` and zeros behind it into `field`; the empty text where it does not fit with its
/// zero.
template <std::size_t Size>
void PutText(std::string_view text, wire::Text<Size>& field) {
  field.bytes.fill('\0');
  if (text.size() < Size) std::copy(text.begin(), text.end(), field.bytes.begin());
}
