// SPDX-License-Identifier: Apache-2.0
//
// Creation, run, teardown, work tokens and the idle timer of the server record.
#include <unistd.h>

#include <bit>
#include <limits>
#include <new>
#include <unordered_set>

#include "Helper/Platform/MainQueue.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Shared/Server/ConnectSubsystem.h"
#include "Helper/Shared/Server/HelperServerUtils.h"
#include "Helper/Shared/Server/PortToServerMap.h"

using platform::Log;
using platform::LogPriority;
using platform::RunLoop;

namespace {

/// The records that exist. Work that outlives its request takes and returns tokens on queues of its
/// own, and may do so while the main thread ends the process. `mutex` is held while a token is
/// handled, hence before a record's own lock.
struct LiveServers {
  std::mutex mutex;
  std::unordered_set<const HelperServer*> records;
};

LiveServers& Live() {
  static LiveServers& live = *new LiveServers;  // also for threads that outlive static objects
  return live;
}

}  // namespace

HelperServer* HelperServerCreate(const char* serviceName,
                                 const platform::MigSubsystem* requestSubsystem) {
  PortToServerMapInitialize();
  auto* server = new (std::nothrow) HelperServer;
  if (!server) return nullptr;
  {
    const std::lock_guard guard(Live().mutex);
    Live().records.insert(server);
  }
  server->clientPorts = std::make_unique<ClientPorts>();
  server->portSources = std::make_unique<PortSources>();

  PortName port = kPortNull;
  if (platform::BootstrapCheckIn(serviceName, port) == KERN_SUCCESS) {
    server->servicePort = port;
    PortToServerMapAdd(port, server);
    auto source = platform::MigRunLoopSource::Create(port, &ConnectSubsystem(), 0);
    if (source && source->addTo(RunLoop::Current())) {
      server->connectSource = std::move(source);
      server->requestSubsystem = requestSubsystem;
      return server;
    }
  }
  if (port != kPortNull && port != kPortDead) platform::PortDeallocate(port);
  Log(LogPriority::kError, "unable to create server objects - out of resources");
  HelperServerDestroy(server);
  return nullptr;
}

int HelperServerRun(HelperServer* server) {
  server->runLoop = &RunLoop::Current();
  const platform::ScopedMainQueue mainQueue(*server->runLoop);
  // Where the socket cannot be made the service is the same; only nobody can watch it.
  if (!server->observation)
    server->observation = Observation::Open(*server, HALVEC_OBSERVER_SOCKET);
  int result = 0;
  // The flag is read without the lock: who sets it stops the loop afterwards.
  while (server->stopRequested == 0) {
    result = static_cast<int>(server->runLoop->run(std::numeric_limits<double>::max()));
  }
  return result;
}

void HelperServerDestroy(HelperServer* server) {
  {
    const std::lock_guard guard(Live().mutex);
    Live().records.erase(server);
  }
  if (server->connectSource) {
    server->connectSource->invalidate();
    server->connectSource.reset();
  }
  if (server->servicePort != kPortNull && server->servicePort != kPortDead) {
    PortToServerMapRemove(server->servicePort);
    platform::PortDeallocate(server->servicePort);
  }
  if (server->descriptor != -1) {
    ::close(server->descriptor);
    server->descriptor = -1;
  }
  if (server->clientPorts) {
    const std::lock_guard guard(server->lock);
    while (!server->clientPorts->empty()) {
      const auto client = *server->clientPorts->begin();
      HelperServerRemoveClient(client.first, client.second, server);
    }
    server->clientPorts.reset();
  }
  server->portSources.reset();
  {
    // The process usually ends right here, but a timer that outlived its record would fire into it.
    const std::lock_guard guard(server->lock);
    HelperServerCancelIdleTimer(server);
  }
  delete server;
}

std::uint32_t HelperServerAcquireWorkToken(HelperServer* server) {
  const std::lock_guard live(Live().mutex);
  if (!Live().records.contains(server)) return 0;
  const std::lock_guard guard(server->lock);
  // Kept: with 32 bits set the shift wraps around and bit 0 is handed out a second time.
  const std::uint32_t token = 1U << (static_cast<unsigned>(std::countr_one(server->busyMask)) % 32);
  server->busyMask |= token;
  if (server->observation) server->observation->noteWorkToken(token);
  HelperServerCancelIdleTimer(server);
  return token;
}

bool HelperServerReleaseWorkToken(HelperServer* server, std::uint32_t token) {
  if (!std::has_single_bit(token)) return false;
  const std::lock_guard live(Live().mutex);
  if (!Live().records.contains(server)) return false;
  const std::lock_guard guard(server->lock);
  server->busyMask &= ~token;
  if (server->observation) server->observation->forgetWorkToken(token);
  if (server->busyMask == 0 && server->clientPorts->empty()) HelperServerArmIdleTimer(server);
  return true;
}

void HelperServerArmIdleTimer(HelperServer* server) {
  HelperServerCancelIdleTimer(server);
  RunLoop& loop = server->runLoop ? *server->runLoop : RunLoop::Current();
  const auto delay =
      std::chrono::duration_cast<platform::Duration>(std::chrono::duration<double>(kIdleSeconds));
  server->idleTimer =
      platform::RunLoopTimer::Create(loop, loop.now() + delay, HelperServerStop, server);
  if (server->idleTimer) {
    loop.add(server->idleTimer);
    return;
  }
  server->lock.unlock();
  HelperServerStop(nullptr, server);
  server->lock.lock();
}

void HelperServerCancelIdleTimer(HelperServer* server) {
  if (!server->idleTimer) return;
  server->idleTimer->invalidate();
  server->idleTimer.reset();
}

void HelperServerStop(platform::RunLoopTimer* /*timer*/, void* context) {
  auto* server = static_cast<HelperServer*>(context);
  if (!server) return;
  {
    const std::lock_guard guard(server->lock);
    server->stopRequested = 1;
  }
  if (server->runLoop) server->runLoop->stop();
}
