// SPDX-License-Identifier: Apache-2.0
//
// Which system calls the process may still make, as a filter for seccomp(2). No state.
#pragma once

#include <linux/filter.h>

#include <span>

namespace platform {

/// The filter. What it refuses fails with EPERM, and a call that is younger than this program with
/// ENOSYS, so that a library falls back to what there was before. A call in another architecture's
/// convention ends the process.
[[nodiscard]] std::span<const sock_filter> SystemCallFilter();

}  // namespace platform
