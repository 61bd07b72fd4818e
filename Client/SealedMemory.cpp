// SPDX-License-Identifier: Apache-2.0
//
// memfd: made with write(2) and fcntl(F_ADD_SEALS), read with pread(2).
#include "Client/SealedMemory.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

namespace halvec {
namespace {

constexpr int kRequiredSeals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE;
/// Asks for a memfd that can never be executed. From Linux 6.3 on; its value is part of the ABI.
constexpr unsigned kNotExecutable = 0x0008;

platform::FileDescriptor CreateMemory() {
  constexpr unsigned kFlags = MFD_CLOEXEC | MFD_ALLOW_SEALING;
  constexpr char kName[] = "halvec-request";
  platform::FileDescriptor memory(::memfd_create(kName, kFlags | kNotExecutable));
  // An older kernel refuses a flag that it does not know.
  if (!memory && errno == EINVAL) memory.reset(::memfd_create(kName, kFlags));
  return memory;
}

}  // namespace

Error SealBytes(std::span<const std::byte> bytes, platform::FileDescriptor& memory) {
  memory = CreateMemory();
  if (!memory) return Error::FromSystem(errno);
  while (!bytes.empty()) {
    const ssize_t written = ::write(memory.get(), bytes.data(), bytes.size());
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) return Error::FromSystem(written == 0 ? ENOSPC : errno);
    bytes = bytes.subspan(static_cast<std::size_t>(written));
  }
  if (::fcntl(memory.get(), F_ADD_SEALS, kRequiredSeals) != 0) return Error::FromSystem(errno);
  return {};
}

Error ReadSealedBytes(int memory, std::size_t size, Data& data) {
  constexpr Error kUnusable{HVMH_PROTOCOL_VIOLATION};
  if (size == 0 || size > kMaxOutOfLineBytes) return kUnusable;
  struct stat status {};
  if (::fstat(memory, &status) != 0 || !S_ISREG(status.st_mode)) return kUnusable;
  // The seals come before the size: only then can the size no longer change.
  const int seals = ::fcntl(memory, F_GET_SEALS);
  if (seals < 0 || (seals & kRequiredSeals) != kRequiredSeals) return kUnusable;
  if (::fstat(memory, &status) != 0 || status.st_size != static_cast<off_t>(size)) return kUnusable;
  if (!data.allocate(size)) return {HVMH_NO_MEMORY};
  std::size_t done = 0;
  while (done < size) {
    const ssize_t got =
        ::pread(memory, data.bytes().data() + done, size - done, static_cast<off_t>(done));
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return got < 0 ? Error::FromSystem(errno) : kUnusable;
    done += static_cast<std::size_t>(got);
  }
  return {};
}

}  // namespace halvec
