// SPDX-License-Identifier: Apache-2.0
#include "Helper/LASD/HttpDownloader.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <semaphore>

#include "Helper/Platform/SystemLog.h"
#include "Helper/Platform/vlu/Compression.h"

namespace Http = vlu::Http;
using platform::Log;
using platform::LogPriority;

namespace {

constexpr const char* kContentType = "Content-Type";
constexpr const char* kGzip = "gzip";

const char* ErrorText(int error) {
  const char* text = ::strerrordesc_np(error);
  return text ? text : "Unknown error";
}

}  // namespace

HttpDownloader::HttpDownloader() : downloadQueue_("com.zarvo.httpdownloadqueue") {}

bool HttpDownloader::fetch(const std::string& url, bool wifiOnly) {
  body_.clear();
  headers_.clear();
  if (url.empty()) {
    Log(LogPriority::kNotice, "URL is empty");
    return false;
  }
  Log(LogPriority::kNotice, "Fetching URL %s", url.c_str());
  const Http::HeaderMap headers{{"Accept-Encoding", kGzip}};
  const auto session = Http::HttpSession::create();
  if (wifiOnly) session->setAllowsCellular(false);
  const auto request =
      Http::HttpRequest::create(Http::RequestType::kRetrieval, url, headers, session);
  if (!request) {
    Log(LogPriority::kNotice, "Cannot create HTTP request for URL %s", url.c_str());
    return false;
  }
  // Shared, because the callback may still be inside release() when this function has returned.
  const auto done = std::make_shared<std::counting_semaphore<>>(0);
  request->setCallbackQueue(downloadQueue_);
  request->setCompletionCallback(
      [this, &url, done](const std::shared_ptr<Http::HttpResponse>& response) {
        receive(url, response.get());
        done->release();
      });
  request->start("");
  // Kept: no time limit here, because the library completes every request that it started.
  done->acquire();
  return !body_.empty();
}

/// On the download queue.
void HttpDownloader::receive(const std::string& url, Http::HttpResponse* response) {
  if (!response) {
    Log(LogPriority::kNotice, "Did not receive HTTP response!\n");
  } else if (response->errorType() == Http::ErrorType::kSuccess && response->statusCode() == 200) {
    body_ = response->takeBody();
    headers_ = response->takeHeaders();
    Log(LogPriority::kNotice, "URL retrieved %s, size: %lu \n", url.c_str(), body_.size());
  } else {
    Log(LogPriority::kNotice, "HTTP request failed for URL %s with error %s errorcode %d (%s)\n",
        url.c_str(), Http::asString(response->errorType()), response->statusCode(),
        Http::asString(response->statusCode()));
  }
}

bool HttpDownloader::uncompressTo(const std::string& path) const {
  if (body_.empty()) {
    Log(LogPriority::kNotice, "Cannot uncompress downloaded buffer without a response!\n");
    return false;
  }
  const auto contentType = headers_.find(kContentType);
  if (contentType == headers_.end()) {
    Log(LogPriority::kNotice, "Cannot find %s header in response!\n", kContentType);
    return false;
  }
  // Kept: the content type decides, not the content encoding, and capital letters do not count.
  if (contentType->second.find(kGzip) == std::string::npos) {
    Log(LogPriority::kNotice, "Expected to find %s in %s header, found %s instead\n", kGzip,
        kContentType, contentType->second.c_str());
    return false;
  }
  std::ofstream file(path, std::ios::out | std::ios::trunc | std::ios::binary);
  if (!file.is_open()) {
    Log(LogPriority::kNotice, "Cannot open output file %s: %s\n", path.c_str(), ErrorText(errno));
    return false;
  }
  if (vlu::Compression::Decompress(body_, file)) return true;
  Log(LogPriority::kNotice, "Could not uncompress HTTP response to %s!\n", path.c_str());
  if (std::remove(path.c_str()) != 0) {
    Log(LogPriority::kNotice, "Failed to remove partially uncompressed file at %s: %s\n",
        path.c_str(), ErrorText(errno));
  }
  return false;
}
