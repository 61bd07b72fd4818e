// SPDX-License-Identifier: Apache-2.0
//
// The values of the exported constants.
#include "Helper/Platform/BundleIdentifiers.h"

using platform::String;

extern "C" {

constinit const String kCarrierBundleId("com.zarvo.carrier");
constinit const String kOperatorBundleId("com.zarvo.operator");
constinit const String kBootstrapBundleId("com.zarvo.carrier.bootstrap");
constinit const String kDefaultBundleId("com.zarvo.carrier.default");

const char* const kPlistExtension = ".plist";
const char* const kUserCBDir = "/Library/Carrier Bundles/";

constinit const String kVLPostponementInfoICCID("IntegratedCircuitCardIdentity");
constinit const String kVLPostponementInfoIMSI("InternationalMobileSubscriberIdentity");
constinit const String kVLPostponementInfoCarrierID("CarrierID");

}  // extern "C"
