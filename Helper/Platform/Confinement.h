// SPDX-License-Identifier: Apache-2.0
//
// The second wall: what the process gives up before its first message, so that a defect in it is
// worth less to whoever finds it. Main thread, while it is the only one.
#pragma once

namespace platform {

/// Gives up, for the life of the process and for every thread that it will start, what no request
/// needs: changing the system's programs, configuration, kernel settings and devices; every
/// capability but five; new privileges; and the system calls that lead out of this process.
/// A part that the launcher has seen to, or that the process may not change, is left as it is; any
/// other part that cannot be had is logged, and the helper goes on without it.
void Confine();

}  // namespace platform
