// SPDX-License-Identifier: Apache-2.0
//
// unshare and the life line between the two sides. One thread, no lock.
#include "Tools/handset/Namespaces.h"

#include <fcntl.h>
#include <poll.h>
#include <sched.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <string_view>

#include "Helper/Platform/FileDescriptor.h"
#include "Tools/handset/Failure.h"

namespace handset {
namespace {

using platform::FileDescriptor;

constexpr int kInside = CLONE_NEWNS | CLONE_NEWNET | CLONE_NEWUTS | CLONE_NEWIPC;
constexpr std::string_view kHostName = "handset";

bool HasEnded(const FileDescriptor& process) {
  pollfd end{process.get(), POLLIN, 0};
  return poll(&end, 1, 0) > 0;
}

int StatusOf(int waitStatus) {
  constexpr int kSignalBase = 128;
  return WIFSIGNALED(waitStatus) ? kSignalBase + WTERMSIG(waitStatus) : WEXITSTATUS(waitStatus);
}

int WaitAndPassSignalsOn(pid_t child, const sigset_t& watched) {
  for (;;) {
    siginfo_t signal{};
    if (sigwaitinfo(&watched, &signal) < 0) continue;
    // The terminal tells everybody inside by itself.
    if (signal.si_signo != SIGCHLD && signal.si_code == SI_USER) kill(child, signal.si_signo);
    int waitStatus = 0;
    if (waitpid(child, &waitStatus, WNOHANG) == child) return StatusOf(waitStatus);
  }
}

void BecomeFirstProcess(const FileDescriptor& parent) {
  if (prctl(PR_SET_PDEATHSIG, SIGKILL) != 0) throw Failure::FromErrno("prctl");
  // A parent that died before the line above sends nothing any more.
  if (HasEnded(parent)) throw Failure("the parent is gone");
  if (unshare(kInside) != 0) throw Failure::FromErrno("unshare");
  if (sethostname(kHostName.data(), kHostName.size()) != 0) throw Failure::FromErrno("sethostname");
}

}  // namespace

std::optional<std::string> WhyNoHandset() {
  if (geteuid() != 0) {
    return "must be run as root: it makes namespaces of its own and runs programs as uid 501";
  }
  const pid_t child = fork();
  if (child == 0) _exit(unshare(CLONE_NEWPID | kInside) == 0 ? 0 : errno);
  int waitStatus = 0;
  if (child < 0 || waitpid(child, &waitStatus, 0) != child) return "cannot fork";
  if (StatusOf(waitStatus) == 0) return std::nullopt;
  return "root may not make namespaces here (CAP_SYS_ADMIN is needed): " +
         std::generic_category().message(StatusOf(waitStatus));
}

int RunInNamespaces(const std::function<int()>& first) {
  sigset_t watched;
  sigemptyset(&watched);
  for (const int signal : {SIGCHLD, SIGTERM, SIGINT, SIGHUP}) sigaddset(&watched, signal);
  sigset_t before;
  pthread_sigmask(SIG_BLOCK, &watched, &before);
  const FileDescriptor ownNamespace(open("/proc/self/ns/pid", O_RDONLY | O_CLOEXEC));
  if (!ownNamespace) throw Failure::FromErrno("open /proc/self/ns/pid");
  FileDescriptor parent(static_cast<int>(syscall(SYS_pidfd_open, getpid(), 0)));
  if (!parent) throw Failure::FromErrno("pidfd_open");
  if (unshare(CLONE_NEWPID) != 0) throw Failure::FromErrno("unshare");
  const pid_t child = fork();
  if (child < 0) throw Failure::FromErrno("fork");
  if (child == 0) {
    BecomeFirstProcess(parent);
    return first();
  }
  // Back to the own one, in which helpers of this process may be forked again.
  if (setns(ownNamespace.get(), CLONE_NEWPID) != 0) {
    kill(child, SIGKILL);
    throw Failure::FromErrno("setns");
  }
  const int status = WaitAndPassSignalsOn(child, watched);
  pthread_sigmask(SIG_SETMASK, &before, nullptr);
  return status;
}

}  // namespace handset
