// SPDX-License-Identifier: Apache-2.0
//
// Addresses of Unix sockets by path. One thread, no lock.
#include "Tools/handset/UnixAddress.h"

#include <sys/socket.h>

#include "Helper/Platform/UnixSocketAddress.h"
#include "Tools/handset/Failure.h"

namespace handset {
namespace {

platform::UnixSocketAddress AddressOf(const std::string& path) {
  const platform::UnixSocketAddress address(path);
  if (!address) throw Failure(path + " is too long for a socket");
  return address;
}

}  // namespace

void BindAt(int socket, const std::string& path) {
  const auto address = AddressOf(path);
  if (bind(socket, address.get(), address.size()) != 0) {
    throw Failure::FromErrno("bind " + path);
  }
}

void ConnectTo(int socket, const std::string& path) {
  const auto address = AddressOf(path);
  if (connect(socket, address.get(), address.size()) != 0) {
    throw Failure::FromErrno("connect to " + path);
  }
}

}  // namespace handset
