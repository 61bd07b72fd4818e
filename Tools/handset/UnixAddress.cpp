// SPDX-License-Identifier: Apache-2.0
//
// Addresses of Unix sockets by path. One thread, no lock.
#include "Tools/handset/UnixAddress.h"

#include <sys/socket.h>
#include <sys/un.h>

#include <cstring>

#include "Tools/handset/Failure.h"

namespace handset {
namespace {

sockaddr_un AddressOf(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof address.sun_path) throw Failure(path + " is too long for a socket");
  std::memcpy(static_cast<char*>(address.sun_path), path.data(), path.size());
  return address;
}

}  // namespace

void BindAt(int socket, const std::string& path) {
  const sockaddr_un address = AddressOf(path);
  if (bind(socket, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
    throw Failure::FromErrno("bind " + path);
  }
}

void ConnectTo(int socket, const std::string& path) {
  const sockaddr_un address = AddressOf(path);
  if (connect(socket, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
    throw Failure::FromErrno("connect to " + path);
  }
}

}  // namespace handset
