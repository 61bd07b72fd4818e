// SPDX-License-Identifier: Apache-2.0
//
// Former names of time zones and the present name of a zone in the same country. Any thread; no
// state.
#pragma once

#include <string_view>

namespace platform {

/// The name that zone.tab has for `zone`; `zone` itself where it is no former name.
[[nodiscard]] std::string_view CanonicalZone(std::string_view zone);

}  // namespace platform
