// SPDX-License-Identifier: Apache-2.0
//
// The updater's creation and the course of one check.
#include "Helper/LASD/LASDUpdater.h"

#include <utility>

#include "Helper/LASD/LASDNotification.h"
#include "Helper/Platform/SystemLog.h"

using platform::Log;
using platform::LogPriority;

const char* const kLASDManifestURL = "https://" HALVEC_MANIFEST_HOST "/1/v3/lasd.plist";

const std::shared_ptr<LASDUpdater> lasdUpdater = LASDUpdater::make_shared_ptr(new LASDUpdater);

LASDUpdater::LASDUpdater(std::string directory)
    : SharedSynchronizable("LASDUpdater"), directory_(std::move(directory)) {}

void LASDUpdater::checkForUpdates(HelperServer* server, std::uint32_t mask) {
  Log(LogPriority::kNotice, "Trying to see if update available for mask %x", mask);
  const std::uint32_t token = HelperServerAcquireWorkToken(server);
  post([this, server, mask, token] {
    runCycle(server, mask);
    // Last of all, so that the helper stays until the outcome has been told. Refused, harmlessly,
    // where there was no server to take a token of.
    (void)HelperServerReleaseWorkToken(server, token);
  });
}

void LASDUpdater::runCycle(HelperServer* server, std::uint32_t mask) {
  (void)loadVersions(kLASDDomain, /*isLocal=*/true, mask);  // a local read answers 0 always
  const std::uint32_t outdated = loadVersions(kLASDManifestURL, /*isLocal=*/false, mask);
  if (outdated == kFetchFailed) {
    sendNotification(makeNotification(LASDNotificationKind::kUpdateFailed));
    return;
  }
  if (outdated == 0) {
    Log(LogPriority::kNotice, "No update required for any databases\n");
    sendNotification(makeNotification(LASDNotificationKind::kNoUpdateRequired));
    return;
  }
  for (const LASDDatabaseType type : kLASDTypesInOrder) {
    if ((outdated & BitOf(type)) == 0) continue;
    const std::uint32_t token = HelperServerAcquireWorkToken(server);
    updateDatabase(type);
    (void)HelperServerReleaseWorkToken(server, token);
  }
}
