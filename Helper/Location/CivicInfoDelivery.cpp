// SPDX-License-Identifier: Apache-2.0
#include "Helper/Location/CivicInfoDelivery.h"

#include "Helper/Platform/SystemLog.h"
#include "Helper/Platform/vlu/ConvertCopy.h"

using platform::Log;
using platform::LogPriority;

void SendCivicInfoToTelephony(const std::string& country, const std::string& state,
                              const std::string& city, const std::string& postalCode) {
  _VLServerConnectionAddIdentifierException(platform::String("HalvecMobileHelper"));
  auto connection =
      _VLServerConnectionCreate(platform::DefaultAllocator(), ServerConnectionCallback, nullptr);
  if (!connection) {
    Log(LogPriority::kError,
        "sendCivicInfoToVL to Halvec failed, could not open VLServerConnection");
    return;
  }
  const std::optional<platform::String> countryString = StringToPlatformString(country);
  const std::optional<platform::String> stateString = StringToPlatformString(state);
  const std::optional<platform::String> cityString = StringToPlatformString(city);
  const std::optional<platform::String> postalCodeString = StringToPlatformString(postalCode);
  const platform::TelephonyResult result = _VLServerConnectionSetCivicInfoBasedOnCurrentLocation(
      *connection, countryString, stateString, cityString, postalCodeString);
  if (result.errorCode != 0) {
    Log(LogPriority::kNotice, "sendCivicInfoToVL failed civic info to Halvec due to error: %d",
        result.errorCode);
  } else {
    Log(LogPriority::kNotice, "sendCivicInfoToVL sent civic info to Halvec successfully");
  }
  connection.reset();  // before the four texts go
}

void ServerConnectionCallback(platform::TelephonyConnection* /*connection*/, void* /*context*/) {
  Log(LogPriority::kNotice, "_ServerConnectionCallback for HalvecMobileHelper");
}

std::optional<platform::String> StringToPlatformString(const std::string& text) {
  return vlu::cf::convert_copy(text, platform::StringEncoding::kUtf8);
}
