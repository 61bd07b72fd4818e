// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/TelephonyConnection.h"

using platform::Shared;
using platform::TelephonyFramework;

void _VLServerConnectionAddIdentifierException(const platform::String& identifier) {
  Shared<TelephonyFramework>().addIdentifierException(identifier);
}

std::unique_ptr<platform::TelephonyConnection> _VLServerConnectionCreate(
    platform::Allocator& /*allocator*/, platform::TelephonyNotificationCallback callback,
    void* context) {
  return Shared<TelephonyFramework>().createConnection(callback, context);
}

platform::TelephonyResult _VLServerConnectionSetCivicInfoBasedOnCurrentLocation(
    platform::TelephonyConnection& connection, const std::optional<platform::String>& country,
    const std::optional<platform::String>& state, const std::optional<platform::String>& city,
    const std::optional<platform::String>& postalCode) {
  return connection.setCivicInfo({country, state, city, postalCode});
}
