// SPDX-License-Identifier: Apache-2.0
//
// Errors in words.
#include <array>
#include <cstring>

#include "Client/Result.h"

const char* hvmh_status_text(hvmh_status status) {
  switch (status) {
    case HVMH_OK:
      return "done";
    case HVMH_RETURN_CODE:
      return "the helper answered with a failure";
    case HVMH_NOT_RUNNING:
      return "the helper's service is not running";
    case HVMH_ACCESS_DENIED:
      return "the service socket does not admit this process";
    case HVMH_REFUSED:
      return "the helper refused: this program does not hold the entitlement";
    case HVMH_TIMED_OUT:
      return "the helper did not answer in time";
    case HVMH_HELPER_GONE:
      return "the helper went away";
    case HVMH_NOT_CONNECTED:
      return "there is no connection to the helper";
    case HVMH_PROTOCOL_VIOLATION:
      return "the helper's answer was ill-formed";
    case HVMH_TOO_LARGE:
      return "a text or data is too long to be sent";
    case HVMH_INVALID_ARGUMENT:
      return "an argument is not usable";
    case HVMH_NO_MEMORY:
      return "out of memory";
    case HVMH_SYSTEM_ERROR:
      return "a system call failed";
    default:
      return "unknown status";
  }
}

namespace halvec {

std::string Error::describe() const {
  std::string text = hvmh_status_text(status);
  if (returnCode != KERN_SUCCESS) {
    text += ", code " + std::to_string(returnCode) + " (" +
            std::string(ReturnCodeName(returnCode)) + ")";
  }
  if (systemError != 0) {
    const char* name = ::strerrorname_np(systemError);
    const char* meaning = ::strerrordesc_np(systemError);
    text += ": ";
    text += meaning == nullptr ? "error " + std::to_string(systemError) : meaning;
    if (name != nullptr) text += std::string(" (") + name + ")";
  }
  return text;
}

}  // namespace halvec
