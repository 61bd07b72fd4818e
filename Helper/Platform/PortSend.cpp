// SPDX-License-Identifier: Apache-2.0
#include <fcntl.h>
#include <linux/sockios.h>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstring>
#include <span>

#include "Helper/Platform/PortMessage.h"
#include "Helper/Platform/TaskMemory.h"

namespace platform {
namespace {

constexpr std::size_t kMaxDescriptors = 2;
/// A few earlier replies, as the kernel counts them (some 768 bytes for a short packet).
constexpr int kMaxUnread = 4096;
constexpr int kSeals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE | F_SEAL_SEAL;

/// A memfd that holds `bytes` and can be changed by nobody any more; empty on failure.
FileDescriptor SealedCopy(std::span<const std::byte> bytes) {
  FileDescriptor file(::memfd_create("message", MFD_CLOEXEC | MFD_ALLOW_SEALING));
  while (file && !bytes.empty()) {
    const ssize_t count = ::write(file.get(), bytes.data(), bytes.size());
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return {};
    bytes = bytes.subspan(static_cast<std::size_t>(count));
  }
  if (file && ::fcntl(file.get(), F_ADD_SEALS, kSeals) != 0) return {};
  return file;
}

/// Whether the receiver is so far behind that it gets no more memory: each memfd that lies unread
/// in its queue is memory of this process's making that only the receiver can give up.
bool IsFarBehind(int socket) {
  int unread = 0;
  return ::ioctl(socket, SIOCOUTQ, &unread) != 0 || unread > kMaxUnread;
}

/// What one descriptor of a message carries, as the routine left it.
struct Carried {
  std::byte* descriptor = nullptr;
  bool isPort = false;
  PortName port = kPortNull;
  std::span<std::byte> memory;  // a region of ours
};

/// A packet on its way out: its parts and the descriptors that travel with it.
struct Outgoing {
  std::array<iovec, 1 + kMaxDescriptors> parts{};
  std::size_t partCount = 0;
  std::array<int, kMaxDescriptors> descriptors{};
  std::size_t descriptorCount = 0;
  std::array<SharedDescriptor, kMaxDescriptors> ports;
  std::array<FileDescriptor, kMaxDescriptors> files;
  std::size_t inlineSize = 0;
};

bool AddPort(const Carried& carried, Outgoing& outgoing) {
  SharedDescriptor port = PortSendDescriptor(carried.port);
  if (!port) return false;
  outgoing.descriptors[outgoing.descriptorCount] = port->get();
  outgoing.ports[outgoing.descriptorCount++] = std::move(port);
  wire::Store(carried.descriptor, kPortNull);
  return true;
}

bool AddMemory(int socket, const Carried& carried, std::size_t inlineLimit, Outgoing& outgoing) {
  const std::span<std::byte> memory = carried.memory;
  std::uint64_t place = 0;
  if (memory.size() > inlineLimit - outgoing.inlineSize) {
    if (memory.size() > kMaxOutOfLineData || IsFarBehind(socket)) return false;
    FileDescriptor file = SealedCopy(memory);
    if (!file) return false;
    place = 1;
    outgoing.descriptors[outgoing.descriptorCount] = file.get();
    outgoing.files[outgoing.descriptorCount++] = std::move(file);
  } else if (!memory.empty()) {
    outgoing.parts[outgoing.partCount++] = {.iov_base = memory.data(), .iov_len = memory.size()};
    outgoing.inlineSize += memory.size();
  }
  wire::Store(carried.descriptor, place);
  return true;
}

// Never waits: a receiver that does not read loses its message, nobody else loses time.
constexpr int kSendFlags = MSG_DONTWAIT | MSG_NOSIGNAL;

/// Sends bytes alone: the form of nearly every reply, and the cheaper call. The errno, or 0.
int SendBytes(int socket, const iovec& bytes) {
  return ::send(socket, bytes.iov_base, bytes.iov_len, kSendFlags) < 0 ? errno : 0;
}

/// The errno, or 0.
int Send(int socket, const Outgoing& outgoing) {
  if (outgoing.descriptorCount == 0 && outgoing.partCount == 1) {
    return SendBytes(socket, outgoing.parts.front());
  }
  msghdr header{};
  header.msg_iov = const_cast<iovec*>(outgoing.parts.data());
  header.msg_iovlen = outgoing.partCount;
  alignas(cmsghdr) std::array<std::byte, CMSG_SPACE(sizeof(int) * kMaxDescriptors)> control{};
  if (outgoing.descriptorCount > 0) {
    const std::size_t size = sizeof(int) * outgoing.descriptorCount;
    header.msg_control = control.data();
    header.msg_controllen = CMSG_SPACE(size);
    cmsghdr* entry = CMSG_FIRSTHDR(&header);
    entry->cmsg_level = SOL_SOCKET;
    entry->cmsg_type = SCM_RIGHTS;
    entry->cmsg_len = CMSG_LEN(size);
    std::memcpy(CMSG_DATA(entry), outgoing.descriptors.data(), size);
  }
  return ::sendmsg(socket, &header, kSendFlags) < 0 ? errno : 0;
}

/// The region that an out-of-line descriptor names.
std::span<std::byte> RegionOf(const std::byte* descriptor) {
  const auto address = wire::Load<std::uint64_t>(descriptor);
  const std::size_t size = wire::Load<std::uint32_t>(descriptor + wire::kOutOfLineCountOffset);
  return {reinterpret_cast<std::byte*>(address), size};  // NOLINT: a region of ours
}

/// Gives back what the message hands over, however the sending went.
class Deallocation {
 public:
  Deallocation() = default;
  Deallocation(const Deallocation&) = delete;
  Deallocation& operator=(const Deallocation&) = delete;
  ~Deallocation() {
    if (address_ != 0) Shared<TaskMemory>().deallocate(address_, size_);
  }
  void note(const std::byte* descriptor) {
    constexpr std::size_t kDeallocateOffset = 8;
    if (wire::Load<std::uint8_t>(descriptor + kDeallocateOffset) == 0) return;
    address_ = wire::Load<std::uint64_t>(descriptor);
    size_ = RegionOf(descriptor).size();
  }

