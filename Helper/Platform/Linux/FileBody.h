// SPDX-License-Identifier: Apache-2.0
//
// The inside of one copied file: its bytes and its attributes. No state, any thread.
#pragma once

#include <sys/stat.h>

#include <cstddef>

namespace platform {

/// Whether an error number says that nothing more can be written here, so that the rest of a tree
/// or an archive need not be tried.
[[nodiscard]] bool EndsEveryWrite(int error);

/// Writes all of the bytes at `offset`. An error number, or 0.
[[nodiscard]] int WriteAll(int to, const std::byte* bytes, std::size_t count, off_t offset);

/// Copies what `from` holds into the new, empty file `to`. Holes stay holes. An error number, or 0.
[[nodiscard]] int CopyFileBytes(int from, int to, const struct stat& status);

/// Gives a file or folder these permissions unless it has them. An error number, or 0.
[[nodiscard]] int SetPermissions(int to, mode_t permissions);

/// Gives `to` the owner, extended attributes, permissions and times of `from`, whose status is
/// given. An owner that the process may not give is left; so is an attribute that the destination's
/// file system does not keep. An error number, or 0.
[[nodiscard]] int CopyFileAttributes(int from, int to, const struct stat& status);

}  // namespace platform
