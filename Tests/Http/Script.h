// SPDX-License-Identifier: Apache-2.0
//
// A Python script that serves a test: it runs while the object lives, and ends when its standard
// input does. One thread.
#pragma once

#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"

namespace support {

class Script {
 public:
  /// Starts the script and reads what it prints until an empty line or the end.
  explicit Script(std::vector<std::string> pathAndArguments);
  /// Waits for the end; a failed test when that was not a success.
  ~Script();
  Script(const Script&) = delete;
  Script& operator=(const Script&) = delete;

  [[nodiscard]] const std::vector<std::string>& lines() const { return lines_; }

 private:
  platform::FileDescriptor input_;  // whose end ends the script
  int process_ = -1;
  std::vector<std::string> lines_;
};

}  // namespace support
