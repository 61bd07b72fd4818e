// SPDX-License-Identifier: Apache-2.0
//
// JSON text (RFC 8259) as a property list. Strict and bounded, because the text comes from other
// systems. Any thread; no state.
#pragma once

#include <optional>
#include <string_view>

#include "Helper/Platform/PropertyList.h"

namespace platform {

/// The value that `text` is: objects become dictionaries, numbers integers where they are written
/// as such and fit into 64 bits, else reals. A null is left out where it is a member, and an empty
/// dictionary elsewhere. None when `text` is not exactly one JSON value, nests arrays and
/// objects deeper than 32, has
/// a key twice, or a string with a NUL.
[[nodiscard]] std::optional<PropertyList> ParseJson(std::string_view text);

}  // namespace platform
