// SPDX-License-Identifier: Apache-2.0
//
// The handset's service launcher: creates and holds the helper's service port, starts the helper
// when a message waits there, and notes how each instance ended. It is written apart from the
// helper's own port layer, so that the two witness each other. Runs on the event loop of the
// handset's first process. One thread, no lock.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Tools/handset/EventLoop.h"

namespace handset {

inline constexpr const char* kServiceName = "com.zarvo.halvec.mobile-helper";

/// How one instance of the helper ended.
struct HelperExit {
  pid_t pid = 0;
  int code = 0;    ///< Exit status; 0 where a signal ended it.
  int signal = 0;  ///< 0 where it exited.
  std::chrono::milliseconds lived{0};
};

/// "exited 3" or "killed by signal 9", and how long it lived.
[[nodiscard]] std::string Describe(const HelperExit& exit);

struct LauncherStatus {
  std::optional<pid_t> running;
  unsigned starts = 0;
  unsigned exits = 0;
  std::optional<HelperExit> last;
  bool isStopped = false;        ///< By a crash loop; a start on request lifts it.
  bool isMessageQueued = false;  ///< The service port is readable now.
};

class Launcher {
 public:
  /// Starts `program`, which stands inside the handset. Events go to `eventsFile` as JSON lines,
  /// where that is a descriptor, and to standard error where `verbose` says so.
  Launcher(EventLoop& loop, std::string program, int eventsFile, bool verbose)
      : loop_(loop), program_(std::move(program)), eventsFile_(eventsFile), verbose_(verbose) {}

  /// Creates the folder of named ports and the service port in it (a datagram socket, 0660, of the
  /// telephony daemon's group, credentials on before anybody can reach it) and starts to watch it;
  /// throws Failure.
  void open();

  /// Starts the helper if a message waits and none runs: what the loop would do by itself a little
  /// later.
  void lookAtPort();

  /// Starts the helper without a message; false where one runs already.
  [[nodiscard]] bool startNow();

  /// Sends the running helper a signal; false where none runs.
  [[nodiscard]] bool signalHelper(int signal) const;

  /// To be called with every reaped child, with its wait status (wait(2)); another's is ignored.
  void childEnded(pid_t pid, int waitStatus);

  [[nodiscard]] LauncherStatus status() const;

  /// Called after a start, an exit and a stop.
  void onChange(std::function<void()> action) { changed_ = std::move(action); }

 private:
  using Clock = EventLoop::Clock;
  /// The first message of the port's queue: its bytes and its sender.
  using FrontMessage = std::optional<std::vector<char>>;

  void start(const char* reason);
  void watchPort();
  [[nodiscard]] bool isMessageQueued() const;
  [[nodiscard]] FrontMessage peekFrontMessage() const;
  void reportStop();
  void report(const std::string& event, const std::string& fields, const std::string& text);

  EventLoop& loop_;
  std::string program_;
  int eventsFile_;
  bool verbose_;
  platform::FileDescriptor port_;
  EventLoop::Ticket portWatch_ = 0;
  std::optional<pid_t> running_;
  Clock::time_point startedAt_;
  FrontMessage startedFor_;
  unsigned starts_ = 0;
  unsigned exits_ = 0;
  std::optional<HelperExit> last_;
  unsigned uselessExits_ = 0;  ///< In a row.
  bool isStopped_ = false;
  std::function<void()> changed_;
};

}  // namespace handset
