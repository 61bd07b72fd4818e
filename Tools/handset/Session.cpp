// SPDX-License-Identifier: Apache-2.0
//
// Process 1 of the handset. One thread, no lock.
#include "Tools/handset/Session.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/epoll.h>
#include <sys/signalfd.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <climits>
#include <cstdint>

#include "Tools/handset/Failure.h"
#include "Tools/handset/HelperQuestions.h"
#include "Tools/handset/Network.h"
#include "Tools/handset/Process.h"
#include "Tools/handset/Root.h"
#include "Tools/handset/TelephonyQuestions.h"
#include "Tools/handset/UserDatabase.h"

namespace handset {
namespace {

using platform::FileDescriptor;

/// Enough for a burst of log lines while the first process is busy elsewhere: a writer that does
/// not wait would lose them.
constexpr unsigned kLogQueue = 4096;

FileDescriptor OpenAppending(const std::string& path) {
  if (path.empty()) return {};
  FileDescriptor file(open(path.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0644));
  if (!file) throw Failure::FromErrno("open " + path);
  return file;
}

std::string CurrentDirectory() {
  std::array<char, PATH_MAX> path{};
  return getcwd(path.data(), path.size()) != nullptr ? path.data() : "/";
}

std::string LinkTarget(const char* link) {
  std::array<char, PATH_MAX> target{};
  const ssize_t length = readlink(link, target.data(), target.size());
  return length < 0 ? "" : std::string(target.data(), static_cast<std::size_t>(length));
}

}  // namespace

std::string DefaultHelper() {
  const std::string tool = LinkTarget("/proc/self/exe");
  const std::string folder = tool.substr(0, tool.find_last_of('/'));
  for (const std::string& path :
       {folder + "/../../Helper/HalvecMobileHelper", std::string(kHelperInside)}) {
    if (access(path.c_str(), X_OK) == 0) return path;
  }
  throw Failure("no helper found beside this tool or installed; name one with --helper");
}

Session::Session(const RunOptions& options)
    : options_(options),
      workingDirectory_(CurrentDirectory()),
      logFile_(OpenAppending(options.logFile)),
      eventsFile_(OpenAppending(options.eventsFile)),
      capture_(loop_, logFile_.get(), options.verbose),
      launcher_(loop_, kHelperInside, eventsFile_.get(), options.verbose),
      telephony_(loop_),
      control_(loop_, [this] { catchUp(); }) {
  umask(022);
  EnterRoot(options);
}

void Session::watchSignals() {
  sigset_t watched;
  sigemptyset(&watched);
  for (const int signal : {SIGCHLD, SIGTERM, SIGINT, SIGHUP}) sigaddset(&watched, signal);
  pthread_sigmask(SIG_BLOCK, &watched, nullptr);
  signals_.reset(signalfd(-1, &watched, SFD_CLOEXEC | SFD_NONBLOCK));
  if (!signals_) throw Failure::FromErrno("signalfd");
  // The watch lasts as long as the loop, and so does the descriptor.
  static_cast<void>(loop_.watch(signals_.get(), EPOLLIN, [this](std::uint32_t) { takeSignals(); }));
}

void Session::takeSignals() {
  signalfd_siginfo signal{};
  while (read(signals_.get(), &signal, sizeof signal) == sizeof signal) {
    const bool isFromTerminal = signal.ssi_code == SI_KERNEL;
    if (signal.ssi_signo != SIGCHLD && !isFromTerminal) {
      kill(command_, static_cast<int>(signal.ssi_signo));
    }
  }
  reap();
}

void Session::reap() {
  for (;;) {
    int waitStatus = 0;
    const pid_t pid = waitpid(-1, &waitStatus, WNOHANG);
    if (pid <= 0) return;
    if (pid == command_) {
      constexpr int kSignalBase = 128;
      status_ =
          WIFSIGNALED(waitStatus) ? kSignalBase + WTERMSIG(waitStatus) : WEXITSTATUS(waitStatus);
      loop_.stop();
    }
    launcher_.childEnded(pid, waitStatus);
    if (surroundings_) surroundings_->childEnded(pid);
  }
}

void Session::catchUp() {
  capture_.drain();
  reap();
  launcher_.lookAtPort();
  telephony_.drain();
  if (surroundings_) surroundings_->drain();
}

void Session::startCommand() {
  command_ = StartProgram(options_.command, [this] {
    // A folder that only the host has is no reason not to run.
    if (chdir(workingDirectory_.c_str()) != 0 && chdir("/") != 0) throw Failure::FromErrno("chdir");
    const User user = RequireUser(options_.user);
    Environment environment = EnvironmentOf(user, InheritedEnvironment());
    if (!options_.environmentUser.empty()) {
      environment = EnvironmentOf(RequireUser(options_.environmentUser), ServiceEnvironment());
    }
    AddInstalledToPath(environment);
    if (user.uid != 0) BecomeUser(user, PortGroup::kMember);
    return environment;
  });
}

void Session::answerQuestions() {
  AnswerAboutHelper(control_, launcher_, capture_);
  AnswerAboutTelephony(control_, telephony_);
  if (surroundings_) surroundings_->answerQuestions(control_);
  control_.open();
}

int Session::run() {
  Network network;
  network.bringUpLoopback();
  watchSignals();
  capture_.onEntry([this] { control_.lookAtWaits(); });
  launcher_.onChange([this] { control_.lookAtWaits(); });
  telephony_.onMessage([this] { control_.lookAtWaits(); });
  // Each socket takes the length of its queue from the setting at its creation, and for good.
  const unsigned kernelsOwn = network.datagramQueue();
  network.setDatagramQueue(kLogQueue);
  capture_.open();
  if (options_.hasNetwork) {
    surroundings_ = std::make_unique<Surroundings>(loop_, options_.webHosts,
                                                   [this] { control_.lookAtWaits(); });
  }
  network.setDatagramQueue(options_.queue.value_or(kernelsOwn));
  launcher_.open();
  if (options_.hasTelephony) telephony_.start();
  answerQuestions();
  startCommand();
  loop_.run();
  capture_.drain();
  return status_;
}

}  // namespace handset
