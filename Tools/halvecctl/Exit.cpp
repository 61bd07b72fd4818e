// SPDX-License-Identifier: Apache-2.0
//
// From errors of the client library to exit codes.
#include "Tools/halvecctl/Exit.h"

namespace halvecctl {
namespace {

ExitCode CodeOf(const halvec::Error& error) {
  switch (error.status) {
    case HVMH_OK:
      return ExitCode::kDone;
    case HVMH_RETURN_CODE:
      return ExitCode::kFailed;
    case HVMH_NOT_RUNNING:
    case HVMH_ACCESS_DENIED:
      return ExitCode::kNotConnected;
    case HVMH_REFUSED:
      return ExitCode::kRefused;
    case HVMH_TIMED_OUT:
    case HVMH_HELPER_GONE:
    case HVMH_NOT_CONNECTED:
    case HVMH_PROTOCOL_VIOLATION:
      return ExitCode::kLost;
    case HVMH_TOO_LARGE:
    case HVMH_INVALID_ARGUMENT:
      return ExitCode::kUsage;
    default:
      return ExitCode::kSystem;
  }
}

}  // namespace

Failure UsageFailure(const std::string& text) { return {ExitCode::kUsage, text}; }

Failure RequestFailure(const halvec::Error& error) { return {CodeOf(error), error.describe()}; }

Failure ConnectFailure(const halvec::Error& error, const std::string& path) {
  // Any code but 35 means that there is no connection, whatever the helper's reason.
  const ExitCode code = error.status == HVMH_RETURN_CODE ? ExitCode::kNotConnected : CodeOf(error);
  return {code, "cannot connect to " + path + ": " + error.describe()};
}

}  // namespace halvecctl
