// SPDX-License-Identifier: Apache-2.0
#include "Helper/Shared/Server/RequestCatalogue.h"

#include <array>

#include "Helper/Shared/Interface/Requests.h"
#include "Helper/Shared/Server/Stub.h"

namespace {

template <class... Rows>
struct Catalogue {
  static constexpr std::array kIds{Rows::kId...};
  static constexpr std::array kDescriptors{Rows::kDescriptor...};

  static constexpr bool IdsAreConsecutive() {
    for (std::size_t index = 0; index < kIds.size(); ++index) {
      if (kIds[index] != requests::kFirstId + static_cast<std::int32_t>(index)) return false;
    }
    return true;
  }
};

// clang-format off
using RequestRoutines = Catalogue<
    Serve<requests::SetVoicemailToken,              server_HvMobileHelperSetVoicemailToken>,
    Serve<requests::SetVoicemailTokenForKey,        server_HvMobileHelperSetVoicemailTokenForKey>,
    Serve<requests::ClearVoicemailToken,            server_HvMobileHelperClearVoicemailToken>,
    Serve<requests::ResetVoicemailRecords,          server_HvMobileHelperResetVoicemailRecords>,
    Serve<requests::CopyVoicemailTokenForKey,       server_HvMobileHelperCopyVoicemailTokenForKey>,
    Serve<requests::CopyVoicemailToken,             server_HvMobileHelperCopyVoicemailToken>,
    Serve<requests::SetPreferenceValue,             server_HvMobileHelperSetPreferenceValue>,
    Serve<requests::CopyPreferenceValue,            server_HvMobileHelperCopyPreferenceValue>,
    Serve<requests::CopyAppPreferenceValue,         server_HvMobileHelperCopyAppPreferenceValue>,
    Serve<requests::SetCarrierBundleLink,           server_HvMobileHelperSetCarrierBundleLink>,
    Serve<requests::CreateSymlink,                  server_HvMobileHelperCreateSymlink>,
    Serve<requests::RemoveCarrierBundleLink,        server_HvMobileHelperRemoveCarrierBundleLink>,
    Serve<requests::IsVoicemailSubscribed,          server_HvMobileHelperIsVoicemailSubscribed>,
    Serve<requests::TriggerHeartbeat,               server_HvMobileHelperTriggerHeartbeat>,
    Serve<requests::TriggerDatabaseUpdate,          server_HvMobileHelperTriggerDatabaseUpdate, RelyOnPreparedNdr>,
    Serve<requests::CopyFile,                       server_HvMobileHelperCopyFile>,
    Serve<requests::CopyCrashLogs,                  server_HvMobileHelperCopyCrashLogs>,
    Serve<requests::MoveCarrierBundles,             server_HvMobileHelperMoveCarrierBundles>,
    Serve<requests::RequestCountryCodeFromLocation, server_HvMobileHelperRequestCountryCodeFromLocation>,
    Serve<requests::CopyCountryCode,                server_HvMobileHelperCopyCountryCode>,
    Serve<requests::SetRadioManagerLogging,         server_HvMobileHelperSetRadioManagerLogging>,
    Serve<requests::ExtractArchive,                 server_HvMobileHelperExtractArchive>,
    Serve<requests::CopyPropertyListFile,           server_HvMobileHelperCopyPropertyListFile>>;
// clang-format on

constexpr auto kRequestRoutines = RequestRoutines::kDescriptors;
static_assert(kRequestRoutines.size() == 23 && RequestRoutines::IdsAreConsecutive());

platform::MigStub Demultiplex(const wire::MessageHeader& request) {
  const std::int64_t index = std::int64_t{request.id} - requests::kFirstId;
  if (index < 0 || index > 22) return nullptr;
  return kRequestRoutines[static_cast<std::size_t>(index)].stub;
}

}  // namespace

const platform::MigSubsystem& RequestSubsystem() {
  static constexpr platform::MigSubsystem kSubsystem{.demultiplex = Demultiplex,
                                                     .startId = requests::kFirstId,
                                                     .endId = requests::kEndId,
                                                     .maxReplySize = 292,
                                                     .routines = kRequestRoutines};
  return kSubsystem;
}
