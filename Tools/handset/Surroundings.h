// SPDX-License-Identifier: Apache-2.0
//
// What is around the handset when it has a network: the world, the links to it, and what listens
// there. Runs on the event loop of the handset's first process. One thread, no lock.
#pragma once

#include <sys/types.h>

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "Tools/handset/Capture.h"
#include "Tools/handset/Control.h"
#include "Tools/handset/EventLoop.h"
#include "Tools/handset/Links.h"
#include "Tools/handset/Web.h"
#include "Tools/handset/World.h"

namespace handset {

class Surroundings {
 public:
  /// Makes everything, with both links up, and a web of the names `webHosts` where there are any.
  /// `changed` is called whenever something that a question may wait for has happened. The caller
  /// is in the handset's own namespaces. Throws Failure.
  Surroundings(EventLoop& loop, const std::vector<std::string>& webHosts,
               std::function<void()> changed);

  /// Has `control` answer what is asked about all this.
  void answerQuestions(Control& control);

  /// Catches up with everything that happened before the call.
  void drain();

  /// To be called with every reaped child.
  void childEnded(pid_t pid);

 private:
  World world_;
  Links links_;
  Capture capture_;
  std::optional<Web> web_;
};

}  // namespace handset
