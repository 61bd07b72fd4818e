// SPDX-License-Identifier: Apache-2.0
//
// The telephony utility library's HTTP client: a session says which networks may be used, a request
// retrieves one URL, a response is handed over on the caller's queue. Objects belong to one thread
// at a time and have no lock; the transfer itself runs on a thread of its own.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <limits>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "Helper/Platform/Clock.h"
#include "Helper/Platform/WorkQueue.h"

namespace vlu::Http {

/// Orders header names without regard to case: strcasecmp of the two.
struct case_insensitive_key_comparer {
  [[nodiscard]] bool operator()(const std::string& left, const std::string& right) const;
};

/// Header fields by name. A field that was received several times has its values joined by ", "
/// (RFC 9110, section 5.3).
using HeaderMap = std::map<std::string, std::string, case_insensitive_key_comparer>;

enum class RequestType : int { kRetrieval = 0 };

/// How a transfer ended. Only kSuccess says that a whole response arrived, whatever its status.
enum class ErrorType : int {
  kUnknown = 0,
  kSuccess = 1,
  kTimedOut = 2,           // one of the limits on time or on slowness was reached
  kHostNotFound = 3,       // the name has no address, or no name server answered
  kCannotConnect = 4,      // no address took the connection
  kConnectionLost = 5,     // it broke before the response was whole
  kNotTrusted = 6,         // TLS failed, or the certificate is not the host's
  kTooLarge = 7,           // body or header fields exceed what is kept, or what memory holds
  kMalformedResponse = 8,  // not HTTP, or not decodable
  kRedirectRefused = 9,    // from https to http, to another scheme, or to nothing that is a URL
  kTooManyRedirects = 10,
  kNoNetwork = 11,  // none that the session may use
};

/// A few words for the log. Never null.
[[nodiscard]] const char* asString(ErrorType error);
/// The reason phrase of an HTTP status code (RFC 9110, section 15), "unknown status" for a number
/// that has none, "no status" for 0. Never null.
[[nodiscard]] const char* asString(int status);

class HttpSession {
 public:
  /// A new session that may use every network.
  [[nodiscard]] static std::shared_ptr<HttpSession> create();

  /// Whether transfers of requests started from now on may go over the cellular data network, name
  /// resolution included.
  void setAllowsCellular(bool allowed) { allowsCellular_ = allowed; }
  [[nodiscard]] bool allowsCellular() const { return allowsCellular_; }

 private:
  bool allowsCellular_ = true;
};

class HttpResponse {
 public:
  HttpResponse(ErrorType error, int status, std::vector<std::uint8_t> body, HeaderMap headers);

  [[nodiscard]] ErrorType errorType() const { return error_; }
  /// The status code of the last response that began to arrive; 0 when none did.
  [[nodiscard]] int statusCode() const { return status_; }
  /// Hands the body over, transfer compression undone; empty unless errorType() is kSuccess, and
  /// empty from the second call on.
  [[nodiscard]] std::vector<std::uint8_t> takeBody();
  /// Hands the final response's header fields over, as they were received (trailers are none of
  /// them); empty unless errorType() is kSuccess, and empty from the second call on.
  [[nodiscard]] HeaderMap takeHeaders();

 private:
  ErrorType error_;
  int status_;
  std::vector<std::uint8_t> body_;
  HeaderMap headers_;
};

class HttpRequest {
 public:
  /// Receives the response; an empty pointer when there is not even a failure to report.
  using CompletionCallback = std::function<void(std::shared_ptr<HttpResponse>)>;

  /// A request for `url`, which sends `headers` besides Host and Accept. "Accept-Encoding: gzip" is
  /// sent once and asks for transfer compression, which is undone before the body is handed over.
  /// Empty when no request can be made: another type than kRetrieval, a URL that is not http or
  /// https with a host, a header field that is no field (RFC 9110, section 5), no session, or no
  /// HTTP library on this system.
  [[nodiscard]] static std::shared_ptr<HttpRequest> create(RequestType type, const std::string& url,
                                                           const HeaderMap& headers,
                                                           std::shared_ptr<HttpSession> session);

  /// The queue on which the completion callback runs. Must live until the callback has begun. Where
  /// the system refuses it a thread, the callback runs on the transfer's.
  void setCallbackQueue(platform::WorkQueue& queue) { queue_ = &queue; }
  void setCompletionCallback(CompletionCallback callback) { callback_ = std::move(callback); }

  /// Ends transfers that are started from now on with kTimedOut when `duration` has passed, and
  /// with kTooLarge when the body exceeds `longestBody` bytes, where that is less than the library
  /// allows.
  void setLimits(platform::Duration duration, std::size_t longestBody) {
    duration_ = duration;
    longestBody_ = longestBody;
  }

  /// Starts the transfer and returns. The callback runs exactly once per start, in bounded time
  /// whatever the server does; with an empty pointer, and perhaps inside this call, where the
  /// system refuses the transfer a thread. A retrieval has no body: `body` is not sent. Needs queue
  /// and callback. The request may be released while the transfer is under way.
  void start(const std::string& body);

 private:
  HttpRequest(std::string url, HeaderMap headers, std::shared_ptr<HttpSession> session);

  std::string url_;
  HeaderMap headers_;
  std::shared_ptr<HttpSession> session_;
  platform::Duration duration_ = platform::Duration::max();
  std::size_t longestBody_ = std::numeric_limits<std::size_t>::max();
  platform::WorkQueue* queue_ = nullptr;
  CompletionCallback callback_;
};

}  // namespace vlu::Http
