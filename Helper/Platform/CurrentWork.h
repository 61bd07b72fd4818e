// SPDX-License-Identifier: Apache-2.0
//
// What the calling thread is busy with: the request that it serves or the queue that it runs, so
// that a log line or a work token can be traced back. Thread-local; no lock.
#pragma once

#include <cstdint>

namespace platform {

struct CurrentWork {
  const char* queue = nullptr;  // label of the work queue whose thread this is; null on others
  std::int32_t requestId = 0;   // id of the message that is being served; 0 between messages
  std::uint32_t process = 0;    // who sent it, and as which user; 0 when not known
  std::uint32_t user = 0;
};

/// The calling thread's own; read by anyone on it, written by what hands out the work.
[[nodiscard]] inline CurrentWork& WorkOfThisThread() {
  static thread_local constinit CurrentWork work;
  return work;
}

}  // namespace platform
