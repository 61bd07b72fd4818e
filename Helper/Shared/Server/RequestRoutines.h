// SPDX-License-Identifier: Apache-2.0
//
// The 23 request routines, as the catalogue calls them: the port on which the request arrived, the
// request's fields, the reply's fields. Main thread. Each is defined where its work is done. Texts
// point into the request and may lack their zero: read them with view().
#pragma once

#include <cstdint>

#include "Helper/Shared/Interface/Request.h"

namespace wire {
/// An address in the helper's own address space, 64 bits wide in every message.
using Address = std::uint64_t;
}  // namespace wire

KernReturn server_HvMobileHelperSetVoicemailToken(PortName port, wire::Text<256>& token);
KernReturn server_HvMobileHelperSetVoicemailTokenForKey(PortName port, wire::Text<256>& key,
                                                        wire::Text<256>& token);
KernReturn server_HvMobileHelperClearVoicemailToken(PortName port);
KernReturn server_HvMobileHelperResetVoicemailRecords(PortName port);
KernReturn server_HvMobileHelperCopyVoicemailTokenForKey(PortName port, wire::Text<256>& key,
                                                         wire::Text<256>& token);
KernReturn server_HvMobileHelperCopyVoicemailToken(PortName port, wire::Text<256>& token);

KernReturn server_HvMobileHelperSetPreferenceValue(PortName port, wire::Text<256>& domain,
                                                   wire::Text<256>& key, const std::byte* data,
                                                   std::uint32_t byteCount);
KernReturn server_HvMobileHelperCopyPreferenceValue(PortName port, wire::Text<256>& domain,
                                                    wire::Text<256>& key, wire::Address* address,
                                                    std::uint32_t* byteCount);
KernReturn server_HvMobileHelperCopyAppPreferenceValue(PortName port, wire::Text<256>& domain,
                                                       wire::Text<256>& key, wire::Address* address,
                                                       std::uint32_t* byteCount);

KernReturn server_HvMobileHelperSetCarrierBundleLink(PortName port, wire::Text<1024>& target,
                                                     wire::Text<1024>& linkPath,
                                                     wire::Text<1024>& domain);
KernReturn server_HvMobileHelperCreateSymlink(PortName port, wire::Text<1024>& target,
                                              wire::Text<1024>& linkPath);
KernReturn server_HvMobileHelperRemoveCarrierBundleLink(PortName port, wire::Text<1024>& linkPath,
                                                        wire::Text<1024>& domain);

KernReturn server_HvMobileHelperIsVoicemailSubscribed(PortName port, wire::Flag& subscribed);
KernReturn server_HvMobileHelperTriggerHeartbeat(PortName port, std::int32_t enable);
KernReturn server_HvMobileHelperTriggerDatabaseUpdate(PortName port, std::uint32_t types);

KernReturn server_HvMobileHelperCopyFile(PortName port, wire::Text<256>& sourceDirectory,
                                         wire::Text<256>& destinationDirectory,
                                         wire::Text<256>& fileName, wire::Flag& success);
KernReturn server_HvMobileHelperCopyCrashLogs(PortName port, wire::Text<256>& sourcePath,
                                              wire::Flag& success);
KernReturn server_HvMobileHelperMoveCarrierBundles(PortName port, wire::Text<256>& sourcePath,
                                                   wire::Text<256>& destinationDirectory,
                                                   wire::Text<256>& name, wire::Flag& success);

KernReturn server_HvMobileHelperRequestCountryCodeFromLocation(PortName port, double latitude,
                                                               double longitude);
KernReturn server_HvMobileHelperCopyCountryCode(PortName port, wire::Text<64>& countryCode);
KernReturn server_HvMobileHelperSetRadioManagerLogging(PortName port, std::int32_t enable);

KernReturn server_HvMobileHelperExtractArchive(PortName port, wire::Text<256>& sourcePath,
                                               wire::Text<256>& destinationPath,
                                               wire::Flag& success);
KernReturn server_HvMobileHelperCopyPropertyListFile(PortName port, wire::Text<256>& path,
                                                     wire::Address* address,
                                                     std::uint32_t* byteCount);
