// SPDX-License-Identifier: Apache-2.0
//
// The data-path heartbeat: while it is on, an echo request goes out over the cellular data
// interface every two seconds. The traffic is the point; nothing is logged or reported. Everything
// but HeartbeatSetEnabled() runs on the record's serial queue, so the record has no lock.
#pragma once

#include <cstdint>
#include <memory>

#include "Helper/Platform/WorkQueue.h"

struct HelperServer;

/// The process has one, made before main() runs.
struct Heartbeat {
  std::unique_ptr<platform::WorkQueue> queue;
  std::unique_ptr<platform::TimerSource> timer;  // null while stopped
  std::uint32_t workToken = 0;                   // 0 while stopped
  HelperServer* server = nullptr;                // of the last start
};

inline constexpr const char* kHeartbeatQueueLabel = "com.zarvo.otaheartbeat";

/// Switches the process's heartbeat on (`enabled` not 0) or off, on its queue and not before this
/// call returns. Any thread. `server` may be null.
///
/// Kept: every switch is carried out, in turn, however many wait. Each start has an exchange and a
/// work token of its own, so none can be left out or merged with the next unseen.
void HeartbeatSetEnabled(HelperServer* server, std::int32_t enabled);

/// Sends one echo request at once, then one right away and every two seconds by a timer, and takes
/// a work token of `server`. Without a server, or once it is gone, no token is held.
void HeartbeatStart(Heartbeat& heartbeat, HelperServer* server);

/// Ends the timer and gives the work token to `server`; without one the token is forgotten.
void HeartbeatStop(Heartbeat& heartbeat, HelperServer* server);

/// One echo exchange, up to about two seconds. Its outcome is dropped.
void HeartbeatPing();
