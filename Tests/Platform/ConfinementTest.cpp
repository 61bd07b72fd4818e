// SPDX-License-Identifier: Apache-2.0
//
// What is left of a process after it has confined itself. Each fact is looked at in a process of
// its own, because there is no way back.
#include "Helper/Platform/Confinement.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <linux/capability.h>
#include <linux/sockios.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/ptrace.h>
#include <sys/shm.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>
#include <thread>

#include "Helper/Platform/Linux/FileLocation.h"
#include "Helper/Platform/Linux/ProcessFile.h"

namespace platform {
namespace {

/// The number that `look` answers in a child process that has confined itself.
int Confined(const std::function<int()>& look) {
  const pid_t child = ::fork();
  if (child == 0) {
    Confine();
    ::_exit(look());
  }
  int status = 0;
  EXPECT_EQ(::waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFEXITED(status)) << "ended by signal " << WTERMSIG(status);
  return WEXITSTATUS(status);
}

/// 0 or the error of a system call's answer.
int ErrorOf(long answer) { return answer < 0 ? errno : 0; }

/// A descriptor that events can be told of by signals.
int Socket() { return ::socket(AF_UNIX, SOCK_DGRAM, 0); }

bool IsRoot() { return ::geteuid() == 0; }

/// Mounts a folder at `place` while a confined process runs, in a name space whose mounts spread as
/// those of a booted system do. Answers 0 if that process sees the mount, 1 if not, 2 if it failed.
int MountBesideAConfinedProcess(const std::string& place) {
  int confined[2];
  int mounted[2];
  if (::unshare(CLONE_NEWNS) != 0 || ::pipe(confined) != 0 || ::pipe(mounted) != 0 ||
      ::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
      ::mount(nullptr, "/", nullptr, MS_REC | MS_SHARED, nullptr) != 0) {
    return 2;
  }
  char byte = 0;
  const std::string inserted = place + "/inserted";
  const pid_t helper = ::fork();
  if (helper == 0) {
    Confine();
    if (::write(confined[1], &byte, 1) != 1 || ::read(mounted[0], &byte, 1) != 1) ::_exit(2);
    ::_exit(::access(inserted.c_str(), F_OK) == 0 ? 0 : 1);
  }
  if (::read(confined[0], &byte, 1) != 1 ||
      ::mount("tmpfs", place.c_str(), "tmpfs", 0, nullptr) != 0 ||
      ::open(inserted.c_str(), O_CREAT | O_WRONLY, 0600) < 0 ||
      ::write(mounted[1], &byte, 1) != 1) {
    return 2;
  }
  int status = 0;
  ::waitpid(helper, &status, 0);
  return WEXITSTATUS(status);
}

class Confinement : public testing::Test {
 protected:
  void SetUp() override {
    folder_ = testing::TempDir() + "confinement-" + std::to_string(::getpid());
    std::filesystem::create_directories(folder_);
  }
  void TearDown() override { std::filesystem::remove_all(folder_); }
  [[nodiscard]] std::string file(const char* name) const { return folder_ + "/" + name; }

