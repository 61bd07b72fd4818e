// SPDX-License-Identifier: Apache-2.0
//
// The requests that come to one call each. Main thread; the only state is the subscription
// function, found once. Always successful: what becomes of the call is not the caller's to know.
// The entitlement checked at connect is the only guard.
#include "Helper/Proxies/OneCallServices.h"

#include <bit>
#include <cstring>
#include <memory>
#include <span>

#include "Helper/Heartbeat/Heartbeat.h"
#include "Helper/Platform/MessagePort.h"
#include "Helper/Platform/SharedLibrary.h"
#include "Helper/Platform/SystemLog.h"
#include "Helper/Shared/Server/HelperServerUtils.h"
#include "Helper/Shared/Server/RequestRoutines.h"

using platform::Log;
using platform::LogPriority;

namespace {

constexpr const char* kRadioManagerPort = "com.zarvo.radio-manager";
constexpr std::int32_t kSetLogToFileMessage = 1;

}  // namespace

VoicemailSubscriptionFunction* LoadVoicemailSubscriptionFunction() {
  platform::SharedLibrary library(HALVEC_VOICEMAIL_LIBRARY);
  VoicemailSubscriptionFunction* function = nullptr;
  library.bind(function, HALVEC_VOICEMAIL_SYMBOL);
  return function;
}

std::uint8_t IsVoicemailServiceSubscribed() {
  static VoicemailSubscriptionFunction* const function = LoadVoicemailSubscriptionFunction();
  return function ? function() : 0;
}

void SetRadioManagerLogToFile(bool enabled) {
  const std::unique_ptr<platform::RemoteMessagePort> port =
      platform::Shared<platform::MessagePorts>().createRemote(kRadioManagerPort);
  if (!port) return;
  const std::uint32_t payload = enabled ? 1 : 0;
  (void)port->sendRequest(kSetLogToFileMessage, std::as_bytes(std::span(&payload, 1)));
}

KernReturn server_HvMobileHelperIsVoicemailSubscribed(PortName /*port*/, wire::Flag& subscribed) {
  // Kept: only the field's lowest byte is written; the prepared reply holds zeros in the others.
  static_assert(std::endian::native == std::endian::little);
  const std::uint8_t answer = IsVoicemailServiceSubscribed();
  std::memcpy(&subscribed.value, &answer, sizeof answer);
  return KERN_SUCCESS;
}

KernReturn server_HvMobileHelperTriggerHeartbeat(PortName port, std::int32_t enable) {
  HeartbeatSetEnabled(HelperServerForPort(port), enable);
  return KERN_SUCCESS;
}

KernReturn server_HvMobileHelperSetRadioManagerLogging(PortName /*port*/, std::int32_t enable) {
  SetRadioManagerLogToFile(enable != 0);
  Log(LogPriority::kError, "Enabling wireless radio manager logs: %d", enable);
  return KERN_SUCCESS;
}