 private:
  VmAddress address_ = 0;
  std::size_t size_ = 0;
};

/// Sends a message with what it carries, up to `inlineLimit` out-of-line bytes in the same packet.
/// The errno, or 0.
int SendComplex(int socket, const iovec& message, std::span<const Carried> body,
                std::size_t inlineLimit) {
  Outgoing outgoing;
  outgoing.parts[outgoing.partCount++] = message;
  for (const Carried& carried : body) {
    const bool added = carried.isPort ? AddPort(carried, outgoing)
                                      : AddMemory(socket, carried, inlineLimit, outgoing);
    if (!added) return ENOBUFS;
  }
  return Send(socket, outgoing);
}

}  // namespace

bool SendMessage(int socket, std::byte* message) {
  const auto header = wire::Load<wire::MessageHeader>(message);
  const iovec bytes{.iov_base = message, .iov_len = header.size};
  if ((header.bits & wire::kComplexBit) == 0) return SendBytes(socket, bytes) == 0;

  std::array<Carried, kMaxDescriptors> carried;
  std::array<Deallocation, kMaxDescriptors> handedOver;
  const auto count = wire::Load<std::uint32_t>(message + wire::kDescriptorCountOffset);
  if (count > kMaxDescriptors) return false;
  std::byte* descriptor = message + wire::kFirstDescriptorOffset;
  for (std::uint32_t index = 0; index < count; ++index) {
    carried[index].descriptor = descriptor;
    const auto type = wire::Load<std::uint8_t>(descriptor + wire::kDescriptorTypeOffset);
    if (type == wire::kPortDescriptorType) {
      carried[index].isPort = true;
      carried[index].port = wire::Load<PortName>(descriptor);
      descriptor += wire::kPortDescriptorSize;
    } else {
      carried[index].memory = RegionOf(descriptor);
      handedOver[index].note(descriptor);
      descriptor += wire::kOutOfLineDescriptorSize;
    }
  }
  const std::span<const Carried> body(carried.data(), count);
  int error = SendComplex(socket, bytes, body, kMaxInlineData);
  // A system with small socket buffers: what does not fit into a packet fits into memory.
  if (error == EMSGSIZE) error = SendComplex(socket, bytes, body, 0);
  return error == 0;
}

}  // namespace platform
