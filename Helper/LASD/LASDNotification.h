// SPDX-License-Identifier: Apache-2.0
//
// What the telephony daemon is told about checks and installs: one-way messages to its port
// "com.zarvo.Halvec.lasd", message id 0, the payload a binary property list. On the updater's
// queue; no state, no lock.
#pragma once

#include <cstdint>

#include "Helper/Platform/PropertyList.h"
#include "Helper/Shared/Interface/LASD.h"

enum class LASDNotificationKind : std::uint32_t {
  kUpdateAvailable = 0,   // a database was installed and recorded
  kNoUpdateRequired = 1,  // a whole check found nothing to do
  kUpdateFailed = 2,      // the manifest could not be fetched, or one install failed
};

/// The dictionary that tells of `kind`: "Notification" with the event's name and, for
/// kUpdateAvailable alone, "DBType" with the text of `type`.
[[nodiscard]] platform::PropertyList makeNotification(LASDNotificationKind kind,
                                                      LASDDatabaseType type = {});

/// Sends the dictionary. Never waits; nobody learns whether it arrived.
void sendNotification(const platform::PropertyList& notification);
