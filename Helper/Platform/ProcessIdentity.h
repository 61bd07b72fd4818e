// SPDX-License-Identifier: Apache-2.0
//
// What tells one process from every other, also from a later one with the same process id. Pure
// functions of a pidfd (pidfd_open(2)); any thread.
#pragma once

#include <sys/types.h>

#include <cstdint>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {

/// SO_PASSPIDFD and SCM_PIDFD of Linux 6.5, which the C library's headers may not know yet.
inline constexpr int kSocketPassPidfd = 76;
inline constexpr int kControlPidfd = 0x04;

/// Opens a pidfd; empty when there is no such process or no descriptor is left.
[[nodiscard]] FileDescriptor OpenPidfd(pid_t process);

/// The process version of an audit token: the low half of the pidfd's inode number where the kernel
/// gives every process its own (Linux 6.9), else the start time in clock ticks from /proc. 0 when
/// it cannot be told.
[[nodiscard]] std::uint32_t ProcessVersion(int pidfd, pid_t process);

/// Whether the process has exited. A zombie has.
[[nodiscard]] bool HasExited(int pidfd);

}  // namespace platform
