// SPDX-License-Identifier: Apache-2.0
//
// One thread, no lock.
#include "Tools/handset/Surroundings.h"

#include <utility>

#include "Tools/handset/NetworkQuestions.h"

namespace handset {

Surroundings::Surroundings(EventLoop& loop, const std::vector<std::string>& webHosts,
                           std::function<void()> changed)
    : links_(world_), capture_(loop, world_) {
  for (const Link& link : AllLinks()) links_.add(link);
  capture_.onPacket(changed);
  if (!webHosts.empty()) web_.emplace(loop, world_, webHosts, std::move(changed));
}

void Surroundings::answerQuestions(Control& control) {
  AnswerAboutNetwork(control, links_, capture_);
  if (web_) web_->answerQuestions(control);
}

void Surroundings::drain() {
  capture_.drain();
  if (web_) web_->drain();
}

void Surroundings::childEnded(pid_t pid) {
  if (web_) web_->childEnded(pid);
}

}  // namespace handset
