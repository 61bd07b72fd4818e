// SPDX-License-Identifier: Apache-2.0
#include <fcntl.h>
#include <poll.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include <algorithm>
#include <cstring>

#include "Helper/Platform/PortMessage.h"
#include "Helper/Platform/ProcessIdentity.h"

namespace platform {
namespace {

constexpr uid_t kOverflowId = 65534;
constexpr int kRequiredSeals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE;

std::uint32_t AlignedTrailerOffset(std::uint32_t size) { return (size + 3U) & ~3U; }

/// Whether this is a memfd of exactly `size` bytes that nobody can change any more.
bool IsSealed(int descriptor, std::size_t size) {
  // The seals come before the size: only then can the size no longer change.
  const int seals = ::fcntl(descriptor, F_GET_SEALS);
  if (seals < 0 || (seals & kRequiredSeals) != kRequiredSeals) return false;
  struct stat status {};
  if (::fstat(descriptor, &status) != 0 || !S_ISREG(status.st_mode)) return false;
  return status.st_size >= 0 && static_cast<std::size_t>(status.st_size) == size;
}

/// Reads a whole sealed memfd. pread leaves the sender's file offset alone, and a copy in own
/// memory cannot fault or change.
bool ReadSealed(int descriptor, std::unique_ptr<std::byte[]>& memory, std::size_t size) {
  memory = std::make_unique_for_overwrite<std::byte[]>(size);
  std::size_t done = 0;
  while (done < size) {
    const ssize_t count =
        ::pread(descriptor, memory.get() + done, size - done, static_cast<off_t>(done));
    if (count <= 0) return false;
    done += static_cast<std::size_t>(count);
  }
  return true;
}

}  // namespace

/// What came with the bytes of a message.
struct ReceiveBuffer::Control {
  ForeignDescriptors descriptors;
  ucred credentials{.pid = 0, .uid = kOverflowId, .gid = kOverflowId};
  FileDescriptor pidfd;

  explicit Control(msghdr& message) {
    for (cmsghdr* entry = CMSG_FIRSTHDR(&message); entry; entry = CMSG_NXTHDR(&message, entry)) {
      descriptors.add(*entry);
      if (entry->cmsg_level != SOL_SOCKET) continue;
      const auto* data = CMSG_DATA(entry);
      const std::size_t size = entry->cmsg_len - CMSG_LEN(0);
      if (entry->cmsg_type == SCM_CREDENTIALS && size == sizeof credentials) {
        std::memcpy(&credentials, data, sizeof credentials);
      } else if (entry->cmsg_type == kControlPidfd && size == sizeof(int)) {
        int descriptor = -1;  // the kernel puts a negative error number here when it had no room
        std::memcpy(&descriptor, data, sizeof descriptor);
        if (descriptor >= 0) pidfd.reset(descriptor);
      }
    }
  }

