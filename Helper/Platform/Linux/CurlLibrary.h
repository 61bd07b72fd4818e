// SPDX-License-Identifier: Apache-2.0
//
// The functions of libcurl that the HTTP transport calls, opened by the first request: linked in,
// the library would be most of the helper's start-up time. Any thread.
#pragma once

#include <curl/curl.h>

#include <string>

#include "Helper/Platform/SharedLibrary.h"

namespace platform {

struct CurlLibrary {
  /// The library, opened and initialised by the first call; null, with one line in the log, where
  /// it is not installed or too old (before 7.85).
  [[nodiscard]] static const CurlLibrary* shared();

  decltype(&::curl_easy_init) easyInit = nullptr;
  decltype(&::curl_easy_setopt) easySetopt = nullptr;
  decltype(&::curl_easy_getinfo) easyGetinfo = nullptr;
  decltype(&::curl_easy_perform) easyPerform = nullptr;
  decltype(&::curl_easy_nextheader) easyNextheader = nullptr;
  decltype(&::curl_easy_cleanup) easyCleanup = nullptr;
  decltype(&::curl_slist_append) slistAppend = nullptr;
  decltype(&::curl_slist_free_all) slistFreeAll = nullptr;
  decltype(&::curl_url) url = nullptr;
  decltype(&::curl_url_set) urlSet = nullptr;
  decltype(&::curl_url_get) urlGet = nullptr;
  decltype(&::curl_url_cleanup) urlCleanup = nullptr;
  decltype(&::curl_free) free = nullptr;

 private:
  CurlLibrary();

  SharedLibrary library_{"libcurl.so.4"};
  bool initialised_ = false;
};

/// What of a URL decides where its request goes.
struct HttpTarget {
  std::string scheme;  // "http" or "https"
  std::string host;    // a name, or an address without brackets
  std::string port;    // decimal
};

/// Parses an absolute http or https URL of printable ASCII characters; false for every other text,
/// and for one with a user name (RFC 9110, section 4.2.4).
[[nodiscard]] bool ParseHttpUrl(const CurlLibrary& curl, const std::string& url,
                                HttpTarget& target);

}  // namespace platform
