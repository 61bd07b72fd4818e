// SPDX-License-Identifier: Apache-2.0
//
// The web as the handset sees it: a server, names for it, and an authority to believe. Runs on the
// event loop of the handset's first process. One thread, no lock.
#pragma once

#include <sys/types.h>

#include <functional>
#include <string>
#include <vector>

#include "Tools/handset/Control.h"
#include "Tools/handset/NameServer.h"
#include "Tools/handset/WebServer.h"

namespace handset {

class Web {
 public:
  /// Makes the certificates, has the handset resolve names in the world, and starts both servers.
  /// `hosts` are the names of the one web server. `changed` is called after each request. Throws
  /// Failure.
  Web(EventLoop& loop, const World& world, const std::vector<std::string>& hosts,
      std::function<void()> changed);

  /// Has `control` answer `handset web ...`.
  void answerQuestions(Control& control);

  void childEnded(pid_t pid) { server_.childEnded(pid); }
  void drain();

 private:
  void answer(Question& question, const Control::Words& words);

  NameServer names_;
  WebServer server_;
};

}  // namespace handset
