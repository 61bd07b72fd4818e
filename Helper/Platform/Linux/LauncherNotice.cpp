// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/LauncherNotice.h"

#include <sys/socket.h>
#include <sys/un.h>

#include <cstddef>
#include <cstdlib>
#include <string_view>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {

void TellLauncherReady() {
  const char* variable = std::getenv("NOTIFY_SOCKET");  // NOLINT(concurrency-mt-unsafe): start-up
  const std::string_view name = variable ? variable : "";
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  char* path = static_cast<char*>(address.sun_path);
  if (name.size() < 2 || name.size() >= sizeof address.sun_path) return;
  if (name.front() != '/' && name.front() != '@') return;
  name.copy(path, name.size());
  if (path[0] == '@') path[0] = '\0';
  const auto length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + name.size());
  const FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  constexpr std::string_view kReady = "READY=1";
  // The launcher waits for this message, so unlike others it may wait for the launcher.
  (void)!::sendto(socket.get(), kReady.data(), kReady.size(), MSG_NOSIGNAL,
                  reinterpret_cast<const sockaddr*>(&address), length);
}

}  // namespace platform
