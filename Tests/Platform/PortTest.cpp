// SPDX-License-Identifier: Apache-2.0
//
// Names, rights and user references; check-in; watchers of a port's death.
#include "Helper/Platform/Port.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <signal.h>
#include <sys/mount.h>
#include <sys/ptrace.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>

#include <algorithm>
#include <filesystem>
#include <initializer_list>
#include <iterator>

#include "Helper/Platform/PortWatcher.h"
#include "Helper/Platform/ProcessIdentity.h"
#include "Helper/Platform/RunLoop.h"
#include "Tests/Fakes/ManualClock.h"
#include "Tests/Support/WireClient.h"

namespace {

using namespace platform;
using support::LauncherSocket;

TEST(Port, AllocatesAReceiveRightUnderANewName) {
  PortName first = kPortNull;
  PortName second = kPortNull;
  ASSERT_EQ(PortAllocate(first), KERN_SUCCESS);
  ASSERT_EQ(PortAllocate(second), KERN_SUCCESS);
  EXPECT_NE(first, kPortNull);
  EXPECT_NE(first, kPortDead);
  EXPECT_NE(first, second);
  const auto rights = PortQuery(first);
  ASSERT_TRUE(rights);
  EXPECT_TRUE(rights->receive);
  EXPECT_FALSE(rights->named);
  EXPECT_EQ(rights->sendReferences, 0U);
  EXPECT_EQ(PortDropReceiveRight(first), KERN_SUCCESS);
  EXPECT_EQ(PortDropReceiveRight(second), KERN_SUCCESS);
  EXPECT_FALSE(PortQuery(first));
}

TEST(Port, CountsSendRightsUnderTheSameName) {
  PortName name = kPortNull;
  ASSERT_EQ(PortAllocate(name), KERN_SUCCESS);
  EXPECT_EQ(PortInsertSendRight(name), KERN_SUCCESS);
  EXPECT_EQ(PortInsertSendRight(name), KERN_SUCCESS);
  EXPECT_EQ(PortQuery(name)->sendReferences, 2U);
  EXPECT_EQ(PortDeallocate(name), KERN_SUCCESS);
  EXPECT_EQ(PortDropReceiveRight(name), KERN_SUCCESS);
  ASSERT_TRUE(PortQuery(name)) << "one reference is left, now to a dead name";
  EXPECT_FALSE(PortQuery(name)->receive);
  EXPECT_EQ(PortInsertSendRight(name), KERN_INVALID_RIGHT);
  EXPECT_EQ(PortDropReceiveRight(name), KERN_INVALID_RIGHT);
  EXPECT_EQ(PortDeallocate(name), KERN_SUCCESS);
  EXPECT_FALSE(PortQuery(name));
}

TEST(Port, NameThatIsNotInUseIsInvalidEverywhere) {
  for (const PortName name : {kPortNull, kPortDead, PortName{0x7fffffff}}) {
    EXPECT_EQ(PortInsertSendRight(name), KERN_INVALID_NAME);
    EXPECT_EQ(PortDropReceiveRight(name), KERN_INVALID_NAME);
    EXPECT_EQ(PortDeallocate(name), KERN_INVALID_NAME);
    EXPECT_FALSE(PortQuery(name));
    EXPECT_EQ(PortSendDescriptor(name), nullptr);
    EXPECT_EQ(PortReceiveDescriptor(name), nullptr);
    EXPECT_EQ(PortHolder(name), nullptr);
  }
}

TEST(Port, NameIsNotReusedAtOnce) {
  PortName first = kPortNull;
  ASSERT_EQ(PortAllocate(first), KERN_SUCCESS);
  EXPECT_EQ(PortDropReceiveRight(first), KERN_SUCCESS);
  PortName second = kPortNull;
  ASSERT_EQ(PortAllocate(second), KERN_SUCCESS);
  EXPECT_NE(first, second);
  EXPECT_EQ(PortDropReceiveRight(second), KERN_SUCCESS);
}

TEST(Port, RightsAreClosedWithTheirName) {
  const std::size_t before = support::OpenDescriptors();
  PortName name = kPortNull;
  ASSERT_EQ(PortAllocate(name), KERN_SUCCESS);
  EXPECT_EQ(support::OpenDescriptors(), before + 2);
  EXPECT_EQ(PortDropReceiveRight(name), KERN_SUCCESS);
  EXPECT_EQ(support::OpenDescriptors(), before);
}

TEST(Port, DescriptorOutlivesItsNameWhileSomebodyUsesIt) {
  PortName name = kPortNull;
  ASSERT_EQ(PortAllocate(name), KERN_SUCCESS);
  const SharedDescriptor used = PortReceiveDescriptor(name);
  EXPECT_EQ(PortDropReceiveRight(name), KERN_SUCCESS);
  EXPECT_NE(::fcntl(used->get(), F_GETFD), -1);
}

TEST(AnonymousPort, IsAPairOfSequencedPacketSocketsAndNothingElse) {
  const support::PortPair port = support::MakePort();
  EXPECT_TRUE(IsAnonymousPort(port.send.get()));
  support::PortPair dead = support::MakePort();
  dead.receive.reset();
  EXPECT_TRUE(IsAnonymousPort(dead.send.get())) << "a dead port is still a port";
  int ends[2];
  ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends), 0);
  const FileDescriptor one(ends[0]);
  const FileDescriptor other(ends[1]);
  EXPECT_FALSE(IsAnonymousPort(one.get()));
  const FileDescriptor file(::open("/dev/null", O_RDONLY | O_CLOEXEC));
  EXPECT_FALSE(IsAnonymousPort(file.get()));
  const FileDescriptor internet(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
  EXPECT_FALSE(IsAnonymousPort(internet.get()));
}

