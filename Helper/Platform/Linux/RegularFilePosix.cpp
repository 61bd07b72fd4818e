// SPDX-License-Identifier: Apache-2.0
//
// Reading a regular file through one descriptor. Any thread; no state.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "Helper/Platform/Linux/OpenRegularFile.h"
#include "Helper/Platform/RegularFile.h"

namespace platform {

int OpenRegularFile(const char* path, FileDescriptor& file, struct stat& status) {
  // Non-blocking, because opening a FIFO for reading would wait for its writer.
  file.reset(::open(path, O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
  if (!file || ::fstat(file.get(), &status) != 0) return errno;
  return S_ISREG(status.st_mode) ? 0 : EOPNOTSUPP;
}

std::optional<std::vector<std::byte>> ReadRegularFile(const char* path, std::size_t limit) {
  FileDescriptor file;
  struct stat status {};
  if (OpenRegularFile(path, file, status) != 0) return std::nullopt;
  const auto expected = static_cast<std::size_t>(std::max<off_t>(status.st_size, 0));
  if (expected > limit) return std::nullopt;
  // One byte more than expected, so that the end is seen without another resize.
  std::vector<std::byte> bytes(expected + 1);
  std::size_t length = 0;
  for (;;) {
    const ssize_t count = ::read(file.get(), bytes.data() + length, bytes.size() - length);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return std::nullopt;
    if (count == 0) break;
    length += static_cast<std::size_t>(count);
    if (length > limit) return std::nullopt;
    if (length == bytes.size()) bytes.resize(std::min(limit + 1, length * 2));
  }
  bytes.resize(length);
  return bytes;
}

}  // namespace platform
