// SPDX-License-Identifier: Apache-2.0
//
// A network in memory: what a test lets arrive is received after the delay that it gives, on a
// clock that only receiving moves. Any thread; one lock, shared by the service and its sockets.
#pragma once

#include <algorithm>
#include <cstring>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "Helper/Platform/EchoService.h"

namespace fakes {

class FakeEchoService final : public platform::EchoService {
 public:
  using Packet = std::vector<std::byte>;

  /// One packet, or one error, `delay` microseconds after the receive before it returned.
  struct Arrival {
    std::int64_t delay = 0;
    Packet packet;
    platform::HandsetError error = platform::handset::kNoError;
    std::int64_t length = 0;  // negative: the receive fails with `error`
  };
  struct Sent {
    Packet packet;
    platform::EchoDestination destination;
    std::uint32_t interface = 0;  // 0: not bound
    friend bool operator==(const Sent& left, const Sent& right) {
      return left.packet == right.packet && left.destination.address == right.destination.address &&
             left.interface == right.interface;
    }
  };
  /// What shall go wrong. An error of 0 is a failure without a reason.
  struct Faults {
    bool open = false;
    std::optional<platform::HandsetError> receiveTimeout;
    std::optional<platform::HandsetError> timeOfDay;
    std::optional<platform::HandsetError> send;
    std::optional<std::int64_t> sendLength;
    /// The reading of the uptime that fails, counted from 1, and its error.
    std::optional<std::pair<int, platform::HandsetError>> uptime;
  };

  /// Set by a test before another thread uses the service.
  Faults faults;
  std::map<std::string, std::int32_t> protocols{{"icmp", 1}};
  std::map<std::string, std::uint32_t> interfaces{{"pdp_ip0", 7}};
  std::map<std::string, std::array<std::uint8_t, 4>> hosts;
  platform::EchoTime wallClock{.seconds = 1'700'000'000, .microseconds = 654'321};
  /// Called with each request that is sent; what it gives arrives.
  std::function<std::vector<Arrival>(const Packet&)> network;

  [[nodiscard]] std::vector<Sent> takeSent() {
    return locked([&] { return std::exchange(sent_, {}); });
  }
  [[nodiscard]] std::int64_t uptimeMicroseconds() {
    return locked([&] { return uptime_; });
  }
  [[nodiscard]] int openSockets() {
    return locked([&] { return open_; });
  }
  [[nodiscard]] int opened() {
    return locked([&] { return opened_; });
  }
  [[nodiscard]] int closeCalls() {
    return locked([&] { return closeCalls_; });
  }
  [[nodiscard]] int receives() {
    return locked([&] { return receives_; });
  }
  [[nodiscard]] std::int32_t receiveBuffer() {
    return locked([&] { return receiveBuffer_; });
  }
  [[nodiscard]] std::int32_t protocol() {
    return locked([&] { return protocol_; });
  }
  [[nodiscard]] platform::EchoTime receiveTimeout() {
    return locked([&] { return timeout_; });
  }

  std::optional<platform::EchoDestination> resolve(const char* host) override {
    const auto found = hosts.find(host);
    if (found == hosts.end()) return std::nullopt;
    return platform::EchoDestination{.family = platform::EchoDestination::kIpv4,
                                     .address = found->second};
  }
  std::optional<std::int32_t> protocolNumber(const char* name) override {
    const auto found = protocols.find(name);
    return found == protocols.end() ? std::nullopt : std::optional(found->second);
  }
  std::unique_ptr<platform::EchoSocket> open(std::int32_t protocol) override {
    if (faults.open) return nullptr;
    locked([&] {
      protocol_ = protocol;
      ++open_;
      ++opened_;
      arrivals_.clear();
    });
    return std::make_unique<Socket>(*this);
  }
  std::uint32_t interfaceIndex(const char* name) override {
    const auto found = interfaces.find(name);
    return found == interfaces.end() ? 0 : found->second;
  }
  bool timeOfDay(platform::EchoTime& now, platform::HandsetError& error) override {
    now = wallClock;
    if (faults.timeOfDay) error = *faults.timeOfDay;
    return !faults.timeOfDay;
  }
  bool uptime(platform::EchoTime& now, platform::HandsetError& error) override {
    return locked([&] {
      ++uptimeReadings_;
      now = {uptime_ / kSecond, static_cast<std::int32_t>(uptime_ % kSecond)};
      if (!faults.uptime || faults.uptime->first != uptimeReadings_) return true;
      error = faults.uptime->second;
      return false;
    });
  }

