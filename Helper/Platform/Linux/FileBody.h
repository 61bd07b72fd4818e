// SPDX-License-Identifier: Apache-2.0
//
// The inside of one copied file: its bytes and its attributes. No state, any thread.
#pragma once

#include <sys/stat.h>

namespace platform {

/// Copies what `from` holds into the new, empty file `to`. Holes stay holes. An error number, or 0.
[[nodiscard]] int CopyFileBytes(int from, int to, const struct stat& status);

/// Gives `to` the owner, extended attributes, permissions and times of `from`, whose status is
/// given. An owner that the process may not give is left; so is an attribute that the destination's
/// file system does not keep. An error number, or 0.
[[nodiscard]] int CopyFileAttributes(int from, int to, const struct stat& status);

}  // namespace platform
