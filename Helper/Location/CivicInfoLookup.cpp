// SPDX-License-Identifier: Apache-2.0
#include "Helper/Location/CivicInfoLookup.h"

#include <optional>

#include "Helper/Location/CivicInfoDelivery.h"
#include "Helper/Platform/MainQueue.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Shared/Server/RequestRoutines.h"

using platform::Log;
using platform::LogPriority;
using platform::Shared;
using platform::StructuredAddress;

std::uint8_t waitingForGeocode = 0;

namespace {

constexpr auto kFallbackDelay = std::chrono::nanoseconds(5'000'000'000);

/// The parts of the first item's address; null, with the line that says why, without them.
const StructuredAddress* FirstStructuredAddress(const platform::MapItems* mapItems,
                                                const platform::MapError* error) {
  if (error) {
    Log(LogPriority::kError, "_RequestCivicInfoFromLatitudeLongitude error: (%s)",
        error->description.c_str());
  }
  if (error || !mapItems || mapItems->empty()) {
    Log(LogPriority::kError, "_RequestCivicInfoFromLatitudeLongitude didn't get any mapItems\n");
    return nullptr;
  }
  Log(LogPriority::kNotice, "_RequestCivicInfoFromLatitudeLongitude mapItems: (%lu)",
      mapItems->size());
  const platform::MapItem* item = mapItems->front().get();
  if (!item || !item->isValid()) {
    Log(LogPriority::kError, "_RequestCivicInfoLatitudeLongitude NULL mapItem \n");
    return nullptr;
  }
  const platform::MapAddress* address = item->address();
  if (!address || !address->structured) {
    Log(LogPriority::kError,
        "_RequestCivicInfoLatitudeLongitude mapItem didn't get a structured address");
    return nullptr;
  }
  return address->structured.get();
}

/// Takes over the parts that `address` has.
void ReadAddress(const StructuredAddress& address, CivicInfo& civicInfo) {
  if (address.countryCode) {
    Log(LogPriority::kNotice, "_RequestCivicInfoFromLatitudeLongitude country code: %s",
        address.countryCode->c_str());
    civicInfo.countryCode = *address.countryCode;
  }
  if (address.administrativeArea) {
    Log(LogPriority::kNotice, "_RequestCivicInfoFromLatitudeLongitude state: %s",
        address.administrativeArea->c_str());
    civicInfo.state = *address.administrativeArea;
  }
  if (address.locality) {
    Log(LogPriority::kNotice, "_RequestCivicInfoFromLatitudeLongitude city: %s",
        address.locality->c_str());
    civicInfo.city = *address.locality;
  }
  if (address.postCode) {
    Log(LogPriority::kNotice, "_RequestCivicInfoFromLatitudeLongitude postal code: %s",
        address.postCode->c_str());
    civicInfo.postalCode = *address.postCode;
  }
}

}  // namespace

void RequestCivicInfoFromLatitudeLongitude(double latitude, double longitude) {
  const auto civicInfo = std::make_shared<CivicInfo>();
  // Kept: (0, 0) stands for a handset that does not know where it is, -0.0 included.
  if (latitude == 0.0 && longitude == 0.0) {
    platform::PostToMainQueue(SendCountryOnlyCivicInfo);
    return;
  }
  const auto ticket = Shared<platform::MapService>().reverseGeocodeTicket(
      {.latitude = latitude, .longitude = longitude},
      {.includesEstimatedTimeOfArrival = false, .allowsLocationShift = true, .traits = nullptr});
  waitingForGeocode = 1;
  platform::PostToMainQueueAfter(kFallbackDelay, CivicInfoTimeout);
  ticket->submit(
      [civicInfo](const platform::MapItems* mapItems, const platform::MapError* error) {
        CivicInfoCompletion(civicInfo, mapItems, error);
      },
      nullptr);
}

void CivicInfoCompletion(const std::shared_ptr<CivicInfo>& civicInfo,
                         const platform::MapItems* mapItems, const platform::MapError* error) {
  if ((waitingForGeocode & 1U) == 0) {
    Log(LogPriority::kError,
        "_RequestCivicInfoFromLatitudeLongitude wasn't waiting for response from GEO");
    return;
  }
  waitingForGeocode = 0;
  if (const StructuredAddress* address = FirstStructuredAddress(mapItems, error)) {
    ReadAddress(*address, *civicInfo);
  }
  if (civicInfo->countryCode.empty()) civicInfo->countryCode = CopyConfiguredCountryCode();
  SendCivicInfoToTelephony(civicInfo->countryCode, civicInfo->state, civicInfo->city,
                           civicInfo->postalCode);
}

void CivicInfoTimeout() {
  if (waitingForGeocode != 1) return;
  waitingForGeocode = 0;
  SendCountryOnlyCivicInfo();
}

void SendCountryOnlyCivicInfo() {
  SendCivicInfoToTelephony(CopyConfiguredCountryCode(), "", "", "");
}

std::string CopyConfiguredCountryCode() {
  std::optional<std::string> code = Shared<platform::CountryConfiguration>().countryCode();
  if (!code) {
    Log(LogPriority::kError, "Didn't get valid country code from Mapsvc.\n");
    return {};
  }
  return *std::move(code);
}

// Anybody who was let in may ask where a coordinate is: the answer goes to the telephony daemon.
KernReturn server_HvMobileHelperRequestCountryCodeFromLocation(PortName /*port*/, double latitude,
                                                               double longitude) {
  Log(LogPriority::kError, "server_HvMobileHelperRequestCountryCodeFromLocation \n");
  RequestCivicInfoFromLatitudeLongitude(latitude, longitude);
  return KERN_SUCCESS;
}

// The country that the handset is set up for is no secret from whoever was let in.
KernReturn server_HvMobileHelperCopyCountryCode(PortName /*port*/, wire::Text<64>& countryCode) {
  const std::string code = CopyConfiguredCountryCode();
  // Kept: a text that fills the field has no terminating zero.
  countryCode.bytes.fill('\0');
  (void)code.copy(countryCode.bytes.data(), countryCode.bytes.size());  // as much as fits
  return KERN_SUCCESS;
}
