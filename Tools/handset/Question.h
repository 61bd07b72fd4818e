// SPDX-License-Identifier: Apache-2.0
//
// One question that a command inside the handset asked its first process, and the answer as far as
// it is known. The control socket carries both; whoever answers sees only this. One thread, no
// lock.
#pragma once

#include <deque>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace handset {

class Question {
 public:
  /// What looks whether the awaited event has come, and then finishes the question.
  using Step = std::function<void(Question&)>;

  /// Adds to what the asker prints on its standard output.
  void say(std::string_view text);
  /// Adds a line to what the asker prints on its standard error.
  void complain(std::string_view text);
  /// Ends the answer; `status` becomes the asker's exit status.
  void finish(int status = 0);
  [[nodiscard]] bool isFinished() const { return isFinished_; }

  /// Calls `step` now, and after every change in the handset until it finishes the question. After
  /// `milliseconds`, where given, the question ends by itself as timed out.
  void wait(std::optional<int> milliseconds, Step step);
  [[nodiscard]] std::optional<int> limit() const { return limit_; }
  /// Calls the step of a question that still waits.
  void lookAgain();

  /// The packets of the answer that are not sent yet (their form: Control.h).
  [[nodiscard]] std::deque<std::string>& packets() { return packets_; }

 private:
  void add(char stream, std::string_view text);

  std::deque<std::string> packets_;
  Step step_;
  std::optional<int> limit_;
  bool isFinished_ = false;
};

/// The first byte of a packet.
inline constexpr char kOutputPacket = 'O';
inline constexpr char kErrorPacket = 'E';
inline constexpr char kExitPacket = 'X';
inline constexpr std::size_t kLongestPacket = std::size_t{32} * 1024;

}  // namespace handset
