// SPDX-License-Identifier: Apache-2.0
//
// Clients: how one is let in, and how it is taken out when its port dies. Main thread.
#undef NDEBUG  // the one assertion below guards release builds too
#include <assert.h>

#include "Helper/Shared/Interface/Connect.h"
#include "Helper/Shared/Server/CallerEntitlement.h"
#include "Helper/Shared/Server/HelperServerUtils.h"
#include "Helper/Shared/Server/PortToServerMap.h"

using platform::MigRunLoopSource;
using platform::PortWatcher;

KernReturn HelperServerConnectClient(PortName servicePort, PortName clientPort,
                                     PortName& privatePort, const wire::AuditToken& auditToken) {
  privatePort = kPortNull;
  if (!CallerHasEntitlement(wire::kRequiredEntitlement, auditToken)) return KERN_INVALID_SECURITY;

  HelperServer* server = HelperServerForPort(servicePort);
  PortName port = kPortNull;
  KernReturn code = platform::PortAllocate(port);
  if (code != KERN_SUCCESS) return code;
  code = platform::PortInsertSendRight(port);
  if (code != KERN_SUCCESS) {
    platform::PortDropReceiveRight(port);
    return code;
  }

  auto source = MigRunLoopSource::Create(port, server->requestSubsystem, 0);
  std::shared_ptr<PortWatcher> watcher;
  if (source) {
    watcher = PortWatcher::Create(clientPort, server);
    if (!watcher) source->invalidate();
  }
  if (!watcher) {
    platform::PortDropReceiveRight(port);
    platform::PortDeallocate(port);
    return KERN_FAILURE;
  }

  PortToServerMapAdd(port, server);
  PortToServerMapAdd(clientPort, server);
  {
    const std::lock_guard guard(server->lock);
    (*server->clientPorts)[watcher] = port;
    (*server->portSources)[port] = source;
    if (server->observation) server->observation->noteClient(port, auditToken);
  }
  // A source that the loop cannot watch serves nobody: the client is taken out again below, as if
  // its port had died.
  const bool served = source->addTo(platform::RunLoop::Current());
  source.reset();
  watcher->setInvalidationCallback(MachPortInvalidationCallBack);
  if (!served) watcher->invalidate();

  code = KERN_FAILURE;
  if (watcher->isValid()) {
    code = KERN_SUCCESS;
    privatePort = port;
  }
  const std::lock_guard guard(server->lock);
  // Kept: also when the client is gone already and its removal has armed the timer.
  HelperServerCancelIdleTimer(server);
  return code;
}

void MachPortInvalidationCallBack(PortWatcher* watcher, void* context) {
  auto* server = static_cast<HelperServer*>(context);
  if (!server) server = HelperServerForPort(watcher->port());
  if (!server) {
    __assert_fail("server", "Helper/Shared/Server/HelperServerUtils", 310,
                  "MachPortInvalidationCallBack");
  }
  const std::lock_guard guard(server->lock);
  const auto client = server->clientPorts->find(watcher->shared_from_this());
  const PortName privatePort = client == server->clientPorts->end() ? kPortNull : client->second;
  HelperServerRemoveClient(watcher->shared_from_this(), privatePort, server);
  if (server->busyMask == 0 && server->clientPorts->empty()) HelperServerArmIdleTimer(server);
}

void HelperServerRemoveClient(const std::shared_ptr<PortWatcher>& watcher, PortName privatePort,
                              HelperServer* server) {
  if (watcher) {
    watcher->setInvalidationCallback(nullptr);
    const PortName clientPort = watcher->port();
    watcher->invalidate();
    PortToServerMapRemove(clientPort);
    platform::PortDeallocate(clientPort);
  }
  server->clientPorts->erase(watcher);
  if (const auto source = server->portSources->find(privatePort);
      source != server->portSources->end()) {
    source->second->invalidate();
    server->portSources->erase(source);
  }
  if (privatePort == kPortNull || privatePort == kPortDead) return;
  if (server->observation) server->observation->forgetClient(privatePort);
  PortToServerMapRemove(privatePort);
  platform::PortDropReceiveRight(privatePort);
  platform::PortDeallocate(privatePort);
}
