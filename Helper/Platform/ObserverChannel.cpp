// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/ObserverChannel.h"

#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <utility>

#include "Helper/Platform/RunLoopCore.h"
#include "Helper/Platform/UnixSocketAddress.h"

namespace platform {
namespace {

constexpr int kBacklog = 8;
constexpr std::chrono::seconds kPause{1};

/// A socket that listens at `path` for its owner and root alone; empty on failure.
FileDescriptor Listen(const std::string& path) {
  const UnixSocketAddress address(path);
  if (!address) return {};
  FileDescriptor socket(::socket(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  // The mode of the socket becomes the mode of its name.
  if (!socket || ::fchmod(socket.get(), S_IRUSR | S_IWUSR) != 0) return {};
  (void)::unlink(path.c_str());  // nothing there: nothing to replace
  if (::bind(socket.get(), address.get(), address.size()) != 0 ||
      ::listen(socket.get(), kBacklog) != 0) {
    return {};
  }
  return socket;
}

bool BelongsToRoot(int socket) {
  ucred peer{};
  socklen_t length = sizeof peer;
  return ::getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &peer, &length) == 0 &&
         length == sizeof peer && peer.uid == 0;
}

bool Send(int socket, std::span<const std::byte> packet) {
  return ::send(socket, packet.data(), packet.size(), MSG_DONTWAIT | MSG_NOSIGNAL) >= 0;
}

}  // namespace

struct ObserverChannel::Watch : DescriptorWatch {
  Watch(RunLoop& loop, ObserverChannel& channel)
      : DescriptorWatch(
            loop, [](void* context) { static_cast<ObserverChannel*>(context)->accept(); },
            &channel) {}
};

/// Whatever an observer sends or does ends it: there is nothing to ask for here.
struct ObserverChannel::Observer : DescriptorWatch {
  Observer(RunLoop& loop, ObserverChannel& owner, FileDescriptor connection)
      : DescriptorWatch(
            loop,
            [](void* context) {
              auto* self = static_cast<Observer*>(context);
              std::erase_if(self->channel.observers_,
                            [self](const auto& each) { return each.get() == self; });
            },
            this),
        channel(owner),
        socket(std::move(connection)) {}
  // The watch must be over before its descriptor is closed, whose number may be another's at once.
  ~Observer() { cancel(); }
  Observer(const Observer&) = delete;
  Observer& operator=(const Observer&) = delete;

  ObserverChannel& channel;
  const FileDescriptor socket;
};

std::unique_ptr<ObserverChannel> ObserverChannel::Open(RunLoop& loop, const std::string& path,
                                                       Snapshot snapshot) {
  FileDescriptor socket = Listen(path);
  if (!socket) return nullptr;
  std::unique_ptr<ObserverChannel> channel(
      new ObserverChannel(loop, std::move(socket), path, std::move(snapshot)));
  if (!channel->watch_->open(channel->socket_.get())) return nullptr;
  return channel;
}

ObserverChannel::ObserverChannel(RunLoop& loop, FileDescriptor socket, const std::string& path,
                                 Snapshot snapshot)
    : loop_(loop),
      socket_(std::move(socket)),
      boundPath_(path),
      snapshot_(std::move(snapshot)),
      watch_(std::make_unique<Watch>(loop, *this)) {}

ObserverChannel::~ObserverChannel() {
  if (pause_) pause_->invalidate();
  watch_.reset();
}

void ObserverChannel::accept() {
  FileDescriptor connection(
      ::accept4(socket_.get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
  if (!connection) return pause();
  if (observers_.size() == kMaxObservers || !BelongsToRoot(connection.get())) return;
  if (!Send(connection.get(), snapshot_())) return;
  auto observer = std::make_unique<Observer>(loop_, *this, std::move(connection));
  if (observer->open(observer->socket.get())) observers_.push_back(std::move(observer));
}

/// Leaves the socket alone for a while. Without a free descriptor the observer stays in the
/// socket's queue, and a loop that watched on would do nothing but find it there.
void ObserverChannel::pause() {
  watch_->cancel();
  pause_ = RunLoopTimer::Create(
      loop_, loop_.now() + kPause,
      [](RunLoopTimer*, void* context) { static_cast<ObserverChannel*>(context)->resume(); }, this);
  if (pause_) loop_.add(pause_);
}

void ObserverChannel::resume() {
  pause_.reset();
  if (!watch_->open(socket_.get())) pause();
}

void ObserverChannel::publish(std::span<const std::byte> event) {
  std::erase_if(observers_,
                [&](const auto& observer) { return !Send(observer->socket.get(), event); });
}

}  // namespace platform
