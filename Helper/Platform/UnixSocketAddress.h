// SPDX-License-Identifier: Apache-2.0
//
// The address of a Unix socket that stands at a path. A value; any thread.
#pragma once

#include <sys/socket.h>
#include <sys/un.h>

#include <string_view>

namespace platform {

/// A path as the kernel takes it to bind, connect or send (unix(7)).
class UnixSocketAddress {
 public:
  /// False for a path that cannot be told to the kernel: an empty one, one with a zero in it, and
  /// one that with its terminator takes more than 108 bytes.
  explicit UnixSocketAddress(std::string_view path)
      : valid_(!path.empty() && path.size() < sizeof address_.sun_path &&
               path.find('\0') == std::string_view::npos) {
    address_.sun_family = AF_UNIX;
    if (valid_) path.copy(static_cast<char*>(address_.sun_path), path.size());
  }

  explicit operator bool() const { return valid_; }
  [[nodiscard]] const sockaddr* get() const { return reinterpret_cast<const sockaddr*>(&address_); }
  [[nodiscard]] static socklen_t size() { return sizeof(sockaddr_un); }

 private:
  sockaddr_un address_{};
  bool valid_;
};

}  // namespace platform
