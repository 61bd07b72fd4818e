// SPDX-License-Identifier: Apache-2.0
//
// HTTP over libcurl, in one fixed profile. Any thread; transfers share nothing but the library. A
// calling thread has SIGPIPE blocked, as every work queue's has: TLS writes without MSG_NOSIGNAL.
#pragma once

#include <chrono>
#include <string>

#include "Helper/Platform/Linux/LinkResolver.h"
#include "Helper/Platform/vlu/HttpTransport.h"

namespace platform {

/// The limits of every transfer, which may have lower ones of its own; tests choose shorter ones.
struct HttpProfile {
  /// The authorities that a server's certificate may come from (PEM).
  std::string certificates = "/etc/ssl/certs/ca-certificates.crt";
  ResolverProfile resolver;
  /// Until name, connection and TLS are there, for each hop of a redirect.
  std::chrono::milliseconds connectLimit = std::chrono::seconds(30);
  /// A transfer of fewer than `slowestRate` bytes a second for so long has ended.
  std::chrono::seconds quietLimit{60};
  long slowestRate = 1024;
  /// All hops together.
  std::chrono::milliseconds overallLimit = std::chrono::hours(1);
  /// The body is kept in memory: a quarter of the smallest handset's, several times the largest
  /// database's.
  std::size_t longestBody = std::size_t{256} << 20;
  std::size_t longestHeaders = std::size_t{128} << 10;
  int mostRedirects = 5;
};

class HttpTransportCurl final : public vlu::Http::HttpTransport {
 public:
  explicit HttpTransportCurl(HttpProfile profile = {});

  [[nodiscard]] bool accepts(const std::string& url) override;
  [[nodiscard]] std::shared_ptr<vlu::Http::HttpResponse> retrieve(
      const vlu::Http::Transfer& transfer) override;

 private:
  const HttpProfile profile_;
};

}  // namespace platform
