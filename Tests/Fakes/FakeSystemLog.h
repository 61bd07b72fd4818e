// SPDX-License-Identifier: Apache-2.0
//
// A system log that keeps what was written, byte for byte. Any thread; one lock.
#pragma once

#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/SystemLog.h"

namespace fakes {

class FakeSystemLog final : public platform::SystemLog {
 public:
  using Line = std::pair<platform::LogPriority, std::string>;

  void write(platform::LogPriority priority, std::string_view text) override {
    const std::lock_guard guard(mutex_);
    lines_.emplace_back(priority, text);
  }

  /// Everything written since the last call.
  [[nodiscard]] std::vector<Line> takeLines() {
    const std::lock_guard guard(mutex_);
    return std::exchange(lines_, {});
  }

 private:
  std::mutex mutex_;
  std::vector<Line> lines_;
};

}  // namespace fakes
