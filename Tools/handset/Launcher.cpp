// SPDX-License-Identifier: Apache-2.0
//
// Start on demand, after the hand-over convention of sd_listen_fds(3). One thread, no lock.
#include "Tools/handset/Launcher.h"

#include <fcntl.h>
#include <linux/close_range.h>
#include <poll.h>
#include <signal.h>
#include <sys/epoll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <ctime>
#include <utility>

#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"
#include "Tools/handset/Json.h"
#include "Tools/handset/Process.h"
#include "Tools/handset/UnixAddress.h"
#include "Tools/handset/UserDatabase.h"

namespace handset {
namespace {

constexpr int kFirstHandedOver = 3;
/// So many instances in a row that end without having taken the message that they were started for
/// are a crash loop.
constexpr unsigned kMostUselessExits = 10;

/// In the child: the port becomes descriptor 3, everything behind it is closed.
Environment HandOver(int port) {
  // The number 3 may be the port's own already, and then dup2 would leave it close-on-exec.
  const int apart = fcntl(port, F_DUPFD_CLOEXEC, kFirstHandedOver + 1);
  if (apart < 0 || dup2(apart, kFirstHandedOver) < 0 ||
      close_range(kFirstHandedOver + 1, ~0U, 0) != 0) {
    throw Failure::FromErrno("hand the service port over");
  }
  // A session of its own, so that the terminal's interrupt key does not reach a system service.
  if (setsid() < 0) throw Failure::FromErrno("setsid");
  if (chdir("/") != 0) throw Failure::FromErrno("chdir /");
  umask(022);
  Environment environment = ServiceEnvironment();
  SetVariable(environment, "LISTEN_PID", std::to_string(getpid()));
  SetVariable(environment, "LISTEN_FDS", "1");
  SetVariable(environment, "LISTEN_FDNAMES", kServiceName);
  return environment;
}

}  // namespace

std::string Describe(const HelperExit& exit) {
  const std::string how = exit.signal != 0 ? "killed by signal " + std::to_string(exit.signal)
                                           : "exited " + std::to_string(exit.code);
  return how + " after " + std::to_string(exit.lived.count()) + " ms";
}

void Launcher::open() {
  const std::string directory = HALVEC_PORTS_DIRECTORY;
  MakeDirectories(directory);
  // The telephony daemon publishes ports of its own here; the sticky bit keeps it from the others'.
  if (chown(directory.c_str(), 0, kTelephonyGroup) != 0 || chmod(directory.c_str(), 01775) != 0) {
    throw Failure::FromErrno("prepare " + directory);
  }
  port_.reset(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  if (!port_) throw Failure::FromErrno("socket");
  const int on = 1;
  if (setsockopt(port_.get(), SOL_SOCKET, SO_PASSCRED, &on, sizeof on) != 0) {
    throw Failure::FromErrno("SO_PASSCRED");
  }
  const std::string path = directory + "/" + kServiceName;
  BindAt(port_.get(), path);
  if (chown(path.c_str(), 0, kTelephonyGroup) != 0 || chmod(path.c_str(), 0660) != 0) {
    throw Failure::FromErrno("prepare " + path);
  }
  watchPort();
}

void Launcher::watchPort() {
  loop_.forget(std::exchange(portWatch_, 0));
  portWatch_ = loop_.watch(port_.get(), EPOLLIN, [this](std::uint32_t) { lookAtPort(); });
}

bool Launcher::isMessageQueued() const {
  pollfd port{port_.get(), POLLIN, 0};
  return poll(&port, 1, 0) > 0 && (port.revents & POLLIN) != 0;
}

Launcher::FrontMessage Launcher::peekFrontMessage() const {
  std::vector<char> message(std::size_t{64} * 1024);
  iovec vector{message.data(), message.size()};
  // Room for the credentials and for nothing else: rights that come with the message are not
  // unpacked by a look at it.
  alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(ucred))> control{};
  msghdr header{};
  header.msg_iov = &vector;
  header.msg_iovlen = 1;
  header.msg_control = control.data();
  header.msg_controllen = control.size();
  const ssize_t count = recvmsg(port_.get(), &header, MSG_PEEK | MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
  if (count < 0) return std::nullopt;
  message.resize(static_cast<std::size_t>(count));
  message.insert(message.end(), control.begin(), control.end());
  return message;
}

void Launcher::lookAtPort() {
  if (!running_ && !isStopped_ && isMessageQueued()) start("message");
}

bool Launcher::startNow() {
  if (running_) return false;
  isStopped_ = false;
  uselessExits_ = 0;
  start("request");
  return true;
}

void Launcher::start(const char* reason) {
  // While a helper runs the messages are its own to read.
  loop_.forget(std::exchange(portWatch_, 0));
  startedFor_ = peekFrontMessage();
  startedAt_ = Clock::now();
  const int port = port_.get();
  running_ = StartProgram({program_}, [port] { return HandOver(port); });
  ++starts_;
  report("start", ",\"pid\":" + std::to_string(*running_) + ",\"reason\":" + JsonString(reason),
         "helper " + std::to_string(*running_) + " started (" + reason + ")");
}

bool Launcher::signalHelper(int signal) const { return running_ && kill(*running_, signal) == 0; }

void Launcher::childEnded(pid_t pid, int waitStatus) {
  if (running_ != pid) return;
  HelperExit exit;
  exit.pid = pid;
  exit.lived = std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - startedAt_);
  if (WIFSIGNALED(waitStatus)) {
    exit.signal = WTERMSIG(waitStatus);
  } else {
    exit.code = WEXITSTATUS(waitStatus);
  }
  running_.reset();
  ++exits_;
  last_ = exit;
  // However it ended: an instance that took its message is no loop, for the message is gone.
  const bool isUseless = startedFor_ && peekFrontMessage() == startedFor_;
  uselessExits_ = isUseless ? uselessExits_ + 1 : 0;
  isStopped_ = uselessExits_ >= kMostUselessExits;
  if (!isStopped_) watchPort();
  report("exit",
         ",\"pid\":" + std::to_string(pid) + ",\"code\":" + std::to_string(exit.code) +
             ",\"signal\":" + std::to_string(exit.signal) +
             ",\"lived_ms\":" + std::to_string(exit.lived.count()),
         "helper " + std::to_string(pid) + " " + Describe(exit));
  if (isStopped_) reportStop();
}

void Launcher::reportStop() {
  const std::string text = "the helper ended " + std::to_string(kMostUselessExits) +
                           " times in a row without serving a message; it is not started any more";
  report("stop", ",\"reason\":" + JsonString(text), text);
  if (!verbose_) static_cast<void>(std::fprintf(stderr, "handset: %s\n", text.c_str()));
}

LauncherStatus Launcher::status() const {
  return {running_, starts_, exits_, last_, isStopped_, isMessageQueued()};
}

void Launcher::report(const std::string& event, const std::string& fields,
                      const std::string& text) {
  if (verbose_) static_cast<void>(std::fprintf(stderr, "handset: %s\n", text.c_str()));
  if (eventsFile_ >= 0) {
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC, &now);
    const std::int64_t nanoseconds = std::int64_t{now.tv_sec} * 1'000'000'000 + now.tv_nsec;
    const std::string line = "{\"event\":" + JsonString(event) +
                             ",\"monotonic_ns\":" + std::to_string(nanoseconds) + fields + "}\n";
    if (!WriteAll(eventsFile_, line)) {
      static_cast<void>(std::fprintf(stderr, "handset: the events file takes no more\n"));
      eventsFile_ = -1;
    }
  }
  if (changed_) changed_();
}

}  // namespace handset
