// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/ProcessExit.h"

#include <poll.h>

#include <algorithm>
#include <asio/io_context.hpp>
#include <asio/posix/stream_descriptor.hpp>
#include <system_error>
#include <utility>
#include <vector>

#include "Helper/Platform/GlobalQueue.h"
#include "Helper/Platform/ProcessIdentity.h"

namespace platform {
namespace {

/// The sources that wait for their process. Never destroyed, like the queue that serves them.
struct Registry {
  std::mutex mutex;
  std::vector<std::shared_ptr<ProcessExitSource>> sources;
};

Registry& Sources() {
  static auto* registry = new Registry;
  return *registry;
}

void Forget(const ProcessExitSource* source) {
  Registry& registry = Sources();
  std::shared_ptr<ProcessExitSource> dropped;
  const std::lock_guard guard(registry.mutex);
  const auto found = std::find_if(registry.sources.begin(), registry.sources.end(),
                                  [source](const auto& entry) { return entry.get() == source; });
  if (found == registry.sources.end()) return;
  dropped = std::move(*found);
  registry.sources.erase(found);
}

}  // namespace

/// The pidfd on the global queue. Opened before the wait, given up on the queue's thread.
struct ProcessExitSource::Watch {
  explicit Watch(int pidfd) : descriptor(GlobalQueueContext()) { descriptor.assign(pidfd); }
  ~Watch() {
    if (descriptor.is_open()) (void)descriptor.release();
  }
  asio::posix::stream_descriptor descriptor;
};

std::shared_ptr<ProcessExitSource> ProcessExitSource::Create(pid_t process, std::uint32_t version) {
  FileDescriptor pidfd = OpenPidfd(process);
  if (!pidfd || ProcessVersion(pidfd.get(), process) != version || HasExited(pidfd.get())) {
    return nullptr;
  }
  auto source = std::shared_ptr<ProcessExitSource>(new ProcessExitSource(std::move(pidfd)));
  try {
    source->watch_ = std::make_shared<Watch>(source->pidfd_.get());
  } catch (const std::system_error&) {
    return nullptr;  // no descriptor or no thread is to be had for the queue
  }
  return source;
}

ProcessExitSource::ProcessExitSource(FileDescriptor pidfd) : pidfd_(std::move(pidfd)) {}

void ProcessExitSource::setEventHandler(std::function<void()> handler) {
  const std::lock_guard guard(mutex_);
  eventHandler_ = std::move(handler);
}

void ProcessExitSource::setCancelHandler(std::function<void()> handler) {
  const std::lock_guard guard(mutex_);
  cancelHandler_ = std::move(handler);
}

void ProcessExitSource::resume() {
  {
    Registry& registry = Sources();
    const std::lock_guard guard(registry.mutex);
    registry.sources.push_back(shared_from_this());
  }
  // The watch keeps the source, and with it the descriptor, until the wait is over.
  PostToGlobalQueue([self = shared_from_this(), watch = watch_] {
    watch->descriptor.async_wait(asio::posix::descriptor_base::wait_read,
                                 [self, watch](const asio::error_code& error) {
                                   if (!error) self->deliver();
                                 });
  });
}

void ProcessExitSource::cancel() {
  std::function<void()> handler;
  {
    const std::lock_guard guard(mutex_);
    eventHandler_ = nullptr;
    handler = std::exchange(cancelHandler_, nullptr);
  }
  Forget(this);
  PostToGlobalQueue(
      [self = shared_from_this(), watch = watch_, handler = std::move(handler)]() mutable {
        if (watch->descriptor.is_open()) (void)watch->descriptor.release();
        if (handler) handler();
      });
}

void ProcessExitSource::deliver() {
  const std::lock_guard running(delivery_);
  std::function<void()> handler;
  {
    const std::lock_guard guard(mutex_);
    handler = std::exchange(eventHandler_, nullptr);
  }
  if (handler) handler();
}

void DeliverPendingProcessExits() {
  Registry& registry = Sources();
  std::vector<std::shared_ptr<ProcessExitSource>> sources;
  {
    const std::lock_guard guard(registry.mutex);
    if (registry.sources.empty()) return;
    sources = registry.sources;
  }
  std::vector<pollfd> entries;
  entries.reserve(sources.size());
  for (const auto& source : sources) {
    entries.push_back({.fd = source->pidfd_.get(), .events = POLLIN, .revents = 0});
  }
  if (::poll(entries.data(), entries.size(), 0) <= 0) return;
  for (std::size_t index = 0; index < entries.size(); ++index) {
    if (entries[index].revents == 0) continue;
    sources[index]->deliver();
    Forget(sources[index].get());
  }
}

}  // namespace platform
