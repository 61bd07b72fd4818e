// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/ProcessFile.h"

#include <fcntl.h>
#include <linux/capability.h>

#include <array>
#include <cstdio>

#include "Helper/Platform/Linux/Capabilities.h"

namespace platform {

FileDescriptor OpenProcessFile(pid_t process, const char* name, int flags) {
  std::array<char, 64> path{};
  std::snprintf(path.data(), path.size(), "/proc/%d/%s", process, name);
  const CapabilityInEffect examination(CAP_SYS_PTRACE);
  return FileDescriptor(::open(path.data(), flags | O_CLOEXEC));
}

}  // namespace platform