TEST(CheckIn, TakesThePortThatTheLauncherHandedOver) {
  const LauncherSocket launcher("com.example.service");
  PortName name = kPortNull;
  ASSERT_EQ(BootstrapCheckIn("com.example.service", name), KERN_SUCCESS);
  EXPECT_TRUE(PortQuery(name)->named);
  const SharedDescriptor socket = PortReceiveDescriptor(name);
  int asked = 0;
  socklen_t length = sizeof asked;
  ASSERT_EQ(::getsockopt(socket->get(), SOL_SOCKET, SO_PASSCRED, &asked, &length), 0);
  EXPECT_EQ(asked, 1);
  EXPECT_EQ(::fcntl(socket->get(), F_GETFD) & FD_CLOEXEC, FD_CLOEXEC);
  EXPECT_EQ(PortInsertSendRight(name), KERN_INVALID_RIGHT);
  EXPECT_EQ(PortDeallocate(name), KERN_SUCCESS);
  EXPECT_FALSE(PortQuery(name));
  EXPECT_EQ(::access(launcher.path().c_str(), F_OK), 0) << "the launcher's socket is not ours";
}

/// Runs `body` in a child whose /run is its own; the child's exit status is its result.
int InPrivateRun(int (*body)()) {
  const pid_t child = ::fork();
  if (child == 0) {
    if (::unshare(CLONE_NEWNS) != 0 ||
        ::mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
        ::mount("tmpfs", "/run", "tmpfs", 0, nullptr) != 0) {
      ::_exit(100);
    }
    ::_exit(body());
  }
  int status = 0;
  ::waitpid(child, &status, 0);
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

constexpr char kOwnPath[] = "/run/halvec/ports/com.example.own";

class CheckInWithoutLauncher : public ::testing::Test {
 protected:
  void SetUp() override {
    if (::geteuid() != 0) GTEST_SKIP() << "needs root: binds in a /run of its own";
  }
};

TEST_F(CheckInWithoutLauncher, BindsTheServicesSocketForOwnerAndGroupOnly) {
  EXPECT_EQ(InPrivateRun([] {
              PortName name = kPortNull;
              struct stat status {};
              if (BootstrapCheckIn("com.example.own", name) != KERN_SUCCESS) return 1;
              if (::stat(kOwnPath, &status) != 0) return 2;
              if (!S_ISSOCK(status.st_mode) || (status.st_mode & 07777) != 0660) return 3;
              if (!PortQuery(name)->named) return 4;
              return 0;
            }),
            0);
}

TEST_F(CheckInWithoutLauncher, LeavesTheNameToNobodyElseWhenTheRightIsGivenUp) {
  EXPECT_EQ(InPrivateRun([] {
              PortName name = kPortNull;
              if (BootstrapCheckIn("com.example.own", name) != KERN_SUCCESS) return 1;
              if (PortDeallocate(name) != KERN_SUCCESS) return 2;
              return ::access(kOwnPath, F_OK) == 0 ? 0 : 3;
            }),
            0);
}

TEST_F(CheckInWithoutLauncher, DoesNotTakeAServedNameButReplacesAnAbandonedOne) {
  EXPECT_EQ(InPrivateRun([] {
              PortName first = kPortNull;
              PortName second = kPortNull;
              if (BootstrapCheckIn("com.example.own", first) != KERN_SUCCESS) return 1;
              if (BootstrapCheckIn("com.example.own", second) != KERN_NO_ACCESS) return 2;
              (void)PortDeallocate(first);
              return BootstrapCheckIn("com.example.own", second) == KERN_SUCCESS ? 0 : 3;
            }),
            0);
}

/// A process that checks the service in and is held at the system calls that the test chooses.
class HeldCheckIn {
 public:
  HeldCheckIn() : process_(::fork()) {
    if (process_ == 0) {
      ::ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
      ::raise(SIGSTOP);
      PortName name = kPortNull;
      ::_exit(BootstrapCheckIn("com.example.own", name));
    }
    ::waitpid(process_, nullptr, 0);
    ::ptrace(PTRACE_SETOPTIONS, process_, nullptr, PTRACE_O_EXITKILL | PTRACE_O_TRACESYSGOOD);
  }
  ~HeldCheckIn() {
    ::kill(process_, SIGKILL);
    ::waitpid(process_, nullptr, 0);
  }
  HeldCheckIn(const HeldCheckIn&) = delete;
  HeldCheckIn& operator=(const HeldCheckIn&) = delete;

  /// Runs on until it is about to make one of `calls`; false when it ended before.
  bool runTo(std::initializer_list<std::uint64_t> calls) {
    do {
      int status = 0;
      if (::ptrace(PTRACE_SYSCALL, process_, nullptr, nullptr) != 0) return false;
      if (::waitpid(process_, &status, 0) != process_ || !WIFSTOPPED(status)) return false;
      if (::ptrace(PTRACE_GET_SYSCALL_INFO, process_, sizeof call_, &call_) <= 0) return false;
    } while (call_.op != PTRACE_SYSCALL_INFO_ENTRY ||
             std::find(calls.begin(), calls.end(), call_.entry.nr) == calls.end());
    return true;
  }
  /// Runs on until the call that it is about to make has returned; false when it ended before.
  bool returns() {
    int status = 0;
    return ::ptrace(PTRACE_SYSCALL, process_, nullptr, nullptr) == 0 &&
           ::waitpid(process_, &status, 0) == process_ && WIFSTOPPED(status);
  }
  /// Runs on to the end, where it is held alive with what it has bound, and gives the outcome.
  KernReturn outcome() {
    if (call_.entry.nr != SYS_exit_group && !runTo({SYS_exit_group})) return KERN_FAILURE;
    return static_cast<KernReturn>(call_.entry.args[0]);
  }

 private:
  const pid_t process_;
  __ptrace_syscall_info call_{};
};

/// The calls by which one file can take another's place, or make room for it.
constexpr std::initializer_list<std::uint64_t> kReplacing {
  SYS_unlinkat, SYS_renameat2,
#if defined(__x86_64__)
      SYS_unlink, SYS_rename, SYS_renameat,
#endif
};

TEST_F(CheckInWithoutLauncher, LeavesNoGapWhileItReplacesAnAbandonedSocket) {
  EXPECT_EQ(InPrivateRun([] {
              PortName abandoned = kPortNull;
              if (BootstrapCheckIn("com.example.own", abandoned) != KERN_SUCCESS) return 1;
              (void)PortDeallocate(abandoned);
              HeldCheckIn next;
              int stops = 0;
              for (; next.runTo(kReplacing) && next.returns(); ++stops) {
                if (::access(kOwnPath, F_OK) != 0) return 2;
              }
              return stops > 0 ? 0 : 3;
            }),
            0);
}

TEST_F(CheckInWithoutLauncher, TakesANameFromAnotherUsersSocket) {
  EXPECT_EQ(InPrivateRun([] {
              PortName others = kPortNull;
              PortName own = kPortNull;
              struct stat status {};
              if (BootstrapCheckIn("com.example.own", others) != KERN_SUCCESS) return 1;
              if (::lchown(kOwnPath, 12345, 12345) != 0) return 2;
              if (BootstrapCheckIn("com.example.own", own) != KERN_SUCCESS) return 3;
              return ::stat(kOwnPath, &status) == 0 && status.st_uid == ::geteuid() ? 0 : 4;
            }),
            0);
}

TEST_F(CheckInWithoutLauncher, TakesItsGroupFromTheFolder) {
  EXPECT_EQ(InPrivateRun([] {
              struct stat status {};
              const std::filesystem::path folder = std::filesystem::path(kOwnPath).parent_path();
              std::filesystem::create_directories(folder);
              if (::chown(folder.c_str(), 0, 12345) != 0) return 1;
              if (::chmod(folder.c_str(), 03775) != 0) return 2;
              PortName name = kPortNull;
              if (BootstrapCheckIn("com.example.own", name) != KERN_SUCCESS) return 3;
              return ::stat(kOwnPath, &status) == 0 && status.st_gid == 12345 ? 0 : 4;
            }),
            0);
}

TEST_F(CheckInWithoutLauncher, SucceedsForOneOfTwoThatFindTheSameAbandonedSocket) {
  EXPECT_EQ(InPrivateRun([] {
              PortName abandoned = kPortNull;
              if (BootstrapCheckIn("com.example.own", abandoned) != KERN_SUCCESS) return 1;
              (void)PortDeallocate(abandoned);
              // The first has found that nobody serves the socket, and has not replaced it yet.
              HeldCheckIn first;
              if (!first.runTo({SYS_connect}) || !first.runTo(kReplacing)) return 2;
              HeldCheckIn second;
              if (!second.runTo({SYS_flock, SYS_exit_group})) return 3;
              if (first.outcome() != KERN_SUCCESS) return 4;
              return second.outcome() == KERN_NO_ACCESS ? 0 : 5;
            }),
            0);
}

TEST_F(CheckInWithoutLauncher, LeavesNothingButItsSocketInTheFolder) {
  EXPECT_EQ(InPrivateRun([] {
              for (int round = 0; round < 3; ++round) {
                // The second and the third find what the one before has left behind.
                if (HeldCheckIn().outcome() != KERN_SUCCESS) return 1;
                for (const char* folder : {"/run/halvec/ports", "/run/halvec"}) {
                  const std::filesystem::directory_iterator entries(folder);
                  if (std::distance(begin(entries), end(entries)) != 1) return 2;
                }
              }
              return 0;
            }),
            0);
}

TEST_F(CheckInWithoutLauncher, DoesNotTakeWhatIsMeantForAnotherProcess) {
  EXPECT_EQ(InPrivateRun([] {
              const LauncherSocket launcher("com.example.own");
              ::setenv("LISTEN_PID", "1", 1);
              PortName name = kPortNull;
              if (BootstrapCheckIn("com.example.own", name) != KERN_SUCCESS) return 1;
              return ::access(kOwnPath, F_OK) == 0 ? 0 : 2;
            }),
            0);
}

TEST(CheckIn, RefusesNamesThatAreNoFileNames) {
  for (const char* service : {"", ".", "..", ".hidden", "a/b", "/"}) {
    PortName name = kPortNull;
    EXPECT_EQ(BootstrapCheckIn(service, name), KERN_INVALID_ARGUMENT) << service;
  }
}

class PortDeath : public ::testing::Test {
 protected:
  void pump() {
    while (loop.run(0) == RunResult::kHandledSource) {
    }
  }
  static void count(PortWatcher* watcher, void* info) {
    EXPECT_FALSE(watcher->isValid());
    ++*static_cast<int*>(info);
  }
  std::shared_ptr<PortWatcher> watch(PortName port) {
    auto watcher = PortWatcher::Create(port, &calls);
    if (watcher) watcher->setInvalidationCallback(count);
    return watcher;
  }
  fakes::ManualClock clock;
  RunLoop loop{clock};
  ScopedCurrentRunLoop current{loop};
  support::PortPair pair = support::MakePort();
  int calls = 0;
};

TEST_F(PortDeath, IsTheHangUpOfTheOtherEnd) {
  const PortName port = PortAdoptSendRight(std::move(pair.send), nullptr);
  const auto watcher = watch(port);
  pump();
  EXPECT_EQ(calls, 0);
  pair.receive.reset();
  pump();
  EXPECT_EQ(calls, 1);
  pump();
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(PortDeallocate(port), KERN_SUCCESS);
}

TEST_F(PortDeath, IsTheExitOfTheProcessThatSentTheRight) {
  int release[2];
  ASSERT_EQ(::pipe(release), 0);
  const pid_t child = ::fork();
  if (child == 0) {
    ::close(release[1]);
    char byte = 0;
    (void)!::read(release[0], &byte, 1);
    ::_exit(0);
  }
  ::close(release[0]);
  const auto holder = std::make_shared<const FileDescriptor>(OpenPidfd(child));
  const PortName port = PortAdoptSendRight(std::move(pair.send), holder);
  const auto watcher = watch(port);
  pump();
  EXPECT_EQ(calls, 0);
  ::close(release[1]);
  ::waitpid(child, nullptr, 0);
  pump();
  EXPECT_EQ(calls, 1) << "although this process still holds the receive right";
  EXPECT_EQ(PortDeallocate(port), KERN_SUCCESS);
}

TEST_F(PortDeath, IsAnExitThatCameBeforeTheWatch) {
  const pid_t child = ::fork();
  if (child == 0) ::_exit(0);
  const auto holder = std::make_shared<const FileDescriptor>(OpenPidfd(child));
  siginfo_t information{};
  ASSERT_EQ(::waitid(P_PID, static_cast<id_t>(child), &information, WEXITED | WNOWAIT), 0);
  const PortName port = PortAdoptSendRight(std::move(pair.send), holder);
  const auto watcher = watch(port);
  EXPECT_EQ(calls, 1);
  ::waitpid(child, nullptr, 0);
  EXPECT_EQ(PortDeallocate(port), KERN_SUCCESS);
}

TEST_F(PortDeath, IsAnythingThatArrivesOnThePort) {
  const PortName port = PortAdoptSendRight(std::move(pair.send), nullptr);
  const auto watcher = watch(port);
  ASSERT_EQ(support::SendPacket(pair.receive.get(), {}), 0);
  pump();
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(PortDeallocate(port), KERN_SUCCESS);
}

TEST_F(PortDeath, BeforeTheCallbackIsSetRunsItAtOnce) {
  const PortName port = PortAdoptSendRight(std::move(pair.send), nullptr);
  const auto watcher = PortWatcher::Create(port, &calls);
  pair.receive.reset();
  watcher->setInvalidationCallback(count);
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(PortDeallocate(port), KERN_SUCCESS);
}

TEST_F(PortDeath, IsNotReportedOnceTheCallbackIsCleared) {
  const PortName port = PortAdoptSendRight(std::move(pair.send), nullptr);
  const auto watcher = watch(port);
  watcher->setInvalidationCallback(nullptr);
  watcher->invalidate();
  pair.receive.reset();
  pump();
  EXPECT_EQ(calls, 0);
  EXPECT_EQ(PortDeallocate(port), KERN_SUCCESS);
}

TEST_F(PortDeath, CannotBeWatchedWithoutASendRight) {
  EXPECT_EQ(watch(kPortNull), nullptr);
  PortName port = kPortNull;
  ASSERT_EQ(PortAllocate(port), KERN_SUCCESS);
  EXPECT_EQ(watch(port), nullptr);
  EXPECT_EQ(PortDropReceiveRight(port), KERN_SUCCESS);
}

}  // namespace
