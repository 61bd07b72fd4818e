// SPDX-License-Identifier: Apache-2.0
//
// Names of carrier bundles and of what is said about a postponed voicemail. Constants, exported as
// symbols of the program; no thread, no state.
#pragma once

#include "Helper/Platform/String.h"

extern "C" {

/// Identifiers of carrier bundles, which are also the names of their preference files without
/// kPlistExtension.
extern const platform::String kCarrierBundleId;
extern const platform::String kOperatorBundleId;
extern const platform::String kBootstrapBundleId;
extern const platform::String kDefaultBundleId;

/// What a property-list file's name ends with.
extern const char* const kPlistExtension;
/// Where the user's carrier bundles are, below the home directory, with its last slash.
extern const char* const kUserCBDir;

/// Keys of the dictionary that names a postponed voicemail's card, subscriber and carrier. Nothing
/// in this program reads them: they are here for what is loaded into it.
extern const platform::String kVLPostponementInfoICCID;
extern const platform::String kVLPostponementInfoIMSI;
extern const platform::String kVLPostponementInfoCarrierID;

}  // extern "C"
