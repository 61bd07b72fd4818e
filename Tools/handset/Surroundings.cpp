// SPDX-License-Identifier: Apache-2.0
//
// One thread, no lock.
#include "Tools/handset/Surroundings.h"

#include <utility>

#include "Tools/handset/Network.h"
#include "Tools/handset/NetworkQuestions.h"

namespace handset {

Surroundings::Surroundings(EventLoop& loop, std::function<void()> changed)
    : links_(world_), capture_(loop, world_) {
  world_.inside([] { Network().bringUpLoopback(); });
  for (const Link& link : AllLinks()) links_.add(link);
  capture_.onPacket(std::move(changed));
}

void Surroundings::answerQuestions(Control& control) {
  AnswerAboutNetwork(control, links_, capture_);
}

void Surroundings::drain() { capture_.drain(); }

}  // namespace handset
