// SPDX-License-Identifier: Apache-2.0
//
// What the C functions have in common: the object behind hvmh_client, and how a C++ outcome is
// handed to a C caller. No exception passes. Not installed.
#pragma once

#include <cstring>
#include <new>
#include <string_view>

#include "Client/HelperClient.h"
#include "Client/halvec_mobile_helper.h"

struct hvmh_client {
  halvec::HelperClient client;
};

namespace halvec {

/// Fills `details`, which may be null, and gives the status.
inline hvmh_status Report(const Error& error, hvmh_error* details) noexcept {
  if (details != nullptr) {
    *details = {error.status, error.returnCode, error.systemError, {}};
  }
  return error.status;
}

/// Runs `body`, which gives an Error, and reports it. Memory that runs out is a status like others.
template <class Body>
hvmh_status Guard(hvmh_error* details, Body&& body) noexcept {
  try {
    return Report(body(), details);
  } catch (const std::bad_alloc&) {
    return Report({HVMH_NO_MEMORY}, details);
  } catch (...) {
    // The library throws nothing else; a C caller must not meet it all the same.
    return Report(Error::FromSystem(0), details);
  }
}

}  // namespace halvec
