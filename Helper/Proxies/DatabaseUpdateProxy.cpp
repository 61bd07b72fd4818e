// SPDX-License-Identifier: Apache-2.0
//
// Hands a check for LASD databases to the updater. Main thread; no state of its own. The
// entitlement checked at connect is the only guard: a mask can name nothing outside the five types.
#include "Helper/LASD/LASDUpdater.h"
#include "Helper/Shared/Server/RequestRoutines.h"

KernReturn server_HvMobileHelperTriggerDatabaseUpdate(PortName port, std::uint32_t types) {
  // A port without a server is passed on as it is; the reply does not wait for the check.
  lasdUpdater->checkForUpdates(HelperServerForPort(port), types);
  return KERN_SUCCESS;
}
