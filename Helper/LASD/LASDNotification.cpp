// SPDX-License-Identifier: Apache-2.0
#include "Helper/LASD/LASDNotification.h"

#include <utility>

#include "Helper/Platform/MessagePort.h"

using platform::PropertyList;

namespace {

const char* NameOf(LASDNotificationKind kind) {
  switch (kind) {
    case LASDNotificationKind::kUpdateAvailable:
      return kLASDUpdateAvailable;
    case LASDNotificationKind::kNoUpdateRequired:
      return kLASDNoUpdateRequired;
    case LASDNotificationKind::kUpdateFailed:
      break;
  }
  return kLASDUpdateFailed;
}

}  // namespace

PropertyList makeNotification(LASDNotificationKind kind, LASDDatabaseType type) {
  PropertyList::Dictionary notification;
  notification.set(kLASDNotificationKey, NameOf(kind));
  // Kept: a failure does not say which database it was about.
  if (kind == LASDNotificationKind::kUpdateAvailable) {
    notification.set(kLASDTypeKey, typeName(type));
  }
  return notification;
}

void sendNotification(const PropertyList& notification) {
  const auto payload = platform::SerializeBinary(notification);
  const auto remote =
      platform::Shared<platform::MessagePorts>().createRemote(kLASDNotificationPort);
  if (!payload || !remote) return;
  // The daemon that misses a notification finds the outcome in files and preferences.
  (void)remote->sendRequest(kLASDNotificationId, *payload);
}
