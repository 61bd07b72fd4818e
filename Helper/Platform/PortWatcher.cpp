// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/PortWatcher.h"

#include <poll.h>

#include <utility>

#include "Helper/Platform/ProcessIdentity.h"
#include "Helper/Platform/RunLoopCore.h"

namespace platform {

struct PortWatcher::Watches {
  Watches(RunLoop& loop, PortWatcher* watcher)
      : socket(loop, End, watcher), holder(loop, End, watcher) {}
  /// Whatever is heard of either descriptor is the port's end.
  static void End(void* watcher) { static_cast<PortWatcher*>(watcher)->invalidate(); }
  DescriptorWatch socket;
  DescriptorWatch holder;
};

std::shared_ptr<PortWatcher> PortWatcher::Create(PortName port, void* info) {
  SharedDescriptor socket = PortSendDescriptor(port);
  const auto rights = PortQuery(port);
  if (!socket || !rights || rights->sendReferences == 0) return nullptr;
  auto watcher = std::shared_ptr<PortWatcher>(
      new PortWatcher(port, info, std::move(socket), PortHolder(port)));
  auto watches = std::make_unique<Watches>(RunLoop::Current(), watcher.get());
  if (!watches->socket.open(watcher->socket_->get())) return nullptr;
  if (watcher->holder_ && !watches->holder.open(watcher->holder_->get())) return nullptr;
  watcher->watches_ = std::move(watches);
  return watcher;
}

PortWatcher::PortWatcher(PortName port, void* info, SharedDescriptor socket,
                         SharedDescriptor holder)
    : port_(port), info_(info), socket_(std::move(socket)), holder_(std::move(holder)) {}

PortWatcher::~PortWatcher() = default;

bool PortWatcher::isDead() const {
  pollfd entry{.fd = socket_->get(), .events = POLLIN | POLLRDHUP, .revents = 0};
  return ::poll(&entry, 1, 0) != 0 || (holder_ && HasExited(holder_->get()));
}

void PortWatcher::setInvalidationCallback(Callback callback) {
  callback_ = callback;
  if (!callback_) return;
  if (!valid_) {
    std::exchange(callback_, nullptr)(this, info_);
  } else if (isDead()) {
    invalidate();
  }
}

void PortWatcher::invalidate() {
  if (!std::exchange(valid_, false)) return;
  const auto keep = shared_from_this();  // the callback may drop the last other reference
  watches_.reset();
  if (const Callback callback = std::exchange(callback_, nullptr)) callback(this, info_);
}

}  // namespace platform
