// SPDX-License-Identifier: Apache-2.0
//
// Fetches one URL into memory and gunzips it into a file on request. Belongs to one thread, which
// fetch() blocks; body and headers are written on the download queue before fetch() returns. No
// lock.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "Helper/Platform/WorkQueue.h"
#include "Helper/Platform/vlu/Http.h"

class HttpDownloader {
 public:
  HttpDownloader();
  HttpDownloader(const HttpDownloader&) = delete;
  HttpDownloader& operator=(const HttpDownloader&) = delete;

  /// Retrieves `url`, over Wi-Fi alone when `wifiOnly`. True when a response of status 200 with a
  /// body arrived; false, with empty body and headers (headers remain where only the body was
  /// empty) and one line in the log, otherwise. Waits as long as the HTTP library takes, which is
  /// bounded there. May be called again.
  [[nodiscard]] bool fetch(const std::string& url, bool wifiOnly);

  /// Writes the gunzipped body to the file at `path`, replacing what it held. True when all of it
  /// was written. False, with a line in the log, when nothing was fetched, the Content-Type field
  /// is absent or does not contain "gzip", or the file cannot be opened, which is so for a link,
  /// for a file with a second name and for what is no regular file; and when the body cannot be
  /// gunzipped into it, in which case nothing is left at `path`.
  [[nodiscard]] bool uncompressTo(const std::string& path) const;

  /// The body of the last successful fetch; empty otherwise.
  [[nodiscard]] const std::vector<std::uint8_t>& body() const { return body_; }
  /// The header fields of the last response of status 200; empty otherwise.
  [[nodiscard]] const vlu::Http::HeaderMap& headers() const { return headers_; }

 private:
  void receive(const std::string& url, vlu::Http::HttpResponse* response);

  platform::WorkQueue downloadQueue_;
  std::vector<std::uint8_t> body_;
  vlu::Http::HeaderMap headers_;
};
