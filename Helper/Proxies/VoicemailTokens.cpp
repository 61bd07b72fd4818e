// SPDX-License-Identifier: Apache-2.0
//
// Sets, clears and reads voicemail tokens on the telephony daemon's behalf. Main thread; no state
// of its own. The entitlement checked at connect is the only guard. Only a text that is not UTF-8
// fails visibly; what the store could not do, it logs itself.
#include <optional>
#include <string>

#include "Helper/Platform/VoicemailTokenStore.h"
#include "Helper/Proxies/TextField.h"
#include "Helper/Shared/Server/RequestRoutines.h"

namespace {

platform::VoicemailTokenStore& Store() { return platform::Shared<platform::VoicemailTokenStore>(); }

/// Kept: no token, and one too long for the field, both come out as the empty text.
void HandOver(const std::optional<std::string>& token, wire::Text<256>& field) {
  PutText(token ? std::string_view(*token) : std::string_view(), field);
}

}  // namespace

KernReturn server_HvMobileHelperSetVoicemailToken(PortName /*port*/, wire::Text<256>& token) {
  const std::optional<std::string> tokenText = TextOf(token);
  if (!tokenText) return KERN_FAILURE;
  Store().setCurrentToken(tokenText);
  return KERN_SUCCESS;
}

KernReturn server_HvMobileHelperSetVoicemailTokenForKey(PortName /*port*/, wire::Text<256>& key,
                                                        wire::Text<256>& token) {
  const std::optional<std::string> keyText = TextOf(key);
  const std::optional<std::string> tokenText = TextOf(token);
  if (!keyText || !tokenText) return KERN_FAILURE;
  Store().setToken(*keyText, *tokenText);
  return KERN_SUCCESS;
}

KernReturn server_HvMobileHelperClearVoicemailToken(PortName /*port*/) {
  Store().setCurrentToken(std::nullopt);
  return KERN_SUCCESS;
}

KernReturn server_HvMobileHelperResetVoicemailRecords(PortName /*port*/) {
  Store().setCurrentToken(std::nullopt);
  Store().removeAllRecords();
  return KERN_SUCCESS;
}

KernReturn server_HvMobileHelperCopyVoicemailTokenForKey(PortName /*port*/, wire::Text<256>& key,
                                                         wire::Text<256>& token) {
  const std::optional<std::string> keyText = TextOf(key);
  if (!keyText) return KERN_FAILURE;
  HandOver(Store().copyToken(*keyText), token);
  return KERN_SUCCESS;
}

KernReturn server_HvMobileHelperCopyVoicemailToken(PortName /*port*/, wire::Text<256>& token) {
  HandOver(Store().copyCurrentToken(), token);
  return KERN_SUCCESS;
}
