// SPDX-License-Identifier: Apache-2.0
//
// The connect exchange: what a client sends to the service port to get a private port. No state;
// any thread.
#pragma once

#include <chrono>
#include <string>

#include "Client/Result.h"
#include "Helper/Platform/FileDescriptor.h"

namespace halvec {

/// What a connection consists of. It lasts until the client's own port is closed.
struct ServiceConnection {
  platform::FileDescriptor ownPort;      // kept open, never written to or read
  platform::FileDescriptor privatePort;  // requests go out here, replies come back here
};

/// The path of the service socket that the build chose.
[[nodiscard]] const std::string& DefaultServicePath();

/// Connects to the service socket at `path`, within `limit` (0: no limit). When the helper leaves
/// before it answers, the exchange begins again, a bounded number of times.
///
/// HVMH_NOT_RUNNING: no socket there, or nobody holds it. HVMH_ACCESS_DENIED: its file mode keeps
/// this process out. HVMH_REFUSED and HVMH_RETURN_CODE: the helper said no. HVMH_TIMED_OUT.
/// HVMH_HELPER_GONE: it left during every attempt. HVMH_PROTOCOL_VIOLATION: an ill-formed answer.
/// HVMH_INVALID_ARGUMENT: the path is empty or too long for a socket. HVMH_SYSTEM_ERROR.
[[nodiscard]] Result<ServiceConnection> ConnectToService(const std::string& path,
                                                         std::chrono::milliseconds limit);

}  // namespace halvec
