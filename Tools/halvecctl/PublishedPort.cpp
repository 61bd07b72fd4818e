// SPDX-License-Identifier: Apache-2.0
//
// A datagram socket bound beside the service socket (unix(7)).
#include "Tools/halvecctl/PublishedPort.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <system_error>

#include "Helper/Platform/PollTimeout.h"
#include "Helper/Platform/UnixSocketAddress.h"
#include "Helper/Shared/Interface/OneWayMessage.h"
#include "Tools/halvecctl/Exit.h"

namespace halvecctl {
namespace {

using platform::UnixSocketAddress;

std::string PathBeside(const std::string& servicePath, const std::string& name) {
  const std::size_t slash = servicePath.rfind('/');
  return (slash == std::string::npos ? "" : servicePath.substr(0, slash + 1)) + name;
}

platform::FileDescriptor MakeSocket() {
  platform::FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  if (!socket) throw Failure(ExitCode::kSystem, "cannot make a socket");
  return socket;
}

/// Removes the file that a killed program left; throws when somebody listens there.
void ClearName(const std::string& path, const UnixSocketAddress& address) {
  const platform::FileDescriptor probe = MakeSocket();
  if (::connect(probe.get(), address.get(), address.size()) == 0) {
    throw Failure(ExitCode::kSystem,
                  "another program holds " + path + " and is told what happens; do without --wait");
  }
  if (errno == ECONNREFUSED) (void)::unlink(path.c_str());  // the bind decides
}

}  // namespace

void AwaitPacket(int socket, int helper, std::chrono::steady_clock::time_point deadline) {
  for (;;) {
    std::array<pollfd, 2> entries{{{.fd = socket, .events = POLLIN, .revents = 0},
                                   {.fd = helper, .events = 0, .revents = 0}}};
    const int ready = ::poll(entries.data(), entries.size(), platform::MillisecondsUntil(deadline));
    if (ready == 0) throw Failure(ExitCode::kLost, "nothing was told in time");
    if (ready < 0) continue;
    if (entries[0].revents != 0) return;
    throw Failure(ExitCode::kLost, "the helper went away");
  }
}

PublishedPort::PublishedPort(const std::string& servicePath, const std::string& name)
    : path_(PathBeside(servicePath, name)), socket_(MakeSocket()) {
  const UnixSocketAddress address(path_);
  if (!address) throw UsageFailure("the socket's path is too long");
  ClearName(path_, address);
  const mode_t mask = ::umask(S_IXUSR | S_IXGRP | S_IRWXO);
  const int result = ::bind(socket_.get(), address.get(), address.size());
  const int error = errno;
  ::umask(mask);
  if (result != 0) {
    throw Failure(ExitCode::kSystem,
                  "cannot publish " + path_ + ": " + std::generic_category().message(error));
  }
}

PublishedPort::~PublishedPort() { (void)::unlink(path_.c_str()); }

std::vector<std::byte> PublishedPort::receive(int helper,
                                              std::chrono::steady_clock::time_point deadline) {
  std::vector<std::byte> datagram(wire::OneWaySize(wire::kOneWayPayloadLimit));
  for (;;) {
    AwaitPacket(socket_.get(), helper, deadline);
    const ssize_t length =
        ::recv(socket_.get(), datagram.data(), datagram.size(), MSG_DONTWAIT | MSG_TRUNC);
    if (length < 0) continue;
    datagram.resize(std::min(static_cast<std::size_t>(length), datagram.size()));
    return datagram;
  }
}

}  // namespace halvecctl
