// SPDX-License-Identifier: Apache-2.0
//
// The log daemon's socket, and the provider that uses the one of this system.
#include "Helper/Platform/Linux/SystemLogSocket.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/uio.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>

namespace platform {

namespace {

constexpr int kFacilityDaemon = 3;
constexpr int kPatienceMilliseconds = 50;
constexpr std::size_t kLongestCutText = std::size_t{64} << 10;

bool IsFull(int error) { return error == EAGAIN || error == EWOULDBLOCK || error == ENOBUFS; }

}  // namespace

bool SystemLogSocket::connect() {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path_.size() >= sizeof address.sun_path) return false;
  std::memcpy(address.sun_path, path_.data(), path_.size());
  // The socket is kept where no daemon listens: making one anew for every lost line would cost more
  // than the line.
  if (!socket_) socket_.reset(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  connected_ = socket_ && ::connect(socket_.get(), reinterpret_cast<const sockaddr*>(&address),
                                    sizeof address) == 0;
  return connected_;
}

int SystemLogSocket::send(std::string_view head, std::string_view text) const {
  std::array<iovec, 2> parts{{{const_cast<char*>(head.data()), head.size()},
                              {const_cast<char*>(text.data()), text.size()}}};
  msghdr message{};
  message.msg_iov = parts.data();
  message.msg_iovlen = parts.size();
  while (::sendmsg(socket_.get(), &message, MSG_DONTWAIT | MSG_NOSIGNAL) < 0) {
    if (errno != EINTR) return errno;
  }
  return 0;
}

std::string_view SystemLogSocket::timeStamp() {
  const std::time_t now = std::time(nullptr);
  if (now != stampedSecond_) {
    constexpr std::array kMonths{"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                 "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
    std::tm local{};
    // Unlike localtime, this one does not look at the zone file again for every line.
    if (::localtime_r(&now, &local) == nullptr) return {};
    const int length = std::snprintf(stamp_.data(), stamp_.size(), "%s %2d %02d:%02d:%02d",
                                     kMonths[static_cast<std::size_t>(local.tm_mon)], local.tm_mday,
                                     local.tm_hour, local.tm_min, local.tm_sec);
    stampLength_ = std::min(static_cast<std::size_t>(std::max(length, 0)), stamp_.size() - 1);
    stampedSecond_ = now;
  }
  return {stamp_.data(), stampLength_};
}

void SystemLogSocket::write(LogPriority priority, std::string_view text) {
  const std::lock_guard lock(mutex_);
  const std::string_view stamp = timeStamp();
  std::array<char, 128> buffer;
  const int length = std::snprintf(
      buffer.data(), buffer.size(),
      "<%d>%.*s HalvecMobileHelper[%d]: ", kFacilityDaemon * 8 + static_cast<int>(priority),
      static_cast<int>(stamp.size()), stamp.data(), ::getpid());
  const std::string_view head(buffer.data(), static_cast<std::size_t>(std::max(length, 0)));

  if (!connected_ && !connect()) return;
  int error = send(head, text);
  if (error == EMSGSIZE) {
    text = text.substr(0, kLongestCutText);
    error = send(head, text);
  }
  if (IsFull(error) && !dropping_) {
    pollfd writable{socket_.get(), POLLOUT, 0};
    static_cast<void>(::poll(&writable, 1, kPatienceMilliseconds));  // the second send decides
    error = send(head, text);
  } else if (error != 0 && !IsFull(error)) {
    // The daemon is gone; a new one may listen under the same name.
    if (!connect()) return;
    error = send(head, text);
  }
  dropping_ = IsFull(error);
}

template <>
SystemLog& DefaultProvider<SystemLog>() {
  static SystemLog& log = *new SystemLogSocket("/dev/log");
  return log;
}

}  // namespace platform
