// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/vlu/Http.h"

#include <strings.h>

#include <algorithm>
#include <array>
#include <string_view>
#include <utility>

#include "Helper/Platform/vlu/HttpTransport.h"

namespace vlu::Http {
namespace {

struct StatusPhrase {
  int status;
  const char* phrase;
};

/// RFC 9110, section 15, and of RFC 6585 what a server of files sends.
constexpr std::array kStatusPhrases{
    StatusPhrase{0, "no status"},
    StatusPhrase{100, "continue"},
    StatusPhrase{101, "switching protocols"},
    StatusPhrase{200, "ok"},
    StatusPhrase{201, "created"},
    StatusPhrase{202, "accepted"},
    StatusPhrase{203, "non-authoritative information"},
    StatusPhrase{204, "no content"},
    StatusPhrase{205, "reset content"},
    StatusPhrase{206, "partial content"},
    StatusPhrase{300, "multiple choices"},
    StatusPhrase{301, "moved permanently"},
    StatusPhrase{302, "found"},
    StatusPhrase{303, "see other"},
    StatusPhrase{304, "not modified"},
    StatusPhrase{307, "temporary redirect"},
    StatusPhrase{308, "permanent redirect"},
    StatusPhrase{400, "bad request"},
    StatusPhrase{401, "unauthorized"},
    StatusPhrase{402, "payment required"},
    StatusPhrase{403, "forbidden"},
    StatusPhrase{404, "not found"},
    StatusPhrase{405, "method not allowed"},
    StatusPhrase{406, "not acceptable"},
    StatusPhrase{407, "proxy authentication required"},
    StatusPhrase{408, "request timeout"},
    StatusPhrase{409, "conflict"},
    StatusPhrase{410, "gone"},
    StatusPhrase{411, "length required"},
    StatusPhrase{412, "precondition failed"},
    StatusPhrase{413, "content too large"},
    StatusPhrase{414, "uri too long"},
    StatusPhrase{415, "unsupported media type"},
    StatusPhrase{416, "range not satisfiable"},
    StatusPhrase{417, "expectation failed"},
    StatusPhrase{421, "misdirected request"},
    StatusPhrase{422, "unprocessable content"},
    StatusPhrase{426, "upgrade required"},
    StatusPhrase{429, "too many requests"},
    StatusPhrase{431, "request header fields too large"},
    StatusPhrase{500, "internal server error"},
    StatusPhrase{501, "not implemented"},
    StatusPhrase{502, "bad gateway"},
    StatusPhrase{503, "service unavailable"},
    StatusPhrase{504, "gateway timeout"},
    StatusPhrase{505, "http version not supported"},
};

/// Hands `response` over on `queue`, and here where that gets no thread: somebody may wait for it.
void DeliverResponse(platform::WorkQueue& queue, const HttpRequest::CompletionCallback& callback,
                     const std::shared_ptr<HttpResponse>& response) {
  if (!queue.tryAsync([callback, response] { callback(response); })) callback(response);
}

bool IsTokenCharacter(char c) {
  constexpr std::string_view kMarks = "!#$%&'*+-.^_`|~";
  return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') ||
         kMarks.find(c) != std::string_view::npos;
}

bool IsValueCharacter(char c) { return c == '\t' || (c >= ' ' && c <= '~'); }

/// An empty value is none of ours: a library may take it for the wish to leave the field out.
bool IsField(const HeaderMap::value_type& field) {
  const auto& [name, value] = field;
  return !name.empty() && std::all_of(name.begin(), name.end(), IsTokenCharacter) &&
         !value.empty() && std::all_of(value.begin(), value.end(), IsValueCharacter);
}

}  // namespace

bool case_insensitive_key_comparer::operator()(const std::string& left,
                                               const std::string& right) const {
  return ::strcasecmp(left.c_str(), right.c_str()) < 0;
}

const char* asString(ErrorType error) {
  switch (error) {
    case ErrorType::kSuccess:
      return "success";
    case ErrorType::kTimedOut:
      return "timed out";
    case ErrorType::kHostNotFound:
      return "host not found";
    case ErrorType::kCannotConnect:
      return "cannot connect";
    case ErrorType::kConnectionLost:
      return "connection lost";
    case ErrorType::kNotTrusted:
      return "not trusted";
    case ErrorType::kTooLarge:
      return "too large";
    case ErrorType::kMalformedResponse:
      return "malformed response";
    case ErrorType::kRedirectRefused:
      return "redirect refused";
    case ErrorType::kTooManyRedirects:
      return "too many redirects";
    case ErrorType::kNoNetwork:
      return "no network that may be used";
    case ErrorType::kUnknown:
      break;
  }
  return "unknown error";
}

const char* asString(int status) {
  const auto* found = std::find_if(kStatusPhrases.begin(), kStatusPhrases.end(),
                                   [&](const auto& each) { return each.status == status; });
  return found == kStatusPhrases.end() ? "unknown status" : found->phrase;
}

std::shared_ptr<HttpSession> HttpSession::create() { return std::make_shared<HttpSession>(); }

HttpResponse::HttpResponse(ErrorType error, int status, std::vector<std::uint8_t> body,
                           HeaderMap headers)
    : error_(error), status_(status), body_(std::move(body)), headers_(std::move(headers)) {}

std::vector<std::uint8_t> HttpResponse::takeBody() { return std::exchange(body_, {}); }

HeaderMap HttpResponse::takeHeaders() { return std::exchange(headers_, {}); }

HttpRequest::HttpRequest(std::string url, HeaderMap headers, std::shared_ptr<HttpSession> session)
    : url_(std::move(url)), headers_(std::move(headers)), session_(std::move(session)) {}

std::shared_ptr<HttpRequest> HttpRequest::create(RequestType type, const std::string& url,
                                                 const HeaderMap& headers,
                                                 std::shared_ptr<HttpSession> session) {
  if (type != RequestType::kRetrieval || !session ||
      !std::all_of(headers.begin(), headers.end(), IsField) ||
      !platform::Shared<HttpTransport>().accepts(url)) {
    return nullptr;
  }
  return std::shared_ptr<HttpRequest>(new HttpRequest(url, headers, std::move(session)));
}

void HttpRequest::start(const std::string& /*body*/) {
  // A queue of the transfer's own, given up at once: it lives until its work is done.
  platform::WorkQueue transfers("vlu.http");
  const bool started = transfers.tryAsync(
      [transfer = Transfer{url_, headers_, session_->allowsCellular(), duration_, longestBody_},
       queue = queue_, callback = callback_] {
        DeliverResponse(*queue, callback, platform::Shared<HttpTransport>().retrieve(transfer));
      });
  if (!started) DeliverResponse(*queue_, callback_, nullptr);
}

}  // namespace vlu::Http
