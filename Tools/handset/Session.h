// SPDX-License-Identifier: Apache-2.0
//
// The life of one handset, from its first process's side: assembles it, starts log capture,
// launcher and control, runs the command and reaps whatever ends. One thread, no lock.
#pragma once

#include <sys/types.h>

#include <memory>
#include <string>

#include "Helper/Platform/FileDescriptor.h"
#include "Tools/handset/Control.h"
#include "Tools/handset/EventLoop.h"
#include "Tools/handset/Launcher.h"
#include "Tools/handset/Options.h"
#include "Tools/handset/Surroundings.h"
#include "Tools/handset/SystemLogCapture.h"
#include "Tools/handset/Telephony.h"

namespace handset {

/// The helper that stands beside this tool in a build tree, or else the installed one; throws
/// Failure where there is neither.
[[nodiscard]] std::string DefaultHelper();

class Session {
 public:
  /// The caller is the first process of new namespaces (RunInNamespaces). Opens the host's files
  /// and assembles the handset; throws Failure.
  explicit Session(const RunOptions& options);

  /// Runs the command and everything around it until the command ends; returns its exit status,
  /// 128 + signal where a signal ended it. Throws Failure.
  [[nodiscard]] int run();

 private:
  void watchSignals();
  void takeSignals();
  void reap();
  void startCommand();
  void catchUp();
  void answerQuestions();

  const RunOptions& options_;
  std::string workingDirectory_;
  platform::FileDescriptor logFile_;
  platform::FileDescriptor eventsFile_;
  platform::FileDescriptor signals_;
  EventLoop loop_;
  std::unique_ptr<Surroundings> surroundings_;  ///< None without a network.
  SystemLogCapture capture_;
  Launcher launcher_;
  Telephony telephony_;
  Control control_;
  pid_t command_ = 0;
  int status_ = 0;
};

}  // namespace handset
