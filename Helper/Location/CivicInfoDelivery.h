// SPDX-License-Identifier: Apache-2.0
//
// Hands the civic info of the handset's location to the telephony daemon, over a connection of its
// own each time. Main thread, which waits for the daemon's answer meanwhile. No state.
#pragma once

#include <optional>
#include <string>

#include "Helper/Platform/String.h"
#include "Helper/Platform/TelephonyConnection.h"

/// Delivers the four texts, UTF-8 each and possibly empty; one that is not valid UTF-8 is delivered
/// as null. Reports what came of it in the system log only: nothing is tried again.
void SendCivicInfoToTelephony(const std::string& country, const std::string& state,
                              const std::string& city, const std::string& postalCode);

/// The notification callback of the connection: one notice line.
void ServerConnectionCallback(platform::TelephonyConnection* connection, void* context);

/// The platform string of UTF-8 `text`, retained for the caller; null when it is not valid.
[[nodiscard]] std::optional<platform::String> StringToPlatformString(const std::string& text);
