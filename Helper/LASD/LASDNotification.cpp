// SPDX-License-Identifier: Apache-2.0
#include "Helper/LASD/LASDNotification.h"

#include <utility>

#include "Helper/Platform/MessagePort.h"

using platform::PropertyList;

namespace {

constexpr char kPortName[] = "com.zarvo.Halvec.lasd";
constexpr std::int32_t kMessageId = 0;

const char* NameOf(LASDNotificationKind kind) {
  switch (kind) {
    case LASDNotificationKind::kUpdateAvailable:
      return "com.zarvo.lasd.UpdateAvailable";
    case LASDNotificationKind::kNoUpdateRequired:
      return "com.zarvo.lasd.NoUpdateRequired";
    case LASDNotificationKind::kUpdateFailed:
      break;
  }
  return "com.zarvo.lasd.UpdateFailed";
}

}  // namespace

PropertyList makeNotification(LASDNotificationKind kind, LASDDatabaseType type) {
  PropertyList::Dictionary notification;
  notification.set("Notification", NameOf(kind));
  // Kept: a failure does not say which database it was about.
  if (kind == LASDNotificationKind::kUpdateAvailable) notification.set("DBType", typeName(type));
  return notification;
}

void sendNotification(const PropertyList& notification) {
  const auto payload = platform::SerializeBinary(notification);
  const auto remote = platform::Shared<platform::MessagePorts>().createRemote(kPortName);
  if (!payload || !remote) return;
  // The daemon that misses a notification finds the outcome in files and preferences.
  (void)remote->sendRequest(kMessageId, *payload);
}
