// SPDX-License-Identifier: Apache-2.0
#include "Helper/Shared/Server/CallerEntitlement.h"

#include <cstdlib>
#include <map>
#include <memory>
#include <mutex>

#include "Helper/Platform/CallerSecurity.h"
#include "Helper/Platform/ProcessExit.h"

namespace {

using platform::ProcessExitSource;

/// A granted entitlement, and which of the processes that had this id in turn it was granted to:
/// where a watcher could not be made, a later process with the same id still does not inherit it.
struct Grant {
  std::string entitlementName;
  std::uint32_t processVersion;
};

using EntitlementCache = std::multimap<std::int32_t, Grant>;
using ProcessExitWatchers = std::map<std::int32_t, std::shared_ptr<ProcessExitSource>>;

struct Tables {
  EntitlementCache cache;
  ProcessExitWatchers watchers;
};

std::mutex registryMutex;
std::unique_ptr<Tables> tables;  // guarded by registryMutex; null before first use and after exit

void InitializeOnce() {
  static std::once_flag once;
  std::call_once(once, [] {
    const std::lock_guard guard(registryMutex);
    tables = std::make_unique<Tables>();
    // Without room for one more handler the tables live until the process is gone.
    (void)std::atexit(ReleaseEntitlementRegistry);
  });
}

bool IsCached(const std::string& entitlementName, std::int32_t process, std::uint32_t version) {
  const std::lock_guard guard(registryMutex);
  if (!tables) return false;
  const auto [first, last] = tables->cache.equal_range(process);
  for (auto entry = first; entry != last; ++entry) {
    if (entry->second.processVersion == version &&
        entry->second.entitlementName == entitlementName) {
      return true;
    }
  }
  return false;
}

std::shared_ptr<ProcessExitSource> WatchProcess(std::int32_t process, std::uint32_t version) {
  auto source = ProcessExitSource::Create(process, version);
  if (!source) return nullptr;
  source->setEventHandler([process] { HandleProcessExit(process); });
  // The source keeps itself until its cancellation has been carried out.
  source->setCancelHandler([extraReference = source] {});
  source->resume();
  return source;
}

void Remember(const std::string& entitlementName, std::int32_t process, std::uint32_t version) {
  const std::lock_guard guard(registryMutex);
  if (!tables) return;
  if (!tables->watchers.contains(process)) {
    if (auto source = WatchProcess(process, version)) {
      tables->watchers.emplace(process, std::move(source));
    }
  }
  tables->cache.emplace(process, Grant{entitlementName, version});
}

}  // namespace

bool CallerHasEntitlement(const std::string& entitlementName, const wire::AuditToken& auditToken) {
  InitializeOnce();
  const std::int32_t process = platform::AuditTokenProcess(auditToken);
  const std::uint32_t version = platform::AuditTokenProcessVersion(auditToken);
  if (IsCached(entitlementName, process, version)) return true;

  const auto task = platform::Shared<platform::CallerSecurity>().createTask(auditToken);
  if (!task) return false;
  const platform::EntitlementAnswer answer = task->copyValueForEntitlement(entitlementName);
  // Only the boolean true counts: a text that reads true, or the number 1, is a mistake in
  // somebody's property list and no grant.
  if (answer.error || !answer.value || answer.value->boolean() != true) return false;
  Remember(entitlementName, process, version);
  return true;
}

void HandleProcessExit(std::int32_t process) {
  const std::lock_guard guard(registryMutex);
  if (!tables) return;
  tables->cache.erase(process);
  const auto watcher = tables->watchers.find(process);
  if (watcher == tables->watchers.end()) return;
  watcher->second->cancel();
  tables->watchers.erase(watcher);
}

void ReleaseEntitlementRegistry() {
  const std::lock_guard guard(registryMutex);
  if (!tables) return;
  for (const auto& [process, source] : tables->watchers) source->cancel();
  tables.reset();
}

EntitlementRegistrySize GetEntitlementRegistrySize() {
  const std::lock_guard guard(registryMutex);
  if (!tables) return {};
  return {.grants = tables->cache.size(), .watchers = tables->watchers.size()};
}