 private:
  std::string folder_;
};

TEST_F(Confinement, RunsNoOtherProgram) {
  EXPECT_EQ(Confined([] {
              char name[] = "/bin/true";
              char* arguments[] = {name, nullptr};
              return ErrorOf(::execv(name, arguments));
            }),
            EPERM);
}

TEST_F(Confinement, StartsThreadsAndNoProcesses) {
  EXPECT_EQ(Confined([] { return ErrorOf(::fork()); }), EPERM);
  EXPECT_EQ(Confined([] {
              int seen = 1;
              std::thread([&seen] { seen = ErrorOf(::fork()); }).join();
              return seen;
            }),
            EPERM);
}

TEST_F(Confinement, LooksIntoNoOtherProcess) {
  EXPECT_EQ(Confined([] { return ErrorOf(::ptrace(PTRACE_ATTACH, ::getppid(), 0, 0)); }), EPERM);
  for (const long call : {SYS_process_vm_readv, SYS_process_vm_writev, SYS_process_madvise,
                          SYS_kcmp, SYS_pidfd_getfd}) {
    EXPECT_EQ(Confined([call] { return ErrorOf(::syscall(call, 0, 0, 0, 0, 0, 0)); }), EPERM)
        << call;
  }
}

TEST_F(Confinement, SignalsNoOtherProcess) {
  const pid_t stranger = ::getpid();
  EXPECT_EQ(Confined([=] { return ErrorOf(::kill(stranger, 0)); }), EPERM);
  EXPECT_EQ(Confined([=] { return ErrorOf(::tgkill(stranger, stranger, 0)); }), EPERM);
  EXPECT_EQ(Confined([=] { return ErrorOf(::syscall(SYS_tkill, stranger, 0)); }), EPERM);
}

TEST_F(Confinement, HasTheKernelSignalNoOtherProcess) {
  const pid_t stranger = ::getpid();
  EXPECT_EQ(Confined([=] { return ErrorOf(::fcntl(Socket(), F_SETOWN, stranger)); }), EPERM);
  EXPECT_EQ(Confined([=] {
              const f_owner_ex owner{F_OWNER_PID, stranger};
              return ErrorOf(::fcntl(Socket(), F_SETOWN_EX, &owner));
            }),
            EPERM);
  for (const unsigned long request : {FIOSETOWN, SIOCSPGRP}) {
    EXPECT_EQ(Confined([=] { return ErrorOf(::ioctl(Socket(), request, &stranger)); }), EPERM)
        << request;
  }
}

TEST_F(Confinement, StillEndsItselfWhenItMust) {
  const pid_t child = ::fork();
  if (child == 0) {
    Confine();
    ::abort();
  }
  int status = 0;
  ASSERT_EQ(::waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFSIGNALED(status));
  EXPECT_EQ(WTERMSIG(status), SIGABRT);
}

TEST_F(Confinement, HasNeitherKeysNorRings) {
  for (const long call : {SYS_add_key, SYS_request_key, SYS_keyctl, SYS_io_uring_setup,
                          SYS_io_uring_enter, SYS_io_uring_register, SYS_userfaultfd}) {
    EXPECT_EQ(Confined([call] { return ErrorOf(::syscall(call, 0, 0, 0, 0, 0, 0)); }), EPERM)
        << call;
  }
}

TEST_F(Confinement, HasOnlyTheSocketFamiliesThatRequestsUse) {
  for (const int family : {AF_UNIX, AF_INET, AF_INET6, AF_NETLINK}) {
    EXPECT_EQ(Confined([family] { return ErrorOf(::socket(family, SOCK_DGRAM, 0)); }), 0) << family;
  }
  for (const int family : {AF_PACKET, AF_VSOCK, AF_ALG, AF_BLUETOOTH}) {
    EXPECT_EQ(Confined([family] { return ErrorOf(::socket(family, SOCK_DGRAM, 0)); }), EPERM)
        << family;
  }
}

TEST_F(Confinement, MakesNoFileThatLendsItsOwnersRights) {
  const std::string plain = file("plain");
  EXPECT_EQ(Confined([&] { return ErrorOf(::open(plain.c_str(), O_CREAT | O_WRONLY, 0755)); }), 0);
  EXPECT_EQ(Confined([&] { return ErrorOf(::chmod(plain.c_str(), 0700)); }), 0);
  EXPECT_EQ(Confined([&] { return ErrorOf(::chmod(plain.c_str(), 04755)); }), EPERM);
  EXPECT_EQ(Confined([&] { return ErrorOf(::chmod(plain.c_str(), 02755)); }), EPERM);
  const std::string lending = file("lending");
  EXPECT_EQ(Confined([&] { return ErrorOf(::open(lending.c_str(), O_CREAT | O_WRONLY, 04755)); }),
            EPERM);
  EXPECT_FALSE(std::filesystem::exists(lending));
}

TEST_F(Confinement, RunsNoMemoryThatItWrote) {
  EXPECT_EQ(Confined([] {
              return ::mmap(nullptr, 4096, PROT_READ | PROT_WRITE | PROT_EXEC,
                            MAP_PRIVATE | MAP_ANONYMOUS, -1, 0) == MAP_FAILED
                         ? errno
                         : 0;
            }),
            EPERM);
  EXPECT_EQ(Confined([] {
              void* page =
                  ::mmap(nullptr, 4096, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
              return ErrorOf(::mprotect(page, 4096, PROT_READ | PROT_EXEC));
            }),
            EPERM);
}

TEST_F(Confinement, StillOpensLibraries) {
  EXPECT_EQ(Confined([] { return ::dlopen("libz.so.1", RTLD_NOW) ? 0 : 1; }), 0);
  EXPECT_EQ(Confined([] { return ::dlopen("libcurl.so.4", RTLD_NOW) ? 0 : 1; }), 0);
}

TEST_F(Confinement, StillFindsWhatIsBelowAFolderAndNothingBehindALink) {
  std::filesystem::create_directories(file("tree/inner"));
  std::filesystem::create_directory_symlink("inner", file("tree/link"));
  std::ofstream(file("tree/inner/leaf")) << "text";
  const auto open = [this](const char* subpath, int flags) {
    return Confined([&, this] {
      const FileDescriptor tree(::open(file("tree").c_str(), O_PATH | O_DIRECTORY));
      return OpenBeneath(tree.get(), subpath, flags) ? 0 : errno;
    });
  };
  EXPECT_EQ(open("inner", O_PATH | O_DIRECTORY), 0);
  EXPECT_EQ(open("inner/leaf", O_RDONLY), 0);
  EXPECT_EQ(open("inner//leaf", O_PATH), 0);
  EXPECT_EQ(open(".", O_PATH | O_DIRECTORY), 0);
  EXPECT_EQ(open("link", O_PATH), ELOOP);
  EXPECT_EQ(open("link", O_PATH | O_DIRECTORY), ELOOP);
  EXPECT_EQ(open("link/leaf", O_RDONLY), ELOOP);
  EXPECT_EQ(open("inner/../inner", O_PATH), EXDEV);
  EXPECT_EQ(open("/etc", O_PATH), EXDEV);
  EXPECT_EQ(open("inner/leaf/more", O_PATH), ENOTDIR);
  EXPECT_EQ(open("absent", O_PATH), ENOENT);
}

TEST_F(Confinement, AnswersACallThatIsYoungerThanItAsAnOlderKernelWould) {
  constexpr long kNotYet = 480;
  EXPECT_EQ(Confined([] { return ErrorOf(::syscall(kNotYet)); }), ENOSYS);
  EXPECT_EQ(Confined([] { return ErrorOf(::syscall(SYS_clone3, nullptr, 0)); }), ENOSYS);
  EXPECT_EQ(Confined([] { return ErrorOf(::syscall(SYS_openat2, 0, "", nullptr, 0)); }), ENOSYS);
}

TEST_F(Confinement, CanBeAskedForTwice) {
  EXPECT_EQ(Confined([] {
              Confine();
              return ErrorOf(::fork());
            }),
            EPERM);
}

TEST_F(Confinement, KeepsTheFiveCapabilitiesThatRequestsNeed) {
  if (!IsRoot()) GTEST_SKIP() << "only root has capabilities to keep";
  constexpr int kLastOfFirstWord = 31;
  for (int capability = 0; capability <= kLastOfFirstWord; ++capability) {
    const bool kept = Confined([capability] {
                        __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
                        __user_cap_data_struct sets[_LINUX_CAPABILITY_U32S_3]{};
                        (void)::syscall(SYS_capget, &header, sets);
                        const auto either = sets[0].effective | sets[0].permitted;
                        return (either & CAP_TO_MASK(capability)) != 0 || sets[1].permitted != 0;
                      }) != 0;
    const bool needed = capability == CAP_SYS_PTRACE || capability == CAP_DAC_OVERRIDE ||
                        capability == CAP_CHOWN || capability == CAP_FOWNER ||
                        capability == CAP_NET_RAW;
    EXPECT_EQ(kept, needed) << capability;
  }
}

TEST_F(Confinement, CannotChangeTheSystemButWhatClientsName) {
  if (!IsRoot()) GTEST_SKIP() << "only root can change what it sees of the file system";
  const auto write = [](const std::string& path) {
    return Confined([&path] { return ErrorOf(::open(path.c_str(), O_CREAT | O_WRONLY, 0600)); });
  };
  const std::string unused = "/halvec-" + std::to_string(::getpid());
  for (const char* folder : {"/usr", "/etc", "/sys/kernel"}) {
    EXPECT_EQ(write(folder + unused), EROFS) << folder;
  }
  EXPECT_EQ(write("/proc/sys/kernel/core_pattern"), EROFS);
  EXPECT_EQ(write("/dev/null"), 0);
  EXPECT_EQ(write("/dev/full"), EACCES) << "no device but those that libraries ask for";
  for (const char* folder : {"/tmp", "/var", "/var/tmp"}) {
    EXPECT_EQ(write(folder + unused), 0) << folder;
    std::filesystem::remove(folder + unused);
  }
}

TEST_F(Confinement, LeavesTheRestOfTheSystemAsItWas) {
  const auto writable = [] { return ErrorOf(::access("/etc", W_OK)); };
  const int before = writable();
  EXPECT_EQ(Confined(writable), IsRoot() ? EROFS : before);
  EXPECT_EQ(writable(), before);
}

TEST_F(Confinement, SeesTheExecutableOfAnotherUsersProcess) {
  if (!IsRoot()) GTEST_SKIP() << "only root can start another user's process";
  const pid_t stranger = ::fork();
  if (stranger == 0) {
    if (::setresuid(12345, 12345, 12345) != 0) ::_exit(1);
    while (true) ::pause();
  }
  EXPECT_EQ(Confined([=] { return OpenProcessFile(stranger, "exe", O_PATH) ? 0 : errno; }), 0);
  const std::string path = "/proc/" + std::to_string(stranger) + "/exe";
  EXPECT_EQ(Confined([&] {
              (void)OpenProcessFile(stranger, "exe", O_PATH);
              return ErrorOf(::open(path.c_str(), O_PATH));
            }),
            EACCES)
      << "and not a moment longer than it takes";
  ::kill(stranger, SIGKILL);
  ::waitpid(stranger, nullptr, 0);
}

TEST_F(Confinement, ReachesNothingThroughAnotherProcess) {
  if (!IsRoot()) GTEST_SKIP() << "only root may look at what others have open at all";
  const std::string process = "/proc/" + std::to_string(::getpid());
  for (const char* door : {"/root/etc", "/cwd", "/mem", "/environ"}) {
    EXPECT_EQ(Confined([&] { return ErrorOf(::open((process + door).c_str(), O_RDONLY)); }), EACCES)
        << door;
  }
}

TEST_F(Confinement, RunsNoSharedMemoryEither) {
  EXPECT_EQ(Confined([] {
              const int segment = ::shmget(IPC_PRIVATE, 4096, 0700);
              void* const at = ::shmat(segment, nullptr, SHM_EXEC);
              const int error = at == reinterpret_cast<void*>(-1) ? errno : 0;
              ::shmctl(segment, IPC_RMID, nullptr);
              return error;
            }),
            EPERM);
}

TEST_F(Confinement, SeesWhatOthersMountLater) {
  if (!IsRoot()) GTEST_SKIP() << "only root mounts";
  const std::string place = file("card");
  std::filesystem::create_directories(place);
  const pid_t system = ::fork();
  if (system == 0) ::_exit(MountBesideAConfinedProcess(place));
  int status = 0;
  ::waitpid(system, &status, 0);
  EXPECT_EQ(WEXITSTATUS(status), 0);
}

}  // namespace
}  // namespace platform
