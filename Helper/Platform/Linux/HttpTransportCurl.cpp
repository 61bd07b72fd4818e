// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/HttpTransportCurl.h"

#include <algorithm>
#include <utility>

#include "Helper/Platform/Linux/CurlLibrary.h"
#include "Helper/Platform/Linux/HttpExchange.h"

template <>
vlu::Http::HttpTransport& platform::DefaultProvider<vlu::Http::HttpTransport>() {
  static HttpTransportCurl& transport = *new HttpTransportCurl;
  return transport;
}

namespace platform {

using vlu::Http::ErrorType;
using vlu::Http::HttpResponse;

namespace {

std::shared_ptr<HttpResponse> Failure(ErrorType error, int status) {
  return std::make_shared<HttpResponse>(error, status, std::vector<std::uint8_t>(),
                                        vlu::Http::HeaderMap());
}

}  // namespace

HttpTransportCurl::HttpTransportCurl(HttpProfile profile) : profile_(std::move(profile)) {}

bool HttpTransportCurl::accepts(const std::string& url) {
  const CurlLibrary* curl = CurlLibrary::shared();
  HttpTarget target;
  return curl && ParseHttpUrl(*curl, url, target);
}

std::shared_ptr<HttpResponse> HttpTransportCurl::retrieve(const vlu::Http::Transfer& transfer) {
  const CurlLibrary* curl = CurlLibrary::shared();
  HttpTarget target;
  std::string url = transfer.url;
  if (!curl || !ParseHttpUrl(*curl, url, target)) return Failure(ErrorType::kUnknown, 0);
  const TimePoint deadline =
      std::chrono::steady_clock::now() + std::min(Duration(profile_.overallLimit), transfer.limit);
  // Hop by hop, because each name must be resolved and each address bound anew.
  int status = 0;
  for (int hop = 0; hop <= profile_.mostRedirects; ++hop) {
    HttpExchange exchange(*curl, profile_, transfer);
    const ErrorType error = exchange.run(url, target, deadline);
    status = exchange.status();
    if (error != ErrorType::kSuccess) return Failure(error, status);
    url = exchange.redirect();
    if (url.empty()) {
      return std::make_shared<HttpResponse>(error, status, exchange.takeBody(), exchange.headers());
    }
    const bool secure = target.scheme == "https";
    if (!ParseHttpUrl(*curl, url, target) || (secure && target.scheme != "https")) {
      return Failure(ErrorType::kRedirectRefused, status);
    }
  }
  return Failure(ErrorType::kTooManyRedirects, status);
}

}  // namespace platform
