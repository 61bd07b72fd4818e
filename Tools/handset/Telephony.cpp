// SPDX-License-Identifier: Apache-2.0
//
// Sockets in, entries out. One thread, no lock.
#include "Tools/handset/Telephony.h"

#include <poll.h>
#include <sys/epoll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstring>
#include <ctime>
#include <optional>
#include <utility>

#include "Tools/handset/Failure.h"
#include "Tools/handset/UnixAddress.h"
#include "Tools/handset/UserDatabase.h"
#include "Tools/handset/WireMessage.h"

namespace handset {
namespace {

using platform::FileDescriptor;

std::string PathOf(const std::string& port) {
  return std::string(HALVEC_PORTS_DIRECTORY) + "/" + port;
}

struct Packet {
  std::string bytes;
  std::vector<FileDescriptor> rights;
};

/// The next packet; nothing where none is queued, or the other side is gone.
std::optional<Packet> Receive(int socket) {
  constexpr std::size_t kLongest = std::size_t{256} * 1024;
  constexpr std::size_t kMostRights = 253;  // the kernel's own limit, unix(7)
  Packet packet;
  packet.bytes.resize(kLongest);
  iovec vector{packet.bytes.data(), packet.bytes.size()};
  alignas(cmsghdr) std::array<char, CMSG_SPACE(kMostRights * sizeof(int))> control{};
  msghdr message{};
  message.msg_iov = &vector;
  message.msg_iovlen = 1;
  message.msg_control = control.data();
  message.msg_controllen = control.size();
  const ssize_t count = recvmsg(socket, &message, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
  if (count < 0) return std::nullopt;
  packet.bytes.resize(static_cast<std::size_t>(count));
  const cmsghdr* header = CMSG_FIRSTHDR(&message);
  if (header != nullptr && header->cmsg_type == SCM_RIGHTS) {
    for (std::size_t at = CMSG_LEN(0); at + sizeof(int) <= header->cmsg_len; at += sizeof(int)) {
      int descriptor = -1;
      std::memcpy(&descriptor, reinterpret_cast<const char*>(header) + at, sizeof descriptor);
      packet.rights.emplace_back(descriptor);
    }
  }
  return packet;
}

bool IsSequenced(int right) {
  int kind = 0;
  socklen_t size = sizeof kind;
  return getsockopt(right, SOL_SOCKET, SO_TYPE, &kind, &size) == 0 && kind == SOCK_SEQPACKET;
}

bool HasHungUp(int socket) {
  pollfd state{socket, 0, 0};
  return poll(&state, 1, 0) > 0 && (state.revents & POLLHUP) != 0;
}

void Send(int socket, const std::string& bytes) {
  // A peer that is gone or does not read loses what it is told.
  static_cast<void>(send(socket, bytes.data(), bytes.size(), MSG_DONTWAIT | MSG_NOSIGNAL));
}

}  // namespace

void Telephony::start() {
  if (!ports_.empty()) throw Failure("the telephony daemon runs already", 1);
  try {
    for (const char* name : {kUpdatePort, kConnectionPort, kRadioPort}) publish(name);
  } catch (const Failure&) {
    unpublish();
    throw;
  }
  isPaused_ = false;
  watchEverything();
}

void Telephony::publish(const char* name) {
  FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  if (!socket) throw Failure::FromErrno("socket");
  const std::string path = PathOf(name);
  BindAt(socket.get(), path);
  ports_.push_back({name, std::move(socket), 0});
  if (chown(path.c_str(), kTelephonyUser, kTelephonyGroup) != 0 || chmod(path.c_str(), 0660) != 0) {
    throw Failure::FromErrno("prepare " + path);
  }
}

void Telephony::requirePublished() const {
  if (ports_.empty()) throw Failure("the telephony daemon does not run", 1);
}

void Telephony::stop() {
  requirePublished();
  unpublish();
}

void Telephony::unpublish() {
  forgetEverything();
  for (const Port& port : ports_) unlink(PathOf(port.name).c_str());
  ports_.clear();
  connections_.clear();
}

void Telephony::pause() {
  requirePublished();
  isPaused_ = true;
  forgetEverything();
}

void Telephony::resume() {
  requirePublished();
  if (!std::exchange(isPaused_, false)) return;
  watchEverything();
  drain();
}

void Telephony::watchEverything() {
  for (Port& port : ports_) {
    port.watch =
        loop_.watch(port.socket.get(), EPOLLIN, [this, &port](std::uint32_t) { drainPort(port); });
  }
  for (const auto& [number, connection] : connections_) watchConnection(number);
}

void Telephony::forgetEverything() {
  for (Port& port : ports_) loop_.forget(std::exchange(port.watch, 0));
  for (auto& [number, connection] : connections_) {
    loop_.forget(std::exchange(connection.watch, 0));
  }
}

void Telephony::watchConnection(unsigned number) {
  Connection& connection = connections_.at(number);
  connection.watch = loop_.watch(connection.socket.get(), EPOLLIN,
                                 [this, number](std::uint32_t) { drainConnection(number); });
}

void Telephony::answerWith(std::int32_t domain, std::int32_t code) {
  answerDomain_ = domain;
  answerCode_ = code;
}

void Telephony::notify() {
  requirePublished();
  for (const auto& [number, connection] : connections_) {
    Send(connection.socket.get(), PayloadMessage(kNotifyMessage, {}));
  }
  isNotificationDue_ = true;
}

void Telephony::drain() {
  if (isPaused_) return;
  for (const Port& port : ports_) drainPort(port);
  for (auto next = connections_.begin(); next != connections_.end();) {
    // Draining a connection may close it.
    drainConnection((next++)->first);
  }
}

void Telephony::drainPort(const Port& port) {
  while (auto packet = Receive(port.socket.get())) {
    TelephonyEntry entry =
        DescribeTelephonyMessage(port.name, std::nullopt, packet->bytes, packet->rights.size());
    if (entry.id == kConnectMessage && entry.fault.empty()) {
      openConnection(std::move(packet->rights.front()), entry);
    }
    keep(std::move(entry));
  }
}

void Telephony::openConnection(FileDescriptor right, TelephonyEntry& entry) {
  if (!IsSequenced(right.get())) {
    entry.fault = "the right is no connection";
    return;
  }
  const unsigned number = ++lastConnection_;
  entry.connection = number;
  connections_[number].socket = std::move(right);
  watchConnection(number);
}

void Telephony::drainConnection(unsigned number) {
  const Connection& connection = connections_.at(number);
  // Asked before reading: what was sent before the other side went is still read.
  const bool isLast = HasHungUp(connection.socket.get());
  while (const auto packet = Receive(connection.socket.get())) {
    // What reads as empty is the end, or a packet of no bytes, which means nothing.
    if (packet->bytes.empty()) break;
    TelephonyEntry entry =
        DescribeTelephonyMessage(kConnectionPort, number, packet->bytes, packet->rights.size());
    if (entry.id == kCivicMessage) answerCivicCall(connection);
    keep(std::move(entry));
  }
  if (isLast) closeConnection(number);
}

void Telephony::closeConnection(unsigned number) {
  loop_.forget(connections_.at(number).watch);
  connections_.erase(number);
}

void Telephony::answerCivicCall(const Connection& connection) {
  if (std::exchange(isNotificationDue_, false)) {
    Send(connection.socket.get(), PayloadMessage(kNotifyMessage, {}));
  }
  const std::string result = WireWord(static_cast<std::uint32_t>(answerDomain_)) +
                             WireWord(static_cast<std::uint32_t>(answerCode_));
  Send(connection.socket.get(), PayloadMessage(kCivicAnswer, result));
}

void Telephony::keep(TelephonyEntry entry) {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  entry.nanoseconds = std::int64_t{now.tv_sec} * 1'000'000'000 + now.tv_nsec;
  entries_.push_back(std::move(entry));
  if (changed_) changed_();
}

}  // namespace handset
