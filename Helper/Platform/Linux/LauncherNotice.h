// SPDX-License-Identifier: Apache-2.0
//
// What the helper tells the service launcher that started it. Main thread, no state.
#pragma once

namespace platform {

/// Tells the launcher that the service port is checked in: one datagram, `READY=1`, to the socket
/// that the variable NOTIFY_SOCKET names (sd_notify(3)): a path, or a name in the abstract name
/// space behind "@". Without the variable there is nobody to tell. A launcher that cannot be
/// reached is not told, and waits or not as it likes.
void TellLauncherReady();

}  // namespace platform
