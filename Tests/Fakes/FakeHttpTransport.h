// SPDX-License-Identifier: Apache-2.0
//
// A web in memory: answers by URL, and a record of what was retrieved. Any thread; one lock, not
// held while an answer is made.
#pragma once

#include <algorithm>
#include <functional>
#include <map>
#include <mutex>
#include <regex>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/vlu/HttpTransport.h"

namespace fakes {

class FakeHttpTransport final : public vlu::Http::HttpTransport {
 public:
  using Answer =
      std::function<std::shared_ptr<vlu::Http::HttpResponse>(const vlu::Http::Transfer&)>;

  /// Answers retrievals of `url` by what `answer` returns, which runs on the transfer's thread.
  void answer(const std::string& url, Answer answer) {
    const std::lock_guard guard(mutex_);
    answers_[url] = std::move(answer);
  }
  /// Answers retrievals of `url` by status, body and header fields.
  void put(const std::string& url, int status, std::vector<std::uint8_t> body,
           vlu::Http::HeaderMap headers) {
    answer(url, [=](const vlu::Http::Transfer&) {
      return std::make_shared<vlu::Http::HttpResponse>(vlu::Http::ErrorType::kSuccess, status, body,
                                                       headers);
    });
  }
  /// Makes retrievals of `url` fail.
  void fail(const std::string& url, vlu::Http::ErrorType error, int status = 0) {
    answer(url, [=](const vlu::Http::Transfer&) {
      return std::make_shared<vlu::Http::HttpResponse>(error, status, std::vector<std::uint8_t>(),
                                                       vlu::Http::HeaderMap());
    });
  }
  /// Takes the Wi-Fi away: transfers that may not use cellular fail with kNoNetwork.
  void loseWifi() {
    const std::lock_guard guard(mutex_);
    hasWifi_ = false;
  }
  /// Every transfer so far, in the order of their starts.
  [[nodiscard]] std::vector<vlu::Http::Transfer> transfers() {
    const std::lock_guard guard(mutex_);
    return transfers_;
  }

  bool accepts(const std::string& url) override {
    static const std::regex kUrl(R"(https?://(\[[0-9a-f:]+\]|[^\[\]/?#@:]+)(:[0-9]+)?([/?#].*)?)",
                                 std::regex::icase);
    const bool printable =
        std::all_of(url.begin(), url.end(), [](char c) { return c > ' ' && c <= '~'; });
    return printable && std::regex_match(url, kUrl);
  }

  std::shared_ptr<vlu::Http::HttpResponse> retrieve(const vlu::Http::Transfer& transfer) override {
    Answer answer = NotFound;
    {
      const std::lock_guard guard(mutex_);
      transfers_.push_back(transfer);
      if (!transfer.allowsCellular && !hasWifi_) {
        return std::make_shared<vlu::Http::HttpResponse>(vlu::Http::ErrorType::kNoNetwork, 0,
                                                         std::vector<std::uint8_t>(),
                                                         vlu::Http::HeaderMap());
      }
      const auto found = answers_.find(transfer.url);
      if (found != answers_.end()) answer = found->second;
    }
    return Limited(answer(transfer), transfer.longestBody);
  }

 private:
  /// What a transport makes of a response whose body is longer than the transfer wants it.
  static std::shared_ptr<vlu::Http::HttpResponse> Limited(
      std::shared_ptr<vlu::Http::HttpResponse> response, std::size_t longestBody) {
    if (!response) return nullptr;
    auto body = response->takeBody();
    if (body.size() > longestBody) {
      return std::make_shared<vlu::Http::HttpResponse>(
          vlu::Http::ErrorType::kTooLarge, response->statusCode(), std::vector<std::uint8_t>(),
          vlu::Http::HeaderMap());
    }
    return std::make_shared<vlu::Http::HttpResponse>(response->errorType(), response->statusCode(),
                                                     std::move(body), response->takeHeaders());
  }

  static std::shared_ptr<vlu::Http::HttpResponse> NotFound(
      const vlu::Http::Transfer& /*transfer*/) {
    return std::make_shared<vlu::Http::HttpResponse>(
        vlu::Http::ErrorType::kSuccess, 404, std::vector<std::uint8_t>(), vlu::Http::HeaderMap());
  }

  std::mutex mutex_;
  std::map<std::string, Answer> answers_;
  std::vector<vlu::Http::Transfer> transfers_;
  bool hasWifi_ = true;
};

}  // namespace fakes
