// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/SystemLogSocket.h"

#include <unistd.h>

#include <algorithm>
#include <cstdio>

namespace platform {
namespace {

constexpr int kFacilityDaemon = 3;

}  // namespace

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
  if (socket_.deliver(std::array{head, text})) return;
  (void)socket_.deliver(std::array{head, text.substr(0, LogSocket::kLongestCutText)});
}

}  // namespace platform
