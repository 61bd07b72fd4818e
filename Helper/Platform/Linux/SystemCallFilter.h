// SPDX-License-Identifier: Apache-2.0
//
// Which system calls the process may still make (seccomp(2)). Called once, before there is a second
// thread. No state.
#pragma once

namespace platform {

/// Takes from the calling thread, and from those that it starts, the system calls that no request
/// needs. What is refused then fails with EPERM, and a call that is younger than this program with
/// ENOSYS, so that a library falls back to what there was before. A call in another architecture's
/// convention ends the process. False, with errno, when the kernel takes no filter. There is no way
/// back.
[[nodiscard]] bool FilterSystemCalls();

}  // namespace platform
