// SPDX-License-Identifier: Apache-2.0
//
// One request and its response, without redirects: the place where every option of libcurl is set.
// Made, used and destroyed on one thread; no lock.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "Helper/Platform/Clock.h"
#include "Helper/Platform/Linux/CurlLibrary.h"
#include "Helper/Platform/Linux/HttpTransportCurl.h"

namespace platform {

class HttpExchange {
 public:
  /// Borrows all for its lifetime.
  HttpExchange(const CurlLibrary& curl, const HttpProfile& profile,
               const vlu::Http::Transfer& transfer);
  HttpExchange(const HttpExchange&) = delete;
  HttpExchange& operator=(const HttpExchange&) = delete;

  /// Retrieves `url`, which is `target`, until `deadline` and says how that ended.
  [[nodiscard]] vlu::Http::ErrorType run(const std::string& url, const HttpTarget& target,
                                         TimePoint deadline);

  /// The status code; 0 when no response began.
  [[nodiscard]] int status() const;
  /// Where the response redirects to, absolute; empty when it does not.
  [[nodiscard]] std::string redirect() const;
  [[nodiscard]] std::vector<std::uint8_t> takeBody() { return std::move(body_); }
  /// The response's header fields.
  [[nodiscard]] vlu::Http::HeaderMap headers() const;

 private:
  using Strings = std::unique_ptr<curl_slist, decltype(&::curl_slist_free_all)>;

  template <class Value>
  void set(CURLoption option, Value value);
  void append(Strings& strings, const std::string& text);
  [[nodiscard]] vlu::Http::ErrorType keepOffCellular(const HttpTarget& target, TimePoint deadline);
  void setLimits(TimePoint connected, TimePoint deadline);
  void setHeaders();
  void setCallbacks();
  [[nodiscard]] vlu::Http::ErrorType errorOf(CURLcode code) const;
  [[nodiscard]] bool take(const char* data, std::size_t length);

  static std::size_t OnBody(const char* data, std::size_t one, std::size_t length, void* self);
  static std::size_t OnHeader(const char* data, std::size_t one, std::size_t length, void* self);
  static curl_socket_t OnSocket(void* self, curlsocktype purpose, curl_sockaddr* address);

  const CurlLibrary& curl_;
  const HttpProfile& profile_;
  const vlu::Http::Transfer& transfer_;
  const std::size_t longestBody_;
  Strings fields_;
  Strings addresses_;
  std::unique_ptr<CURL, decltype(&::curl_easy_cleanup)> easy_;
  bool prepared_ = true;  // every option was taken
  bool exceeded_ = false;
  std::size_t headerBytes_ = 0;
  std::vector<std::uint8_t> body_;
};

}  // namespace platform
