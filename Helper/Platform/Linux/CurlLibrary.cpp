// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/CurlLibrary.h"

#include <strings.h>

#include <algorithm>
#include <cstdint>
#include <memory>

#include "Helper/Platform/SystemLog.h"

namespace platform {
namespace {

bool IsPrintable(char c) { return c > ' ' && c <= '~'; }

std::string PartOf(const CurlLibrary& curl, CURLU* url, CURLUPart part, unsigned int flags = 0) {
  char* text = nullptr;
  if (curl.urlGet(url, part, &text, flags) != CURLUE_OK) return {};
  const std::unique_ptr<char, decltype(curl.free)> owner(text, curl.free);
  return text;
}

/// A transfer that was given up may still be under way when the process ends. The TLS library would
/// take its tables away under it at that moment, unless it is told not to before its first use.
void KeepTlsUntilTheEnd() {
  constexpr std::uint64_t kNoCleanUpAtExit = 0x00080000;  // OPENSSL_INIT_NO_ATEXIT
  SharedLibrary library("libcrypto.so.3");
  int (*initialise)(std::uint64_t, const void*) = nullptr;
  library.bind(initialise, "OPENSSL_init_crypto");
  // With another TLS library there is nothing to keep.
  if (initialise) (void)initialise(kNoCleanUpAtExit, nullptr);
}

}  // namespace

CurlLibrary::CurlLibrary() {
  KeepTlsUntilTheEnd();
  library_.bind(easyInit, "curl_easy_init");
  library_.bind(easySetopt, "curl_easy_setopt");
  library_.bind(easyGetinfo, "curl_easy_getinfo");
  library_.bind(easyPerform, "curl_easy_perform");
  library_.bind(easyNextheader, "curl_easy_nextheader");
  library_.bind(easyCleanup, "curl_easy_cleanup");
  library_.bind(slistAppend, "curl_slist_append");
  library_.bind(slistFreeAll, "curl_slist_free_all");
  library_.bind(url, "curl_url");
  library_.bind(urlSet, "curl_url_set");
  library_.bind(urlGet, "curl_url_get");
  library_.bind(urlCleanup, "curl_url_cleanup");
  library_.bind(free, "curl_free");
  decltype(&::curl_global_init) globalInit = nullptr;
  library_.bind(globalInit, "curl_global_init");
  initialised_ = library_.complete() && globalInit(CURL_GLOBAL_DEFAULT) == CURLE_OK;
  if (!initialised_) {
    Log(LogPriority::kError, "No HTTP transfers: %s",
        library_.complete() ? "libcurl cannot be initialised" : library_.failure().c_str());
  }
}

const CurlLibrary* CurlLibrary::shared() {
  static const CurlLibrary& library = *new CurlLibrary;
  return library.initialised_ ? &library : nullptr;
}

bool ParseHttpUrl(const CurlLibrary& curl, const std::string& url, HttpTarget& target) {
  if (!std::all_of(url.begin(), url.end(), IsPrintable)) return false;
  // The library mends a wrong number of slashes, which makes a host of what was none.
  const std::size_t authority = url.find("://");
  if (authority == std::string::npos || url.compare(authority + 3, 1, "/") == 0) return false;
  const std::unique_ptr<CURLU, decltype(curl.urlCleanup)> parsed(curl.url(), curl.urlCleanup);
  if (!parsed ||
      curl.urlSet(parsed.get(), CURLUPART_URL, url.c_str(), CURLU_DISALLOW_USER) != CURLUE_OK) {
    return false;
  }
  target.scheme = PartOf(curl, parsed.get(), CURLUPART_SCHEME);
  if (target.scheme != "http" && target.scheme != "https") return false;
  target.host = PartOf(curl, parsed.get(), CURLUPART_HOST);
  if (target.host.starts_with('[')) target.host = target.host.substr(1, target.host.size() - 2);
  target.port = PartOf(curl, parsed.get(), CURLUPART_PORT, CURLU_DEFAULT_PORT);
  return !target.host.empty() && !target.port.empty();
}

}  // namespace platform
