// SPDX-License-Identifier: Apache-2.0
//
// Opens what a path leads to without being led astray by whoever owns a folder on the way. No
// state, any thread.
#pragma once

#include <string_view>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {

enum class LastLink { kFollow, kOpen };

/// Opens an item for its path alone (O_PATH), beginning at the root directory or else at `folder`,
/// which may be AT_FDCWD. Links on the way, and with kFollow at the end, are followed only if they
/// belong to root or to this process's user (else EACCES): the helper may reach more than whoever
/// made another. What a link says is taken as text, so that those of /proc open no other process's
/// world. Slashes at the end demand no directory. Empty with errno on failure.
[[nodiscard]] FileDescriptor OpenPathAt(int folder, std::string_view path, LastLink last);

/// The same for a directory (ENOTDIR), links at the end followed.
[[nodiscard]] FileDescriptor OpenDirectoryAt(int folder, std::string_view path);

}  // namespace platform
