// SPDX-License-Identifier: Apache-2.0
#include "Helper/Shared/Server/PortToServerMap.h"

#include <cstdlib>

namespace {

std::mutex mapMutex;
std::unordered_map<PortName, HelperServer*>* map = nullptr;  // guarded by mapMutex

void ReleaseMap() {
  const std::lock_guard guard(mapMutex);
  delete map;
  map = nullptr;
}

}  // namespace

void PortToServerMapInitialize() {
  static std::once_flag once;
  std::call_once(once, [] {
    const std::lock_guard guard(mapMutex);
    map = new std::unordered_map<PortName, HelperServer*>;
    // Without room for one more handler the map lives until the process is gone: nothing is lost.
    (void)std::atexit(ReleaseMap);
  });
}

void PortToServerMapAdd(PortName port, HelperServer* server) {
  const std::lock_guard guard(mapMutex);
  if (map) map->insert_or_assign(port, server);
}

void PortToServerMapRemove(PortName port) {
  const std::lock_guard guard(mapMutex);
  if (map) map->erase(port);
}

HelperServer* HelperServerForPort(PortName port) {
  const std::lock_guard guard(mapMutex);
  if (!map) return nullptr;
  const auto found = map->find(port);
  return found == map->end() ? nullptr : found->second;
}
