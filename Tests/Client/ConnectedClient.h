// SPDX-License-Identifier: Apache-2.0
//
// A client of the C interface with a connection to the helper's side in this very thread. A reply
// is queued before the request is made, so no second thread is needed: the request is read
// afterwards.
#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <utility>
#include <vector>

#include "Client/HelperClient.h"
#include "Client/halvec_mobile_helper.h"
#include "Tests/Client/FakeHelper.h"

namespace fake {

struct CloseClient {
  void operator()(hvmh_client* client) const { hvmh_client_close(client); }
};

/// Limits that no test reaches unless it means to.
struct Limits {
  std::uint32_t requestMilliseconds = 10'000;
  bool reconnect = false;
};

/// Connected through the C interface.
class ConnectedClient {
 public:
  explicit ConnectedClient(Limits limits = {}) {
    hvmh_options options;
    hvmh_options_init(&options, sizeof options);
    options.service_path = service.path().c_str();
    options.request_timeout_ms = limits.requestMilliseconds;
    options.flags = limits.reconnect ? std::uint32_t{HVMH_FLAG_RECONNECT} : 0;
    Beside helper([&] { helperSide = Accept(service.socket()); });
    hvmh_client* made = nullptr;
    EXPECT_EQ(hvmh_client_open(&options, &made, nullptr), HVMH_OK);
    client_.reset(made);
  }

  [[nodiscard]] hvmh_client* get() const { return client_.get(); }

  /// Queues a reply for the next request.
  void willAnswer(const Bytes& reply, const std::vector<int>& descriptors = {}) {
    Send(helperSide.privatePort.get(), reply, descriptors);
  }
  /// The request that arrived.
  [[nodiscard]] Packet request() { return Receive(helperSide.privatePort.get()); }

  Service service;
  Connection helperSide;

 private:
  std::unique_ptr<hvmh_client, CloseClient> client_;
};

}  // namespace fake