 private:
  static constexpr std::int64_t kSecond = 1'000'000;

  class Socket final : public platform::EchoSocket {
   public:
    explicit Socket(FakeEchoService& service) : service_(service) {}
    ~Socket() override {
      service_.locked([&] { closeOnce(); });
    }
    void setReceiveBuffer(std::int32_t bytes) override {
      service_.locked([&] { service_.receiveBuffer_ = bytes; });
    }
    void bindToInterface(std::uint32_t index) override { interface_ = index; }
    bool setReceiveTimeout(platform::EchoTime limit, platform::HandsetError& error) override {
      service_.locked([&] { service_.timeout_ = limit; });
      timeout_ = limit.seconds * kSecond + limit.microseconds;
      if (service_.faults.receiveTimeout) error = *service_.faults.receiveTimeout;
      return !service_.faults.receiveTimeout;
    }
    platform::EchoTransfer send(const platform::EchoDestination& destination,
                                std::span<const std::byte> packet) override {
      if (closed_) return {-1, platform::handset::kBadDescriptor};
      if (destination.family != platform::EchoDestination::kIpv4) {
        return {-1, platform::handset::kAddressFamilyUnsupported};
      }
      if (service_.faults.send) return {-1, *service_.faults.send};
      const Packet bytes(packet.begin(), packet.end());
      return service_.locked([&]() -> platform::EchoTransfer {
        service_.sent_.push_back({bytes, destination, interface_});
        if (service_.network) {
          for (Arrival& arrival : service_.network(bytes)) {
            service_.arrivals_.push_back(std::move(arrival));
          }
        }
        return {service_.faults.sendLength.value_or(static_cast<std::int64_t>(bytes.size())), 0};
      });
    }
    platform::EchoTransfer receive(std::span<std::byte> buffer) override {
      if (closed_) return {-1, platform::handset::kBadDescriptor};
      return service_.locked([&] { return receiveNext(buffer); });
    }
    void close() override {
      service_.locked([&] {
        ++service_.closeCalls_;
        closeOnce();
      });
    }

   private:
    void closeOnce() {
      if (!std::exchange(closed_, true)) --service_.open_;
    }
    platform::EchoTransfer receiveNext(std::span<std::byte> buffer) {
      ++service_.receives_;
      auto& arrivals = service_.arrivals_;
      if (arrivals.empty() || arrivals.front().delay > timeout_) {
        if (!arrivals.empty()) arrivals.front().delay -= timeout_;
        service_.uptime_ += timeout_;
        return {-1, platform::handset::kWouldBlock};
      }
      const Arrival arrival = std::move(arrivals.front());
      arrivals.pop_front();
      service_.uptime_ += arrival.delay;
      if (arrival.length < 0) return {arrival.length, arrival.error};
      const std::size_t length = std::min(arrival.packet.size(), buffer.size());
      std::copy_n(arrival.packet.begin(), length, buffer.begin());
      return {static_cast<std::int64_t>(length), 0};
    }

    FakeEchoService& service_;
    std::uint32_t interface_ = 0;
    std::int64_t timeout_ = 0;
    bool closed_ = false;
  };

  template <class Work>
  std::invoke_result_t<Work> locked(Work work) {
    const std::lock_guard guard(mutex_);
    return work();
  }

  std::mutex mutex_;
  // Under mutex_:
  std::vector<Sent> sent_;
  std::deque<Arrival> arrivals_;
  std::int64_t uptime_ = 5'300'000;
  int uptimeReadings_ = 0;
  int open_ = 0;
  int opened_ = 0;
  int closeCalls_ = 0;
  int receives_ = 0;
  std::int32_t receiveBuffer_ = 0;
  std::int32_t protocol_ = 0;
  platform::EchoTime timeout_;
};

/// The packet that a host answers `request` with, behind an IPv4 header of `headerWords` words.
[[nodiscard]] inline FakeEchoService::Packet EchoReplyTo(const FakeEchoService::Packet& request,
                                                         std::size_t headerWords = 5) {
  FakeEchoService::Packet packet(headerWords * 4);
  packet[0] = static_cast<std::byte>(0x40 | headerWords);
  packet.insert(packet.end(), request.begin(), request.end());
  packet[headerWords * 4] = std::byte{0};
  return packet;
}

}  // namespace fakes
