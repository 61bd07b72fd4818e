// SPDX-License-Identifier: Apache-2.0
//
// Echo packets over raw ICMP sockets, which take CAP_NET_RAW. Any thread; the service has no state.
// The system's datagram ICMP sockets would put an identifier of their own into each request, strip
// the IPv4 header off each reply, and are refused by default even to the superuser.
#include <net/if.h>
#include <netdb.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <sys/time.h>

#include <cerrno>
#include <cstring>
#include <ctime>
#include <memory>
#include <vector>

#include "Helper/Platform/EchoService.h"
#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Linux/HandsetErrors.h"

namespace platform {
namespace {

EchoTransfer TransferOf(ssize_t length) {
  return {length, length < 0 ? HandsetErrorOf(errno) : handset::kNoError};
}

class RawEchoSocket final : public EchoSocket {
 public:
  explicit RawEchoSocket(FileDescriptor socket) : socket_(std::move(socket)) {}

  void setReceiveBuffer(std::int32_t bytes) override { (void)set(SO_RCVBUF, bytes); }

  void bindToInterface(std::uint32_t index) override {
    (void)set(SO_BINDTOIFINDEX, static_cast<int>(index));
  }

  bool setReceiveTimeout(EchoTime limit, HandsetError& error) override {
    const timeval value{.tv_sec = limit.seconds, .tv_usec = limit.microseconds};
    if (set(SO_RCVTIMEO, value)) return true;
    error = HandsetErrorOf(errno);
    return false;
  }

  EchoTransfer send(const EchoDestination& destination,
                    std::span<const std::byte> packet) override {
    if (destination.family != EchoDestination::kIpv4) {
      return {-1, handset::kAddressFamilyUnsupported};
    }
    sockaddr_in address{};
    address.sin_family = AF_INET;
    std::memcpy(&address.sin_addr, destination.address.data(), destination.address.size());
    return TransferOf(::sendto(socket_.get(), packet.data(), packet.size(), MSG_DONTWAIT,
                               reinterpret_cast<const sockaddr*>(&address), sizeof address));
  }

  EchoTransfer receive(std::span<std::byte> buffer) override {
    return TransferOf(::recv(socket_.get(), buffer.data(), buffer.size(), 0));
  }

  void close() override { socket_.reset(); }

 private:
  template <class Value>
  bool set(int option, const Value& value) {
    return ::setsockopt(socket_.get(), SOL_SOCKET, option, &value, sizeof value) == 0;
  }

  FileDescriptor socket_;
};

bool Read(clockid_t clock, EchoTime& now, HandsetError& error) {
  constexpr long kNanosecondsPerMicrosecond = 1000;
  timespec time{};
  if (::clock_gettime(clock, &time) != 0) {
    error = HandsetErrorOf(errno);
    return false;
  }
  now = {time.tv_sec, static_cast<std::int32_t>(time.tv_nsec / kNanosecondsPerMicrosecond)};
  return true;
}

class RawEchoService final : public EchoService {
 public:
  std::optional<EchoDestination> resolve(const char* host) override {
    addrinfo hints{};
    hints.ai_family = AF_INET;
    hints.ai_socktype = SOCK_RAW;
    addrinfo* found = nullptr;
    if (::getaddrinfo(host, nullptr, &hints, &found) != 0) return std::nullopt;
    const std::unique_ptr<addrinfo, decltype(&::freeaddrinfo)> owner(found, &::freeaddrinfo);
    sockaddr_in address{};
    std::memcpy(&address, found->ai_addr, sizeof address);
    EchoDestination destination{.family = EchoDestination::kIpv4};
    std::memcpy(destination.address.data(), &address.sin_addr, destination.address.size());
    return destination;
  }

  std::optional<std::int32_t> protocolNumber(const char* name) override {
    constexpr std::size_t kEntryLength = 4096;
    std::vector<char> storage(kEntryLength);
    protoent entry{};
    protoent* found = nullptr;
    if (::getprotobyname_r(name, &entry, storage.data(), storage.size(), &found) != 0 || !found) {
      return std::nullopt;
    }
    return found->p_proto;
  }

  std::unique_ptr<EchoSocket> open(std::int32_t protocol) override {
    FileDescriptor socket(::socket(AF_INET, SOCK_RAW | SOCK_CLOEXEC, protocol));
    if (!socket) return nullptr;
    return std::make_unique<RawEchoSocket>(std::move(socket));
  }

  std::uint32_t interfaceIndex(const char* name) override { return ::if_nametoindex(name); }

  bool timeOfDay(EchoTime& now, HandsetError& error) override {
    return Read(CLOCK_REALTIME, now, error);
  }
  bool uptime(EchoTime& now, HandsetError& error) override {
    return Read(CLOCK_MONOTONIC, now, error);
  }
};

}  // namespace

template <>
EchoService& DefaultProvider<EchoService>() {
  static auto& service = *new RawEchoService;
  return service;
}

}  // namespace platform
