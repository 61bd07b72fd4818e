// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/GlobalQueue.h"

#include <asio/executor_work_guard.hpp>
#include <asio/io_context.hpp>
#include <asio/post.hpp>

#include "Helper/Platform/DetachedThread.h"

namespace platform {
namespace {

/// Never destroyed: its thread may be inside a handler while the process exits.
struct Queue {
  asio::io_context context;
  asio::executor_work_guard<asio::io_context::executor_type> work{context.get_executor()};

  Queue() {
    StartDetachedThread([this] { context.run(); });
  }
};

}  // namespace

asio::io_context& GlobalQueueContext() {
  static auto* queue = new Queue;
  return queue->context;
}

void PostToGlobalQueue(std::function<void()> work) {
  asio::post(GlobalQueueContext(), std::move(work));
}

}  // namespace platform
