// SPDX-License-Identifier: Apache-2.0
//
// The files of another process under /proc. Any thread; no state.
#pragma once

#include <sys/types.h>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {

/// Opens /proc/PID/`name` (proc(5)) of `process`, another user's too where the thread may have
/// CAP_SYS_PTRACE: this is the only place where that is in effect, since it opens every door below
/// /proc/PID. Empty, with errno, when it cannot be opened.
[[nodiscard]] FileDescriptor OpenProcessFile(pid_t process, const char* name, int flags);

}  // namespace platform
