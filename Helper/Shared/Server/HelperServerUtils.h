// SPDX-License-Identifier: Apache-2.0
//
// The server record and its operations: start, run loop, idle exit with work tokens, clients. The
// main thread owns the record; work tokens come and go on any thread. Lock order: `lock`, then the
// port-to-server map's own mutex.
#pragma once

#include <atomic>
#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <unordered_map>

#include "Helper/Platform/MigSource.h"
#include "Helper/Platform/PortWatcher.h"
#include "Helper/Platform/RunLoop.h"
#include "Helper/Shared/Server/Observation.h"

using ClientPorts = std::map<std::shared_ptr<platform::PortWatcher>, PortName>;
using PortSources = std::unordered_map<PortName, std::shared_ptr<platform::MigRunLoopSource>>;

/// The server of the process. `lock` guards clientPorts, portSources, busyMask, idleTimer and
/// stopRequested.
struct HelperServer {
  PortName servicePort = kPortNull;  // receive right of the service name
  std::shared_ptr<platform::MigRunLoopSource> connectSource;
  platform::RunLoop* runLoop = nullptr;  // the loop of the thread that called HelperServerRun
  std::shared_ptr<platform::RunLoopTimer> idleTimer;
  int descriptor = -1;                       // kept: closed at teardown, opened by nobody
  std::unique_ptr<ClientPorts> clientPorts;  // watcher of the client's port -> its private port
  std::unique_ptr<PortSources> portSources;  // private port -> the source that serves it
  std::mutex lock;
  std::mutex spareLock;  // kept: never taken
  const platform::MigSubsystem* requestSubsystem = nullptr;
  std::uint32_t busyMask = 0;  // one bit per work token that is out
  std::atomic<std::uint8_t> stopRequested{0};
  std::unique_ptr<Observation> observation;  // null where nobody may watch
};

/// Seconds from the last client's or the last token's end to the exit.
inline constexpr double kIdleSeconds = 10.0;

/// Checks the service name in and installs the connect source on the calling thread's loop. Null,
/// with one error line, when that fails; null without a line when there is no memory.
[[nodiscard]] HelperServer* HelperServerCreate(const char* serviceName,
                                               const platform::MigSubsystem* requestSubsystem);

/// Runs the calling thread's loop until the server is stopped. The last run's result; 0 when the
/// server had been stopped before.
int HelperServerRun(HelperServer* server);

/// Releases all that the record holds, clients included, and frees it.
void HelperServerDestroy(HelperServer* server);

/// The server that serves, or knows the client of, this port; null when there is none.
[[nodiscard]] HelperServer* HelperServerForPort(PortName port);

/// Takes the lowest free work token, one bit of 32, and cancels the idle timer. Kept: with all 32
/// out, the next caller is handed bit 0 again. 0, which is no token, when the server has been
/// destroyed: work that outlives the main loop may still ask.
[[nodiscard]] std::uint32_t HelperServerAcquireWorkToken(HelperServer* server);

/// Gives a token back; arms the idle timer when it was the last one and no client is connected.
/// False, with nothing changed, when `token` is not exactly one bit or the server has been
/// destroyed.
bool HelperServerReleaseWorkToken(HelperServer* server, std::uint32_t token);

/// Both are called with `lock` held.
void HelperServerArmIdleTimer(HelperServer* server);
void HelperServerCancelIdleTimer(HelperServer* server);

/// The idle timer's callback: ends the server's run. Does nothing without a server.
void HelperServerStop(platform::RunLoopTimer* timer, void* server);

/// Serves one connect: judges the caller, makes its private port and watches its own.
/// KERN_SUCCESS, with the name of the private port; KERN_INVALID_SECURITY when the caller lacks the
/// entitlement; KERN_FAILURE; or the code of the port's allocation.
[[nodiscard]] KernReturn HelperServerConnectClient(PortName servicePort, PortName clientPort,
                                                   PortName& privatePort,
                                                   const wire::AuditToken& auditToken);

/// Takes a client out: its watcher, its own port, its source and its private port. With `lock` held
/// or during teardown. `watcher` may be null.
void HelperServerRemoveClient(const std::shared_ptr<platform::PortWatcher>& watcher,
                              PortName privatePort, HelperServer* server);

/// Runs when a client's port has died.
void MachPortInvalidationCallBack(platform::PortWatcher* watcher, void* server);
