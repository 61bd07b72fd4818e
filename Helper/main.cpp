// SPDX-License-Identifier: Apache-2.0
//
// The entry point: forget the environment, confine the process, create the server, run it, destroy
// it.
#include "Helper/Platform/Confinement.h"
#include "Helper/Platform/Environment.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Shared/Interface/Connect.h"
#include "Helper/Shared/Server/HelperServerUtils.h"
#include "Helper/Shared/Server/RequestCatalogue.h"

int main() {
  platform::ForgetEnvironment();
  if constexpr (HALVEC_CONFINE) platform::Confine();
  HelperServer* server = HelperServerCreate(wire::kServiceName, &RequestSubsystem());
  if (!server) {
    platform::Log(platform::LogPriority::kError, "unable to startup HalvecMobileHelper server\n");
    return 1;
  }
  (void)HelperServerRun(server);  // whatever ended the last run, the stop flag ended them all
  HelperServerDestroy(server);
  return 0;
}
