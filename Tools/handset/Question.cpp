// SPDX-License-Identifier: Apache-2.0
//
// The answer is kept as packets from the start, so that a slow asker costs a queue and no time.
// One thread, no lock.
#include "Tools/handset/Question.h"

#include <utility>

namespace handset {

void Question::add(char stream, std::string_view text) {
  while (!text.empty()) {
    const std::string_view part = text.substr(0, kLongestPacket - 1);
    packets_.push_back(stream + std::string(part));
    text.remove_prefix(part.size());
  }
}

void Question::say(std::string_view text) { add(kOutputPacket, text); }

void Question::complain(std::string_view text) {
  add(kErrorPacket, "handset: " + std::string(text) + "\n");
}

void Question::finish(int status) {
  isFinished_ = true;
  step_ = nullptr;
  packets_.push_back({kExitPacket, static_cast<char>(status)});
}

void Question::wait(std::optional<int> milliseconds, Step step) {
  limit_ = milliseconds;
  step_ = std::move(step);
  lookAgain();
}

void Question::lookAgain() {
  // A copy: the step that finishes the question ends the function that is running.
  const Step step = step_;
  if (step) step(*this);
}

}  // namespace handset
