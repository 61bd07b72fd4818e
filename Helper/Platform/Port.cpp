// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Port.h"

#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>

#include <cstddef>
#include <mutex>
#include <unordered_map>

#include "Helper/Platform/PortEntry.h"

namespace platform {
namespace {

/// The table of names. Never destroyed: threads may still hold names while the process exits.
class PortSpace {
 public:
  static PortSpace& Instance() {
    static auto* space = new PortSpace;
    return *space;
  }

  PortName insert(PortEntry entry) {
    const std::lock_guard guard(mutex_);
    // Names count upward, so a name that was given up does not come back soon; after a wrap-around
    // those in use are passed over.
    while (next_ == kPortNull || next_ == kPortDead || entries_.contains(next_)) ++next_;
    entries_.emplace(next_, std::move(entry));
    return next_++;
  }

  /// Runs `action` on the entry of `name` under the lock; `fallback` when there is none.
  template <class Action, class Result>
  Result with(PortName name, Result fallback, Action action) {
    const std::lock_guard guard(mutex_);
    const auto found = entries_.find(name);
    return found == entries_.end() ? fallback : action(found->second);
  }

  /// Like with(), and then takes an entry that holds nothing any more out of the table. It is
  /// destroyed outside the lock.
  template <class Action>
  KernReturn change(PortName name, Action action) {
    PortEntry dropped;
    const std::lock_guard guard(mutex_);
    const auto found = entries_.find(name);
    if (found == entries_.end()) return KERN_INVALID_NAME;
    const KernReturn code = action(found->second);
    if (!found->second.receive && found->second.sendReferences == 0) {
      dropped = std::move(found->second);
      entries_.erase(found);
    }
    return code;
  }

  std::size_t size() {
    const std::lock_guard guard(mutex_);
    return entries_.size();
  }

 private:
  std::mutex mutex_;
  std::unordered_map<PortName, PortEntry> entries_;
  PortName next_ = 0x103;
};

bool HasNoAddress(int descriptor, decltype(&::getsockname) ask) {
  sockaddr_un address{};
  socklen_t length = sizeof address;
  // A pair whose other end is gone answers ENOTCONN: a dead port is still a port.
  if (ask(descriptor, reinterpret_cast<sockaddr*>(&address), &length) != 0)
    return errno == ENOTCONN;
  return length <= offsetof(sockaddr_un, sun_path);
}

}  // namespace

PortName PortInsertEntry(PortEntry entry) { return PortSpace::Instance().insert(std::move(entry)); }

KernReturn PortAllocate(PortName& name) {
  int ends[2];
  if (::socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends) != 0) {
    return KERN_RESOURCE_SHORTAGE;
  }
  PortEntry entry;
  entry.receive = SharePairEnd(FileDescriptor(ends[0]));
  entry.send = std::make_shared<const FileDescriptor>(ends[1]);
  // The sender of each request is known from its message, not from who made the pair.
  const int on = 1;
  if (::setsockopt(ends[0], SOL_SOCKET, SO_PASSCRED, &on, sizeof on) != 0) {
    return KERN_RESOURCE_SHORTAGE;
  }
  name = PortInsertEntry(std::move(entry));
  return KERN_SUCCESS;
}

KernReturn PortInsertSendRight(PortName name) {
  return PortSpace::Instance().with(name, KERN_INVALID_NAME, [](PortEntry& entry) {
    if (!entry.receive || entry.named()) return KERN_INVALID_RIGHT;
    ++entry.sendReferences;
    return KERN_SUCCESS;
  });
}

KernReturn PortDropReceiveRight(PortName name) {
  return PortSpace::Instance().change(name, [](PortEntry& entry) {
    if (!entry.receive) return KERN_INVALID_RIGHT;
    entry.receive.reset();
    return KERN_SUCCESS;
  });
}

KernReturn PortDeallocate(PortName name) {
  return PortSpace::Instance().change(name, [](PortEntry& entry) {
    if (entry.sendReferences > 0) {
      --entry.sendReferences;
    } else {
      entry.receive.reset();
    }
    return KERN_SUCCESS;
  });
}

PortName PortAdoptSendRight(FileDescriptor right, SharedDescriptor holder) {
  PortEntry entry;
  entry.send = SharePairEnd(std::move(right));
  entry.sendReferences = 1;
  entry.holder = std::move(holder);
  return PortInsertEntry(std::move(entry));
}

std::optional<PortRights> PortQuery(PortName name) {
  return PortSpace::Instance().with(name, std::optional<PortRights>{}, [](const PortEntry& entry) {
    return std::optional{PortRights{.receive = entry.receive != nullptr,
                                    .named = entry.named(),
                                    .sendReferences = entry.sendReferences}};
  });
}

std::size_t PortNameCount() { return PortSpace::Instance().size(); }

SharedDescriptor PortReceiveDescriptor(PortName name) {
  return PortSpace::Instance().with(name, SharedDescriptor{},
                                    [](const PortEntry& entry) { return entry.receive; });
}

SharedDescriptor PortSendDescriptor(PortName name) {
  return PortSpace::Instance().with(name, SharedDescriptor{},
                                    [](const PortEntry& entry) { return entry.send; });
}

SharedDescriptor PortHolder(PortName name) {
  return PortSpace::Instance().with(name, SharedDescriptor{},
                                    [](const PortEntry& entry) { return entry.holder; });
}

bool IsAnonymousPort(int descriptor) {
  int domain = 0;
  int type = 0;
  socklen_t length = sizeof domain;
  if (::getsockopt(descriptor, SOL_SOCKET, SO_DOMAIN, &domain, &length) != 0) return false;
  if (::getsockopt(descriptor, SOL_SOCKET, SO_TYPE, &type, &length) != 0) return false;
  return domain == AF_UNIX && type == SOCK_SEQPACKET && HasNoAddress(descriptor, ::getsockname) &&
         HasNoAddress(descriptor, ::getpeername);
}

}  // namespace platform
