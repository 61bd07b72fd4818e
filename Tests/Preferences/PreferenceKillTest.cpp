// SPDX-License-Identifier: Apache-2.0
//
// The preferences store under SIGKILL: at every single system call of a write, and at any moment of
// a loop of writes. The file is whole, what was acknowledged is there, and the next write succeeds.
// The killed process is a child; this one has a single thread.
#include <gtest/gtest.h>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstring>
#include <functional>
#include <iostream>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Linux/PreferenceFiles.h"
#include "Tests/Fakes/FakeSystemLog.h"
#include "Tests/Preferences/TemporaryFolder.h"

namespace {

using platform::FileDescriptor;
using platform::PreferenceDomain;
using platform::PreferenceFiles;
using platform::PropertyList;
using preferences_test::NamesIn;

struct Pipe {
  FileDescriptor read;
  FileDescriptor write;
};

Pipe MakePipe() {
  int ends[2] = {-1, -1};
  if (::pipe(ends) != 0) return {};
  return {FileDescriptor(ends[0]), FileDescriptor(ends[1])};
}

void Acknowledge(const Pipe& pipe, int number) {
  if (::write(pipe.write.get(), &number, sizeof number) != sizeof number) ::_exit(3);
}

// The last number acknowledged before the pipe's end; `none` without any.
int LastAcknowledged(Pipe& pipe, int none) {
  pipe.write.reset();
  int last = none;
  int number = 0;
  while (::read(pipe.read.get(), &number, sizeof number) == sizeof number) last = number;
  return last;
}

enum class Ending { kKilled, kFinished, kNotTraceable };

// Runs `work` in a child and kills it at the `stop`-th entry into or return from a system call.
Ending RunAndKillAt(int stop, const std::function<void()>& work) {
  const pid_t child = ::fork();
  if (child == 0) {
    if (::ptrace(PTRACE_TRACEME, 0, nullptr, nullptr) != 0) ::_exit(2);
    ::raise(SIGSTOP);
    work();
    ::_exit(0);
  }
  int status = 0;
  if (::waitpid(child, &status, 0) != child || !WIFSTOPPED(status)) return Ending::kNotTraceable;
  for (int stops = 0;;) {
    if (::ptrace(PTRACE_SYSCALL, child, nullptr, nullptr) != 0) return Ending::kNotTraceable;
    if (::waitpid(child, &status, 0) != child) return Ending::kNotTraceable;
    if (!WIFSTOPPED(status)) return Ending::kFinished;
    if (WSTOPSIG(status) == SIGTRAP && ++stops == stop) {
      ::kill(child, SIGKILL);
      ::waitpid(child, &status, 0);
      return Ending::kKilled;
    }
  }
}

class PreferenceKill : public testing::Test {
 protected:
  preferences_test::TemporaryFolder temporary;
  const PreferenceDomain domain{"com.zarvo.carrier"};
  const std::filesystem::path folder = temporary.path() / "user/Library/Preferences";
};

TEST_F(PreferenceKill, AtEverySystemCallLeavesTheOldOrTheNewValue) {
  int stop = 1;
  int keptOld = 0;
  for (;; ++stop) {
    SCOPED_TRACE("stop " + std::to_string(stop));
    {
      PreferenceFiles files(temporary.roots());
      files.setValue("constant", "kept", domain);
      files.setValue("key", "old", domain);
      ASSERT_TRUE(files.synchronize(domain));
    }
    Pipe pipe = MakePipe();
    ASSERT_TRUE(pipe.read && pipe.write);
    const Ending ending = RunAndKillAt(stop, [&] {
      PreferenceFiles files(temporary.roots());
      files.setValue("key", "new", domain);
      if (files.synchronize(domain)) Acknowledge(pipe, 1);
    });
    if (ending == Ending::kNotTraceable) {
      GTEST_SKIP() << "child processes cannot be traced here: " << ::strerrordesc_np(errno);
    }
    const bool acknowledged = LastAcknowledged(pipe, 0) == 1;
    fakes::FakeSystemLog log;
    const platform::ScopedReplacement<platform::SystemLog> replacement(log);
    PreferenceFiles files(temporary.roots());
    const auto value = files.copyValue("key", domain);
    if (value == PropertyList("old")) ++keptOld;
    EXPECT_TRUE(value == PropertyList("new") || (!acknowledged && value == PropertyList("old")));
    EXPECT_EQ(files.copyValue("constant", domain), PropertyList("kept"));
    files.setValue("after", stop, domain);
    EXPECT_TRUE(files.synchronize(domain));
    EXPECT_EQ(NamesIn(folder), std::set<std::string>{"com.zarvo.carrier.plist"});
    EXPECT_TRUE(log.takeLines().empty());
    if (ending == Ending::kFinished) {
      EXPECT_TRUE(acknowledged);
      break;
    }
  }
  std::cout << "killed at " << stop - 1 << " stops, the old value stayed after " << keptOld << "\n";
  EXPECT_GT(stop, 20);
  EXPECT_GT(keptOld, 0);
}

TEST_F(PreferenceKill, AtAnyMomentOfManyWritesLosesNothingAcknowledged) {
  int next = 1;
  for (int round = 0; round < 40; ++round) {
    Pipe pipe = MakePipe();
    ASSERT_TRUE(pipe.read && pipe.write);
    const pid_t child = ::fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
      PreferenceFiles files(temporary.roots());
      for (int number = next;; ++number) {
        files.setValue("number", number, domain);
        // The second key tells a file of mixed contents.
        files.setValue("text", std::string(static_cast<std::size_t>(number % 5000), 'x'), domain);
        if (!files.synchronize(domain)) ::_exit(1);
        Acknowledge(pipe, number);
      }
    }
    // So many acknowledgements, then the next moment that comes.
    int acknowledged = 0;
    for (int i = 0; i <= round % 4; ++i) {
      ASSERT_EQ(::read(pipe.read.get(), &acknowledged, sizeof acknowledged),
                static_cast<ssize_t>(sizeof acknowledged));
    }
    ASSERT_EQ(::kill(child, SIGKILL), 0);
    int status = 0;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
    acknowledged = LastAcknowledged(pipe, acknowledged);

    PreferenceFiles files(temporary.roots());
    const auto number = files.copyValue("number", domain);
    ASSERT_TRUE(number && number->integer());
    EXPECT_GE(*number->integer(), acknowledged);
    EXPECT_LE(*number->integer(), acknowledged + 1);
    EXPECT_EQ(files.copyValue("text", domain),
              PropertyList(std::string(static_cast<std::size_t>(*number->integer() % 5000), 'x')));
    next = static_cast<int>(*number->integer()) + 1;
  }
}

}  // namespace
