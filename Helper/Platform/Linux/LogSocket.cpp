// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/LogSocket.h"
#include "Helper/Platform/UnixSocketAddress.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/uio.h>

#include <array>
#include <cerrno>

namespace platform {
namespace {

constexpr int kPatienceMilliseconds = 50;
constexpr std::size_t kMaxParts = 4;

bool IsFull(int error) { return error == EAGAIN || error == EWOULDBLOCK || error == ENOBUFS; }

}  // namespace

bool LogSocket::connect() {
  const UnixSocketAddress address(path_);
  if (!address) return false;
  // The socket is kept where no daemon listens: making one anew for every lost line would cost more
  // than the line.
  if (!socket_) socket_.reset(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  connected_ = socket_ && ::connect(socket_.get(), address.get(), address.size()) == 0;
  return connected_;
}

/// 0 when the datagram is sent, else the error number.
int LogSocket::send(std::span<const std::string_view> parts) const {
  std::array<iovec, kMaxParts> vectors{};
  std::size_t count = 0;
  for (const std::string_view part : parts) {
    vectors[count++] = {.iov_base = const_cast<char*>(part.data()), .iov_len = part.size()};
  }
  msghdr message{};
  message.msg_iov = vectors.data();
  message.msg_iovlen = count;
  while (::sendmsg(socket_.get(), &message, MSG_DONTWAIT | MSG_NOSIGNAL) < 0) {
    if (errno != EINTR) return errno;
  }
  return 0;
}

bool LogSocket::deliver(std::span<const std::string_view> parts) {
  if (!connected_ && !connect()) return true;
  int error = send(parts);
  if (error == EMSGSIZE) return false;
  if (IsFull(error) && !dropping_) {
    pollfd writable{socket_.get(), POLLOUT, 0};
    static_cast<void>(::poll(&writable, 1, kPatienceMilliseconds));  // the second send decides
    error = send(parts);
  } else if (error != 0 && !IsFull(error)) {
    // The daemon is gone; a new one may listen under the same name.
    if (!connect()) return true;
    error = send(parts);
  }
  dropping_ = IsFull(error);
  return true;
}

}  // namespace platform
