// SPDX-License-Identifier: Apache-2.0
//
// From this system's error numbers to the handset's. Pure; any thread.
#pragma once

#include "Helper/Platform/HandsetError.h"

namespace platform {

/// The handset's number for `error`, an errno of this system; 5 for one that the handset lacks.
[[nodiscard]] HandsetError HandsetErrorOf(int error) noexcept;

}  // namespace platform
