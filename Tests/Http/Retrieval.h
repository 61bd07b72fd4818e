// SPDX-License-Identifier: Apache-2.0
//
// One retrieval through the HTTP library, waited for.
#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <semaphore>
#include <string>
#include <vector>

#include "Helper/Platform/vlu/Http.h"

namespace support {

inline std::vector<std::uint8_t> BytesOf(const std::string& text) {
  return {text.begin(), text.end()};
}

inline std::string TextOf(const std::vector<std::uint8_t>& bytes) {
  return {bytes.begin(), bytes.end()};
}

/// Starts the request and waits for what comes of it.
inline std::shared_ptr<vlu::Http::HttpResponse> ResponseTo(vlu::Http::HttpRequest& request) {
  platform::WorkQueue queue("test");
  std::binary_semaphore done(0);
  std::shared_ptr<vlu::Http::HttpResponse> response;
  request.setCallbackQueue(queue);
  request.setCompletionCallback([&](std::shared_ptr<vlu::Http::HttpResponse> received) {
    response = std::move(received);
    done.release();
  });
  request.start("");
  done.acquire();
  queue.sync([] {});  // the callback has left the semaphore
  return response;
}

/// What came of a request for `url`; empty, and a failed test, when none could be made.
inline std::shared_ptr<vlu::Http::HttpResponse> Retrieve(const std::string& url,
                                                         const vlu::Http::HeaderMap& headers = {},
                                                         bool allowsCellular = true) {
  const auto session = vlu::Http::HttpSession::create();
  session->setAllowsCellular(allowsCellular);
  const auto request =
      vlu::Http::HttpRequest::create(vlu::Http::RequestType::kRetrieval, url, headers, session);
  EXPECT_TRUE(request) << url;
  return request ? ResponseTo(*request) : nullptr;
}

}  // namespace support