  /// Credentials that were not asked for in time arrive as process 0 and the overflow user.
  [[nodiscard]] bool knowsSender() const { return credentials.pid > 0; }
};

ReceiveBuffer::ReceiveBuffer()
    : storage_(std::make_unique_for_overwrite<std::byte[]>(kHeadRoom + kMaxMessageSize +
                                                           kMaxInlineData + sizeof(wire::Trailer) +
                                                           sizeof(std::uint32_t))) {}

void ReceiveBuffer::clear() {
  for (std::size_t index = 0; index < rightCount_; ++index) PortDeallocate(rights_[index]);
  rightCount_ = 0;
  memory_.clear();
  ClosePairEnd(std::move(replyRight_));
  sender_.reset();
}

ReceiveStatus ReceiveBuffer::receive(PortName name, int socket, bool named) {
  clear();
  message_ = storage_.get() + kHeadRoom;
  iovec part{.iov_base = message_, .iov_len = kMaxMessageSize + kMaxInlineData};
  alignas(cmsghdr) ControlStorage controlStorage;
  msghdr message{};
  message.msg_iov = &part;
  message.msg_iovlen = 1;
  message.msg_control = controlStorage.data();
  message.msg_controllen = controlStorage.size();

  const ssize_t length = ::recvmsg(socket, &message, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
  if (length < 0) return ReceiveStatus::kNothing;
  Control control(message);
  if (length == 0) {
    // An empty packet and the end of all packets look the same; only poll tells them apart.
    pollfd entry{.fd = socket, .events = POLLRDHUP, .revents = 0};
    return ::poll(&entry, 1, 0) > 0 ? ReceiveStatus::kEnded : ReceiveStatus::kNothing;
  }
  if (static_cast<std::size_t>(length) < sizeof(wire::MessageHeader)) {
    return ReceiveStatus::kNothing;  // there is no id to answer to
  }
  if ((header().bits & wire::kRemoteDispositionMask) != 0) {
    replyRight_ = control.descriptors.take();
    if (replyRight_ && !IsAnonymousPort(replyRight_.get())) CloseForeign(std::move(replyRight_));
    // A named port has no way back of its own, and a private one must not answer where it was not
    // asked to; a lost or unfit reply right means no reply.
    if (!replyRight_ && !named) return ReceiveStatus::kNothing;
  }
  if ((message.msg_flags & MSG_CTRUNC) != 0) {
    refusal_ = KERN_RESOURCE_SHORTAGE;
    return ReceiveStatus::kRefused;
  }
  if ((message.msg_flags & MSG_TRUNC) != 0) {
    refusal_ = MIG_BAD_ARGUMENTS;
    return ReceiveStatus::kRefused;
  }
  return accept(name, static_cast<std::size_t>(length), control, named);
}

ReceiveStatus ReceiveBuffer::accept(PortName name, std::size_t length, Control& control,
                                    bool named) {
  wire::MessageHeader header = this->header();
  if (named && control.knowsSender()) {
    if (!control.pidfd) control.pidfd = OpenPidfd(control.credentials.pid);
    if (control.pidfd) sender_ = std::make_shared<const FileDescriptor>(std::move(control.pidfd));
  }
  refusal_ = MIG_BAD_ARGUMENTS;
  if (header.size < sizeof header || header.size > length) return ReceiveStatus::kRefused;
  header.remotePort = kPortNull;  // the reply right stays with this buffer and needs no name
  header.localPort = name;
  header.voucherPort = kPortNull;
  wire::Store(message_, header);
  const bool complex = (header.bits & wire::kComplexBit) != 0;
  if (complex ? !readDescriptors(length, control, named) : header.size != length) {
    return ReceiveStatus::kRefused;
  }
  if (header.size < length) {
    // Out-of-line bytes stand where the trailer belongs: the message, which is small, moves.
    std::memmove(message_ - kHeadRoom, message_, header.size);
    message_ -= kHeadRoom;
  }
  writeTrailer(control, named);
  return ReceiveStatus::kMessage;
}

/// Fills names and addresses in, one descriptor after the other. A count or type that this layer
/// does not know ends the walk without refusing the message: what such a message is answered is for
/// the routine's own check to say.
bool ReceiveBuffer::readDescriptors(std::size_t length, Control& control, bool named) {
  const std::size_t size = header().size;
  std::size_t inlineAt = size;
  std::size_t at = wire::kFirstDescriptorOffset;
  if (size < at) return size == length;
  const auto count = wire::Load<std::uint32_t>(message_ + wire::kDescriptorCountOffset);
  if (count > kMaxRights) return true;
  for (std::uint32_t index = 0; index < count; ++index) {
    std::byte* descriptor = message_ + at;
    if (at + wire::kPortDescriptorSize > size) return true;
    const auto type = wire::Load<std::uint8_t>(descriptor + wire::kDescriptorTypeOffset);
    if (type == wire::kPortDescriptorType) {
      const auto disposition = wire::Load<std::uint8_t>(descriptor + wire::kPortDispositionOffset);
      const bool carriesSendRight = disposition == wire::kMoveSend ||
                                    disposition == wire::kCopySend ||
                                    disposition == wire::kMakeSend;
      PortName name = kPortNull;
      FileDescriptor right = control.descriptors.take();
      if (right && carriesSendRight && IsAnonymousPort(right.get())) {
        name = PortAdoptSendRight(std::move(right), sender_);
        rights_[rightCount_++] = name;
      } else {
        CloseForeign(std::move(right));
      }
      wire::Store(descriptor, name);
      at += wire::kPortDescriptorSize;
    } else if (type == wire::kOutOfLineDescriptorType) {
      if (at + wire::kOutOfLineDescriptorSize > size) return true;
      if (!readMemory(descriptor, inlineAt, length, control, named)) return false;
      at += wire::kOutOfLineDescriptorSize;
    } else {
      return true;
    }
  }
  return inlineAt == length;
}

/// Finds the bytes of one out-of-line descriptor: behind the message at `inlineAt`, or in a memfd.
bool ReceiveBuffer::readMemory(std::byte* descriptor, std::size_t& inlineAt, std::size_t length,
                               Control& control, bool named) {
  const auto place = wire::Load<std::uint64_t>(descriptor);
  const std::size_t size = wire::Load<std::uint32_t>(descriptor + wire::kOutOfLineCountOffset);
  const std::byte* bytes = nullptr;
  if (size > kMaxOutOfLineData || place > 1) return false;
  if (place == 1 && size > 0) {
    FileDescriptor file = control.descriptors.take();
    if (!file || !IsSealed(file.get(), size)) {
      CloseForeign(std::move(file));
      return false;
    }
    Memory& memory = memory_.emplace_back();
    memory.file = std::move(file);
    // No message to a named port carries memory, so what anybody may send there is not worth a
    // copy.
    if (!named && !ReadSealed(memory.file.get(), memory.bytes, size)) return false;
    bytes = memory.bytes.get();
  } else if (size > 0) {
    if (size > length - inlineAt) return false;
    if (inlineAt + size - header().size > kMaxInlineData) return false;
    bytes = message_ + inlineAt;
    inlineAt += size;
  }
  wire::Store(descriptor, reinterpret_cast<std::uint64_t>(bytes));
  return true;
}

wire::AuditToken ReceiveBuffer::sender() const {
  const auto trailer = wire::Load<wire::Trailer>(message_ + AlignedTrailerOffset(header().size));
  return trailer.size == sizeof trailer ? trailer.auditToken : wire::AuditToken{};
}

void ReceiveBuffer::writeTrailer(const Control& control, bool named) {
  wire::Trailer trailer;
  trailer.size = wire::kAnonymousTrailerSize;
  trailer.sequence = sequence_++;
  if (control.knowsSender()) {
    const ucred& sender = control.credentials;
    const auto process = static_cast<std::uint32_t>(sender.pid);
    // Only the connect message is judged by its sender's identity; on a private port the process
    // version would cost three calls for every request and nobody reads it.
    const std::uint32_t version = named && sender_ ? ProcessVersion(sender_->get(), sender.pid) : 0;
    trailer.size = sizeof trailer;
    trailer.securityUid = sender.uid;
    trailer.securityGid = sender.gid;
    trailer.auditToken.words = {sender.uid, sender.uid, sender.gid, sender.uid,
                                sender.gid, process,    0,          version};
  }
  wire::Store(message_ + AlignedTrailerOffset(header().size), trailer);
}

}  // namespace platform
