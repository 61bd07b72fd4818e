// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/HttpExchange.h"

#include <strings.h>

#include <algorithm>
#include <new>
#include <utility>

#include "Helper/Platform/Linux/NetworkLinks.h"
#include "Helper/Platform/PollTimeout.h"

namespace platform {

using vlu::Http::ErrorType;

namespace {

constexpr const char* kAcceptEncoding = "Accept-Encoding";
constexpr long kReceiveBuffer = long{256} << 10;
constexpr std::size_t kFirstCapacity = std::size_t{64} << 10;
constexpr std::size_t kGrowth = 16;

bool AsksForGzip(const vlu::Http::HeaderMap::value_type& field) {
  return ::strcasecmp(field.first.c_str(), kAcceptEncoding) == 0 && field.second == "gzip";
}

/// The time left as the library takes it, at least one millisecond: zero would mean no limit.
long LimitOf(TimePoint deadline) { return std::max(1, MillisecondsUntil(deadline)); }

}  // namespace

HttpExchange::HttpExchange(const CurlLibrary& curl, const HttpProfile& profile,
                           const vlu::Http::Transfer& transfer)
    : curl_(curl),
      profile_(profile),
      transfer_(transfer),
      longestBody_(std::min(profile.longestBody, transfer.longestBody)),
      fields_(nullptr, curl.slistFreeAll),
      addresses_(nullptr, curl.slistFreeAll),
      easy_(curl.easyInit(), curl.easyCleanup) {}

template <class Value>
void HttpExchange::set(CURLoption option, Value value) {
  // An option that is not taken is a protection that is not there: then nothing is transferred.
  prepared_ = prepared_ && curl_.easySetopt(easy_.get(), option, value) == CURLE_OK;
}

void HttpExchange::append(Strings& strings, const std::string& text) {
  curl_slist* longer = curl_.slistAppend(strings.get(), text.c_str());
  prepared_ = prepared_ && longer;
  if (!longer) return;
  (void)strings.release();  // now part of the longer list
  strings.reset(longer);
}

ErrorType HttpExchange::run(const std::string& url, const HttpTarget& target, TimePoint deadline) {
  if (!easy_) return ErrorType::kTooLarge;
  set(CURLOPT_URL, url.c_str());
  set(CURLOPT_PROTOCOLS_STR, target.scheme.c_str());
  set(CURLOPT_FOLLOWLOCATION, 0L);
  set(CURLOPT_HTTP_VERSION, long{CURL_HTTP_VERSION_1_1});
  set(CURLOPT_PROXY, "");  // nor one that the environment names
  set(CURLOPT_NOSIGNAL, 1L);
  set(CURLOPT_SSL_VERIFYPEER, 1L);
  set(CURLOPT_SSL_VERIFYHOST, 2L);
  set(CURLOPT_SSLVERSION, long{CURL_SSLVERSION_TLSv1_2});
  set(CURLOPT_CAINFO, profile_.certificates.c_str());
  set(CURLOPT_CAPATH, static_cast<const char*>(nullptr));
  set(CURLOPT_BUFFERSIZE, kReceiveBuffer);
  setHeaders();
  setCallbacks();
  const TimePoint connected =
      std::min(deadline, std::chrono::steady_clock::now() + Duration(profile_.connectLimit));
  if (!transfer_.allowsCellular) {
    const ErrorType error = keepOffCellular(target, connected);
    if (error != ErrorType::kSuccess) return error;
  }
  setLimits(connected, deadline);
  if (!prepared_) return ErrorType::kUnknown;
  return errorOf(curl_.easyPerform(easy_.get()));
}

/// Resolves the name here, because the library would ask over any network, and binds each socket.
ErrorType HttpExchange::keepOffCellular(const HttpTarget& target, TimePoint deadline) {
  auto addresses = ResolveWithoutCellular(target.host, profile_.resolver, deadline);
  if (!addresses) return ErrorType::kNoNetwork;
  if (addresses->empty()) return ErrorType::kHostNotFound;
  std::erase_if(*addresses, [](const auto& each) { return !IsReachableWithoutCellular(each); });
  if (addresses->empty()) return ErrorType::kNoNetwork;
  std::string entry = target.host + ":" + target.port;
  char separator = ':';
  for (const std::string& address : *addresses) {
    const bool six = address.find(':') != std::string::npos;
    entry += std::exchange(separator, ',') + (six ? "[" + address + "]" : address);
  }
  // An address stands for itself, and has no entry.
  if (addresses->front() != target.host) {
    append(addresses_, entry);
    set(CURLOPT_RESOLVE, addresses_.get());
  }
  set(CURLOPT_OPENSOCKETFUNCTION, &OnSocket);
  return ErrorType::kSuccess;
}

void HttpExchange::setLimits(TimePoint connected, TimePoint deadline) {
  set(CURLOPT_CONNECTTIMEOUT_MS, LimitOf(connected));
  set(CURLOPT_TIMEOUT_MS, LimitOf(deadline));
  set(CURLOPT_LOW_SPEED_LIMIT, profile_.slowestRate);
  set(CURLOPT_LOW_SPEED_TIME, static_cast<long>(profile_.quietLimit.count()));
  set(CURLOPT_MAXFILESIZE_LARGE, static_cast<curl_off_t>(longestBody_));
}

void HttpExchange::setHeaders() {
  for (const auto& field : transfer_.headers) {
    if (AsksForGzip(field)) {
      // The library then sends this very field and undoes the encoding.
      set(CURLOPT_ACCEPT_ENCODING, "gzip");
    } else {
      append(fields_, field.first + ": " + field.second);
    }
  }
  if (fields_) set(CURLOPT_HTTPHEADER, fields_.get());
}

void HttpExchange::setCallbacks() {
  set(CURLOPT_WRITEFUNCTION, &OnBody);
  set(CURLOPT_WRITEDATA, static_cast<void*>(this));
  set(CURLOPT_HEADERFUNCTION, &OnHeader);
  set(CURLOPT_HEADERDATA, static_cast<void*>(this));
  set(CURLOPT_OPENSOCKETDATA, static_cast<void*>(this));
}

std::size_t HttpExchange::OnBody(const char* data, std::size_t /*one*/, std::size_t length,
                                 void* self) {
  auto& exchange = *static_cast<HttpExchange*>(self);
  exchange.exceeded_ = !exchange.take(data, length);
  return exchange.exceeded_ ? 0 : length;
}

bool HttpExchange::take(const char* data, std::size_t length) {
  const std::size_t needed = body_.size() + length;
  if (needed > longestBody_) return false;
  try {
    if (needed > body_.capacity()) {
      curl_off_t announced = 0;
      (void)curl_.easyGetinfo(easy_.get(), CURLINFO_CONTENT_LENGTH_DOWNLOAD_T, &announced);
      // In few steps, because each is a copy; pages that are never touched cost nothing.
      const std::size_t wanted = std::max({needed, kFirstCapacity, body_.capacity() * kGrowth});
      const auto exact = static_cast<std::size_t>(std::max<curl_off_t>(announced, 0));
      body_.reserve(std::min(exact >= needed ? exact : wanted, longestBody_));
    }
    body_.insert(body_.end(), data, data + length);
  } catch (const std::bad_alloc&) {
    return false;
  }
  return true;
}

/// Called for redirects, final response and trailers alike, one line at a time.
std::size_t HttpExchange::OnHeader(const char* /*data*/, std::size_t /*one*/, std::size_t length,
                                   void* self) {
  auto& exchange = *static_cast<HttpExchange*>(self);
  exchange.headerBytes_ += length;
  exchange.exceeded_ = exchange.headerBytes_ > exchange.profile_.longestHeaders;
  return exchange.exceeded_ ? 0 : length;
}

curl_socket_t HttpExchange::OnSocket(void* /*self*/, curlsocktype /*purpose*/,
                                     curl_sockaddr* address) {
  FileDescriptor socket = EligibleSocket(address->addr, address->socktype, address->protocol);
  return socket ? socket.release() : CURL_SOCKET_BAD;
}

ErrorType HttpExchange::errorOf(CURLcode code) const {
  if (exceeded_) return ErrorType::kTooLarge;
  switch (code) {
    case CURLE_OK:
      return ErrorType::kSuccess;
    case CURLE_OPERATION_TIMEDOUT:
      return ErrorType::kTimedOut;
    case CURLE_COULDNT_RESOLVE_HOST:
      return ErrorType::kHostNotFound;
    case CURLE_COULDNT_CONNECT:
      return ErrorType::kCannotConnect;
    case CURLE_PARTIAL_FILE:
    case CURLE_RECV_ERROR:
    case CURLE_SEND_ERROR:
    case CURLE_GOT_NOTHING:
      return ErrorType::kConnectionLost;
    case CURLE_SSL_CONNECT_ERROR:
    case CURLE_PEER_FAILED_VERIFICATION:
    case CURLE_SSL_CACERT_BADFILE:
      return ErrorType::kNotTrusted;
    case CURLE_FILESIZE_EXCEEDED:
    case CURLE_OUT_OF_MEMORY:  // also its word for a header line beyond its own limit
      return ErrorType::kTooLarge;
    case CURLE_WEIRD_SERVER_REPLY:
    case CURLE_UNSUPPORTED_PROTOCOL:  // HTTP/0.9
    case CURLE_BAD_CONTENT_ENCODING:
      return ErrorType::kMalformedResponse;
    default:
      return ErrorType::kUnknown;
  }
}

int HttpExchange::status() const {
  long status = 0;
  (void)curl_.easyGetinfo(easy_.get(), CURLINFO_RESPONSE_CODE, &status);
  return static_cast<int>(status);
}

std::string HttpExchange::redirect() const {
  const int code = status();
  if (code != 301 && code != 302 && code != 303 && code != 307 && code != 308) return {};
  const char* url = nullptr;
  (void)curl_.easyGetinfo(easy_.get(), CURLINFO_REDIRECT_URL, &url);
  return url ? url : "";
}

vlu::Http::HeaderMap HttpExchange::headers() const {
  constexpr int kLastRequest = -1;
  vlu::Http::HeaderMap headers;
  curl_header* field = nullptr;
  while ((field = curl_.easyNextheader(easy_.get(), CURLH_HEADER, kLastRequest, field))) {
    const auto [place, isNew] = headers.try_emplace(field->name, field->value);
    if (!isNew) place->second += std::string(", ") + field->value;
  }
  return headers;
}

}  // namespace platform
