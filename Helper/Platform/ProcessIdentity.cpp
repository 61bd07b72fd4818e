// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/ProcessIdentity.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/vfs.h>

#include <array>
#include <cstdlib>
#include <string_view>

#include "Helper/Platform/Linux/ProcessFile.h"

namespace platform {
namespace {

constexpr long kPidFileSystem = 0x50494446;

/// Field 22 of /proc/PID/stat (proc(5)): start time in clock ticks since boot.
std::uint32_t StartTime(pid_t process) {
  const FileDescriptor file = OpenProcessFile(process, "stat", O_RDONLY);
  std::array<char, 1024> content{};
  const ssize_t length = file ? ::read(file.get(), content.data(), content.size() - 1) : -1;
  if (length <= 0) return 0;
  // The command name, in parentheses, may hold anything: count fields from the last parenthesis.
  const std::string_view text(content.data(), static_cast<std::size_t>(length));
  std::size_t at = text.rfind(')');
  for (int field = 2; field < 22 && at != std::string_view::npos; ++field) {
    at = text.find(' ', at + 1);
  }
  if (at == std::string_view::npos) return 0;
  return static_cast<std::uint32_t>(std::strtoull(text.data() + at, nullptr, 10));
}

}  // namespace

FileDescriptor OpenPidfd(pid_t process) {
  return FileDescriptor(static_cast<int>(::syscall(SYS_pidfd_open, process, 0)));
}

std::uint32_t ProcessVersion(int pidfd, pid_t process) {
  struct statfs fileSystem {};
  struct stat status {};
  if (::fstatfs(pidfd, &fileSystem) == 0 && fileSystem.f_type == kPidFileSystem &&
      ::fstat(pidfd, &status) == 0) {
    return static_cast<std::uint32_t>(status.st_ino);
  }
  return StartTime(process);
}

bool HasExited(int pidfd) {
  pollfd entry{.fd = pidfd, .events = POLLIN, .revents = 0};
  return ::poll(&entry, 1, 0) != 0;
}

}  // namespace platform
