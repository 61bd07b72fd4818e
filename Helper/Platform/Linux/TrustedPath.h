// SPDX-License-Identifier: Apache-2.0
//
// Opens what only root could have put in place. No state, any thread.
#pragma once

#include <string_view>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {

/// Opens an absolute path without following a symbolic link at any step, with `flags` for the last
/// component (O_CLOEXEC and O_NOFOLLOW are added). Empty unless every folder above it and the item
/// itself belong to root and can be written by nobody else.
[[nodiscard]] FileDescriptor OpenTrusted(std::string_view path, int flags);

/// The same for an item of an open, trusted folder.
[[nodiscard]] FileDescriptor OpenTrustedAt(int folder, const char* name, int flags);

}  // namespace platform
