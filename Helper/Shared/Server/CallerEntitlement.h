// SPDX-License-Identifier: Apache-2.0
//
// Decides whether the sender of a message holds an entitlement, and remembers positive answers per
// process until it exits. Asked on the main thread; exits are handled on the global queue. One
// mutex guards both tables and is not held while the system is asked.
#pragma once

#include <cstddef>
#include <string>

#include "Helper/Shared/Interface/Message.h"

/// Whether the process behind `auditToken` holds `entitlementName` with the boolean value true. Any
/// other value, an error, or a process that is gone is a refusal.
[[nodiscard]] bool CallerHasEntitlement(const std::string& entitlementName,
                                        const wire::AuditToken& auditToken);

/// How much the registry remembers: cached grants and watched processes.
struct EntitlementRegistrySize {
  std::size_t grants = 0;
  std::size_t watchers = 0;
};
[[nodiscard]] EntitlementRegistrySize GetEntitlementRegistrySize();

/// Runs when a process has exited: forgets it. Does nothing once the tables are gone.
void HandleProcessExit(std::int32_t process);

/// The at-exit handler: cancels every watcher and takes both tables away for good.
void ReleaseEntitlementRegistry();
