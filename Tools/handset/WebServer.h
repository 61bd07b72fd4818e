// SPDX-License-Identifier: Apache-2.0
//
// The web server behind the links: nginx, https only, one folder for all host names. Runs in the
// world; its log comes to the event loop of the handset's first process. One thread, no lock.
#pragma once

#include <sys/types.h>

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Tools/handset/EventLoop.h"
#include "Tools/handset/World.h"

namespace handset {

/// The folder that is served.
inline constexpr const char* kWebFolder = "/run/handset/web";

class WebServer {
 public:
  /// Writes its configuration and opens its log; throws Failure. MakeCertificates was called.
  WebServer(EventLoop& loop, const World& world);

  /// From the return on connections are taken. Throws Failure where it runs already, or somebody
  /// else listens.
  void start();
  /// From the return on connections are refused, and those that were open are closed. Throws
  /// Failure where it does not run.
  void stop();

  /// To be called with every reaped child; says so on standard error if it was the server.
  void childEnded(pid_t pid);

  /// Takes the log lines that are queued now.
  void drain();

  /// One line per request: client address, host, request line, status, bytes of the body, and what
  /// encodings the client accepts.
  [[nodiscard]] const std::vector<std::string>& log() const { return log_; }

  /// Called after new lines came.
  void onRequest(std::function<void()> action) { changed_ = std::move(action); }

 private:
  EventLoop& loop_;
  const World& world_;
  platform::FileDescriptor logSocket_;
  std::optional<pid_t> process_;
  std::vector<std::string> log_;
  std::function<void()> changed_;
};

}  // namespace handset
