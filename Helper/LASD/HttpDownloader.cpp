// SPDX-License-Identifier: Apache-2.0
#include "Helper/LASD/HttpDownloader.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <ext/stdio_filebuf.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <semaphore>
#include <utility>

#include "Helper/Platform/FileDescriptor.h"
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

/// Opens the file at `path` for writing, emptied, as "w" does for fopen(3); 0 or an error number.
///
/// Unlike there no link is followed (ELOOP), nobody is waited for at a FIFO (ENXIO, EOPNOTSUPP) and
/// a file with a second name is left alone (EMLINK): the folder's owner may put any of those there
/// at the last moment, to have this process write where he may not.
int OpenForWriting(const std::string& path, std::ofstream& stream) {
  constexpr int kFlags = O_WRONLY | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;
  constexpr mode_t kMode = 0666;  // less the umask
  platform::FileDescriptor file(::open(path.c_str(), kFlags, kMode));
  struct stat status {};
  if (!file || ::fstat(file.get(), &status) != 0) return errno;
  if (!S_ISREG(status.st_mode)) return EOPNOTSUPP;
  if (status.st_nlink > 1) return EMLINK;
  if (::ftruncate(file.get(), 0) != 0) return errno;
  __gnu_cxx::stdio_filebuf<char> buffer(file.get(), std::ios::out | std::ios::binary);
  if (!buffer.is_open()) return errno;
  (void)file.release();  // the buffer's now
  *stream.rdbuf() = std::move(buffer);
  return 0;
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
  std::ofstream file;
  if (const int error = OpenForWriting(path, file); error != 0) {
    Log(LogPriority::kNotice, "Cannot open output file %s: %s\n", path.c_str(), ErrorText(error));
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
