// SPDX-License-Identifier: Apache-2.0
//
// Addresses of Unix sockets by path (unix(7)). One thread, no lock.
#pragma once

#include <string>

namespace handset {

/// Binds `socket` to `path`, which must not exist; throws Failure, also for a path that does not
/// fit into an address.
void BindAt(int socket, const std::string& path);

/// Connects `socket` to the one bound at `path`; throws Failure.
void ConnectTo(int socket, const std::string& path);

}  // namespace handset
