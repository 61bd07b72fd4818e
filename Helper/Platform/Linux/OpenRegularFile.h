// SPDX-License-Identifier: Apache-2.0
//
// Opening a file that somebody else named, without ever waiting for it. Any thread; no state.
#pragma once

#include <sys/stat.h>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {

/// Opens the regular file at `path` for reading, links followed, and examines it. 0, an error
/// number, or EOPNOTSUPP for anything else that stands there; a FIFO or device is not waited for.
[[nodiscard]] int OpenRegularFile(const char* path, FileDescriptor& file, struct stat& status);

}  // namespace platform
