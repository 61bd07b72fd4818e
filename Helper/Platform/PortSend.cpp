// SPDX-License-Identifier: Apache-2.0
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstring>

#include "Helper/Platform/PortMessage.h"
#include "Helper/Platform/TaskMemory.h"

namespace platform {
namespace {

constexpr std::size_t kMaxDescriptors = 2;
constexpr int kSeals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE | F_SEAL_SEAL;

/// A memfd that holds `size` bytes and can be changed by nobody any more; empty on failure.
FileDescriptor SealedCopy(const std::byte* bytes, std::size_t size) {
  FileDescriptor file(::memfd_create("message", MFD_CLOEXEC | MFD_ALLOW_SEALING));
  std::size_t done = 0;
  while (file && done < size) {
    const ssize_t count = ::write(file.get(), bytes + done, size - done);
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return {};
    done += static_cast<std::size_t>(count);
  }
  if (file && ::fcntl(file.get(), F_ADD_SEALS, kSeals) != 0) return {};
  return file;
}

/// A message on its way out: its parts and the descriptors that travel with it.
struct Outgoing {
  std::array<iovec, 1 + kMaxDescriptors> parts{};
  std::size_t partCount = 0;
  std::array<int, kMaxDescriptors> descriptors{};
  std::size_t descriptorCount = 0;
  std::array<SharedDescriptor, kMaxDescriptors> ports;
  std::array<FileDescriptor, kMaxDescriptors> files;
  std::size_t inlineSize = 0;
};

bool AddPort(std::byte* descriptor, Outgoing& outgoing) {
  const auto name = wire::Load<PortName>(descriptor);
  SharedDescriptor port = PortSendDescriptor(name);
  if (!port) return false;
  outgoing.descriptors[outgoing.descriptorCount] = port->get();
  outgoing.ports[outgoing.descriptorCount++] = std::move(port);
  wire::Store(descriptor, kPortNull);
  return true;
}

bool AddMemory(std::byte* descriptor, Outgoing& outgoing) {
  const auto address = wire::Load<std::uint64_t>(descriptor);
  const std::size_t size = wire::Load<std::uint32_t>(descriptor + wire::kOutOfLineCountOffset);
  auto* bytes = reinterpret_cast<std::byte*>(address);  // NOLINT: a region of ours
  std::uint64_t place = 0;
  if (size > kMaxInlineData - outgoing.inlineSize) {
    FileDescriptor file = size <= kMaxOutOfLineData ? SealedCopy(bytes, size) : FileDescriptor();
    if (!file) return false;
    place = 1;
    outgoing.descriptors[outgoing.descriptorCount] = file.get();
    outgoing.files[outgoing.descriptorCount++] = std::move(file);
  } else if (size > 0) {
    outgoing.parts[outgoing.partCount++] = {.iov_base = bytes, .iov_len = size};
    outgoing.inlineSize += size;
  }
  wire::Store(descriptor, place);
  return true;
}

bool Send(int socket, const Outgoing& outgoing) {
  if (outgoing.descriptorCount == 0 && outgoing.partCount == 1) {
    // The form of nearly every reply, and the cheaper call.
    const iovec& part = outgoing.parts.front();
    return ::send(socket, part.iov_base, part.iov_len, MSG_DONTWAIT | MSG_NOSIGNAL) >= 0;
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
  // Never waits: a receiver that does not read loses its message, nobody else loses time.
  return ::sendmsg(socket, &header, MSG_DONTWAIT | MSG_NOSIGNAL) >= 0;
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
    size_ = wire::Load<std::uint32_t>(descriptor + wire::kOutOfLineCountOffset);
  }

 private:
  VmAddress address_ = 0;
  std::size_t size_ = 0;
};

}  // namespace

bool SendMessage(int socket, std::byte* message) {
  const auto header = wire::Load<wire::MessageHeader>(message);
  Outgoing outgoing;
  outgoing.parts[outgoing.partCount++] = {.iov_base = message, .iov_len = header.size};
  if ((header.bits & wire::kComplexBit) == 0) return Send(socket, outgoing);

  std::array<Deallocation, kMaxDescriptors> handedOver;
  const auto count = wire::Load<std::uint32_t>(message + wire::kDescriptorCountOffset);
  if (count > kMaxDescriptors) return false;
  std::byte* descriptor = message + wire::kFirstDescriptorOffset;
  bool complete = true;
  for (std::uint32_t index = 0; index < count; ++index) {
    const auto type = wire::Load<std::uint8_t>(descriptor + wire::kDescriptorTypeOffset);
    if (type == wire::kPortDescriptorType) {
      complete = AddPort(descriptor, outgoing) && complete;
      descriptor += wire::kPortDescriptorSize;
    } else {
      handedOver[index].note(descriptor);
      complete = AddMemory(descriptor, outgoing) && complete;
      descriptor += wire::kOutOfLineDescriptorSize;
    }
  }
  return complete && Send(socket, outgoing);
}

}  // namespace platform
