// SPDX-License-Identifier: Apache-2.0
#include "Helper/Heartbeat/Heartbeat.h"

#include <chrono>

#include "Helper/Heartbeat/EchoExchange.h"
#include "Helper/Shared/Server/HelperServerUtils.h"

namespace {

using namespace std::chrono_literals;

constexpr platform::Duration kInterval = 2s;
constexpr platform::Duration kLeeway = 5us;

/// Holds the process's record from before main() to the process's exit. What is posted at exit may
/// still run when static objects are gone, so it keeps the record alive itself.
class ProcessHeartbeat {
 public:
  ProcessHeartbeat() {
    record_->queue = std::make_unique<platform::WorkQueue>(kHeartbeatQueueLabel);
  }
  ~ProcessHeartbeat() {
    platform::WorkQueue& queue = *record_->queue;
    queue.async([record = std::move(record_)] { HeartbeatStop(*record, record->server); });
  }
  ProcessHeartbeat(const ProcessHeartbeat&) = delete;
  ProcessHeartbeat& operator=(const ProcessHeartbeat&) = delete;

  [[nodiscard]] Heartbeat& record() { return *record_; }

 private:
  std::shared_ptr<Heartbeat> record_ = std::make_shared<Heartbeat>();
};

ProcessHeartbeat processHeartbeat;

}  // namespace

void HeartbeatSetEnabled(HelperServer* server, std::int32_t enabled) {
  Heartbeat& heartbeat = processHeartbeat.record();
  heartbeat.queue->async([&heartbeat, server, enabled] {
    if (enabled != 0) {
      HeartbeatStart(heartbeat, server);
    } else {
      HeartbeatStop(heartbeat, server);
    }
  });
}

void HeartbeatStart(Heartbeat& heartbeat, HelperServer* server) {
  // Kept: a start does not ask whether there is a server; without one it runs and holds no token.
  heartbeat.server = server;
  heartbeat.timer.reset();
  heartbeat.timer = std::make_unique<platform::TimerSource>(
      *heartbeat.queue, heartbeat.queue->now(), kInterval, kLeeway, HeartbeatPing);
  HeartbeatPing();
  // Kept: a start while it runs loses the first token for good, and with it the idle exit.
  heartbeat.workToken = HelperServerAcquireWorkToken(server);
  heartbeat.timer->resume();
}

void HeartbeatStop(Heartbeat& heartbeat, HelperServer* server) {
  heartbeat.timer.reset();
  if (server) {
    // Refused, harmlessly, for the token 0 of a heartbeat that does not run.
    (void)HelperServerReleaseWorkToken(server, heartbeat.workToken);
  }
  heartbeat.workToken = 0;
}

void HeartbeatPing() {
  const platform::String target(HALVEC_HEARTBEAT_TARGET);
  (void)ExchangeEcho(target);  // the traffic is the point
}
