// SPDX-License-Identifier: Apache-2.0
#include "Tools/halvecctl/LocationRequests.h"

#include <cstdio>
#include <optional>
#include <string>
#include <vector>

#include "Helper/Shared/Interface/Requests.h"
#include "Helper/Shared/Interface/TelephonyConnection.h"
#include "Tools/halvecctl/CivicInfoListener.h"
#include "Tools/halvecctl/Command.h"
#include "Tools/halvecctl/Input.h"
#include "Tools/halvecctl/Json.h"

namespace halvecctl {
namespace {

/// The helper delivers after five seconds at the latest, and a busy machine may take its time.
constexpr std::chrono::seconds kDeliveryLimit{15};

void PrintText(const CivicInfo& info) {
  constexpr std::array kLabels{"country:", "state:", "city:", "postal code:"};
  for (std::size_t index = 0; index < info.size(); ++index) {
    std::printf("%-13s%s\n", kLabels[index], Shown(info[index].value_or("(null)")).c_str());
  }
}

void PrintJson(const CivicInfo& info) {
  std::string text;
  for (std::size_t index = 0; index < info.size(); ++index) {
    text += (index == 0 ? "{" : ",") + JsonString(wire::kCivicInfoKeys[index]) + ":" +
            (info[index] ? JsonString(*info[index]) : "null");
  }
  std::printf("%s}\n", text.c_str());
}

}  // namespace

ExitCode RunResolve(const GlobalOptions& options, Words words) {
  const bool wait = words.takeOption("--wait");
  const std::vector<std::string> texts = words.takeAll(2, "LATITUDE LONGITUDE");
  const double latitude = ParseReal(texts[0]);
  const double longitude = ParseReal(texts[1]);
  std::optional<CivicInfoListener> listener;
  if (wait) listener.emplace(options.client.servicePath);
  halvec::HelperClient client = Connect(options);
  const auto done = client.call<requests::RequestCountryCodeFromLocation>(latitude, longitude);
  if (!done) throw RequestFailure(done.error());
  if (!listener) return ExitCode::kDone;
  // The client stays connected meanwhile: the look-up alone does not keep the helper running.
  const CivicInfo info =
      listener->take(client.descriptor(), std::chrono::steady_clock::now() + kDeliveryLimit);
  options.json ? PrintJson(info) : PrintText(info);
  return ExitCode::kDone;
}

ExitCode RunCountry(const GlobalOptions& options, Words words) {
  (void)words.takeAll(0, "");
  halvec::HelperClient client = Connect(options);
  const halvec::Result<std::string> code = client.call<requests::CopyCountryCode>();
  if (!code) throw RequestFailure(code.error());
  const bool known = !(*code).empty();
  if (options.json) {
    std::printf("{\"countryCode\":%s}\n", known ? JsonString(*code).c_str() : "null");
  } else if (known) {
    std::printf("%s\n", Shown(*code).c_str());
  }
  return known ? ExitCode::kDone : ExitCode::kAbsent;
}

}  // namespace halvecctl
