// SPDX-License-Identifier: Apache-2.0
//
// What of the environment is kept from the libraries. Main thread, while it is the only one: any
// library on any thread may read the environment.
#pragma once

namespace platform {

/// Takes every variable out of the environment but those by which a launcher hands over:
/// LISTEN_PID, LISTEN_FDS, LISTEN_FDNAMES (sd_listen_fds(3)) and NOTIFY_SOCKET (sd_notify(3)).
/// Libraries obey others: one has the keys of every TLS connection written to a file, others choose
/// name servers, plug-ins and folders.
void ForgetEnvironment();

}  // namespace platform
