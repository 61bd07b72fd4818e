// SPDX-License-Identifier: Apache-2.0
//
// What carries HTTP requests: the service below vlu::Http. Any thread; transfers run side by side.
#pragma once

#include <cstddef>
#include <limits>
#include <memory>
#include <string>

#include "Helper/Platform/Clock.h"
#include "Helper/Platform/SharedService.h"
#include "Helper/Platform/vlu/Http.h"

namespace vlu::Http {

/// One retrieval.
struct Transfer {
  std::string url;    // absolute, http or https
  HeaderMap headers;  // to send besides Host and Accept
  bool allowsCellular = true;
  // Where these are less than what the transport allows every transfer:
  platform::Duration limit = platform::Duration::max();  // for all of it, redirects included
  std::size_t longestBody = std::numeric_limits<std::size_t>::max();
};

class HttpTransport {
 public:
  virtual ~HttpTransport() = default;

  /// Whether `url` can be retrieved by this system: it is an absolute http or https URL of
  /// printable ASCII characters with a host, and the means are there.
  [[nodiscard]] virtual bool accepts(const std::string& url) = 0;

  /// Retrieves what `transfer` says and waits for it, in bounded time. Follows a few redirects,
  /// none from https to http. Empty when there is neither a response nor a failure to tell of.
  [[nodiscard]] virtual std::shared_ptr<HttpResponse> retrieve(const Transfer& transfer) = 0;
};

}  // namespace vlu::Http

template <>
vlu::Http::HttpTransport& platform::DefaultProvider<vlu::Http::HttpTransport>();
