// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/ForeignDescriptor.h"

#include <cstring>
#include <utility>

namespace platform {
namespace {

/// Whether a packet lies unread in `end`, now or ever. An empty packet looks like no packet unless
/// the kernel says who sent it; so it is asked to.
bool MayHoldPackets(int end) {
  const int on = 1;
  // First nothing more can come, then what has come is looked at.
  if (::shutdown(end, SHUT_RD) != 0 ||
      ::setsockopt(end, SOL_SOCKET, SO_PASSCRED, &on, sizeof on) != 0) {
    return true;
  }
  alignas(cmsghdr) std::array<std::byte, CMSG_SPACE(sizeof(ucred))> control;
  msghdr message{};
  message.msg_control = control.data();
  message.msg_controllen = control.size();
  return ::recvmsg(end, &message, MSG_PEEK | MSG_DONTWAIT) != 0 || message.msg_controllen != 0;
}

}  // namespace

WorkQueue& ForeignCloseQueue() {
  static auto* queue = new WorkQueue("com.zarvo.halvec.closing");
  return *queue;
}

void CloseForeign(FileDescriptor descriptor) {
  if (!descriptor) return;
  const auto held = std::make_shared<FileDescriptor>(std::move(descriptor));
  ForeignCloseQueue().async([held] {
    // Not needed to keep callers from waiting, but those that lie behind it on the queue. What is
    // no socket refuses it.
    constexpr linger kOff{.l_onoff = 0, .l_linger = 0};
    (void)::setsockopt(held->get(), SOL_SOCKET, SO_LINGER, &kOff, sizeof kOff);
    held->reset();
  });
}

void ClosePairEnd(FileDescriptor end) {
  if (end && MayHoldPackets(end.get())) CloseForeign(std::move(end));
}

SharedDescriptor SharePairEnd(FileDescriptor end) {
  const auto giveUp = [](FileDescriptor* shared) {
    const std::unique_ptr<FileDescriptor> owned(shared);
    ClosePairEnd(std::move(*owned));
  };
  return {new FileDescriptor(std::move(end)), giveUp};
}

ForeignDescriptors::~ForeignDescriptors() {
  while (next_ < count_) CloseForeign(take());
}

void ForeignDescriptors::add(const cmsghdr& entry) {
  if (entry.cmsg_level != SOL_SOCKET || entry.cmsg_type != SCM_RIGHTS) return;
  const std::size_t size = entry.cmsg_len - CMSG_LEN(0);
  std::memcpy(descriptors_.data() + count_, CMSG_DATA(&entry), size);
  count_ += size / sizeof(int);
}

FileDescriptor ForeignDescriptors::take() {
  return next_ < count_ ? FileDescriptor(descriptors_[next_++]) : FileDescriptor();
}

}  // namespace platform
