// SPDX-License-Identifier: Apache-2.0
//
// What a handset shows of the host, what it keeps apart, and that it leaves nothing behind. One
// thread.
#include <gtest/gtest.h>
#include <poll.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>
#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Tests/Handset/HandsetRun.h"
#include "Tools/handset/Files.h"

namespace handset_tests {
namespace {

using platform::FileDescriptor;

class HandsetIsolation : public HandsetSuite {};

std::vector<pid_t> ChildrenOf(pid_t pid) {
  const std::string id = std::to_string(pid);
  std::ifstream file("/proc/" + id + "/task/" + id + "/children");
  std::vector<pid_t> children;
  for (pid_t child = 0; file >> child;) children.push_back(child);
  return children;
}

/// Everything below `pid` at this moment, held by descriptors that outlast the processes.
std::vector<FileDescriptor> HoldDescendants(pid_t pid) {
  std::vector<FileDescriptor> held;
  for (const pid_t child : ChildrenOf(pid)) {
    held.emplace_back(static_cast<int>(syscall(SYS_pidfd_open, child, 0)));
    for (FileDescriptor& below : HoldDescendants(child)) held.push_back(std::move(below));
  }
  return held;
}

TEST_F(HandsetIsolation, StartsWithAnEmptyHomeAndAnEmptyFolderForTemporaryFiles) {
  const Outcome run = RunHandset(
      "ls -A /tmp /var/mobile /root /Library/Preferences; stat -c '%n %U:%G %a' /tmp /var/mobile "
      "/root /Library/Preferences");
  EXPECT_EQ(run.output,
            "/Library/Preferences:\n\n/root:\n\n/tmp:\n\n/var/mobile:\n"
            "/tmp root:root 1777\n/var/mobile mobile:mobile 755\n/root root:root 700\n"
            "/Library/Preferences root:root 755\n");
}

TEST_F(HandsetIsolation, HasOneMobileHomeUnderTwoNames) {
  const Outcome run = RunHandset(
      "touch /var/mobile/a; cd /; mv /private/var/mobile/a /var/mobile/b && ls "
      "/private/var/mobile\n"
      "stat -c %d:%i /var/mobile /private/var/mobile/ | uniq | wc -l");
  EXPECT_EQ(run.output, "b\n1\n");
}

TEST_F(HandsetIsolation, KeepsEveryWriteFromTheHost) {
  const std::string name = "handset-test-" + std::to_string(getpid());
  const std::vector<std::string> places{"/etc/", "/usr/bin/", "/var/lib/", "/tmp/", "/run/", "/"};
  std::string script = "set -e\n";
  for (const std::string& place : places)
    script.append("touch ").append(place).append(name).append("\n");
  const Outcome run = RunHandset(script + "echo written");
  EXPECT_EQ(run.output, "written\n") << run.errors;
  for (const std::string& place : places) {
    EXPECT_NE(access((place + name).c_str(), F_OK), 0) << place;
  }
}

TEST_F(HandsetIsolation, ShowsTheHostsOtherFoldersReadOnly) {
  const Outcome run = RunHandset("touch /opt/x 2>&1 | grep -c 'Read-only file system'");
  EXPECT_EQ(run.output, "1\n");
}

TEST_F(HandsetIsolation, WritesThroughWhereABindSaysSo) {
  const TemporaryFolder folder;
  const Outcome same =
      RunHandset("echo same > " + folder.path() + "/one", {"--bind", folder.path()});
  const Outcome other = RunHandset("echo other > /var/shown/here/two",
                                   {"--bind", folder.path() + ":/var/shown/here"});
  EXPECT_EQ(same.status, 0) << same.errors;
  EXPECT_EQ(other.status, 0) << other.errors;
  EXPECT_EQ(handset::ReadWholeFile(folder.path() + "/one"), "same\n");
  EXPECT_EQ(handset::ReadWholeFile(folder.path() + "/two"), "other\n");
}

TEST_F(HandsetIsolation, KeepsItsDataInAStateFolder) {
  const TemporaryFolder folder;
  const Outcome first = RunHandset(
      "handset as mobile -- sh -c 'echo kept > ~/note'; echo domain > /Library/Preferences/p",
      {"--state", folder.path()});
  const Outcome second =
      RunHandset("cat ~mobile/note /Library/Preferences/p; stat -c %U ~mobile ~mobile/note",
                 {"--state", folder.path()});
  EXPECT_EQ(first.status, 0) << first.errors;
  EXPECT_EQ(second.output, "kept\ndomain\nmobile\nmobile\n") << second.errors;
}

TEST_F(HandsetIsolation, KeepsTheHelpersHomeAndTokensInAStateFolder) {
  const TemporaryFolder folder;
  const Outcome first = RunHandset("echo domain > /root/p; echo token > " TOKEN_FOLDER "/t",
                                   {"--state", folder.path()});
  const Outcome second = RunHandset(
      "cat /root/p " TOKEN_FOLDER "/t; stat -c %a /root " TOKEN_FOLDER, {"--state", folder.path()});
  EXPECT_EQ(first.status, 0) << first.errors;
  EXPECT_EQ(second.output, "domain\ntoken\n700\n755\n") << second.errors;
}

TEST_F(HandsetIsolation, LeavesNoMountOnTheHost) {
  const std::string before = handset::ReadWholeFile("/proc/self/mountinfo");
  EXPECT_EQ(RunHandset("caller call x >/dev/null").status, 0);
  EXPECT_EQ(handset::ReadWholeFile("/proc/self/mountinfo"), before);
}

/// Runs a script of the host in a mount namespace in which it may mount what it likes.
Outcome RunAsideFromTheHost(const char* propagation, const std::string& script) {
  return RunProgram(
      {"/usr/bin/unshare", "--mount", "--propagation", propagation, "sh", "-c", script});
}

TEST_F(HandsetIsolation, LeavesNoMountOnAHostWhoseMountsAreShared) {
  const Outcome run = RunAsideFromTheHost(
      "shared", "before=$(cat /proc/self/mountinfo); " HANDSET " run --helper " FAKE_HELPER
                " true && [ \"$before\" = \"$(cat /proc/self/mountinfo)\" ] && echo same");
  EXPECT_EQ(run.output, "same\n") << run.errors;
}

TEST_F(HandsetIsolation, DoesNotShowTheHostsVoicemailTokens) {
  const Outcome run = RunAsideFromTheHost(
      "private", "mount -t tmpfs none /var/lib && mkdir -p /var/lib/halvec " TOKEN_FOLDER
                 " && touch " TOKEN_FOLDER "/host && " HANDSET " run --helper " FAKE_HELPER
                 " sh -c 'touch " TOKEN_FOLDER "/own; ls " TOKEN_FOLDER "'");
  EXPECT_EQ(run.output, "own\n") << run.errors;
}

TEST_F(HandsetIsolation, ShowsWhatTheHostHasMountedBelowALayeredFolder) {
  const Outcome run = RunAsideFromTheHost(
      "private", "mount -t tmpfs none /var/cache && touch /var/cache/mounted && " HANDSET
                 " run --helper " FAKE_HELPER
                 " sh -c 'ls /var/cache; touch /var/cache/x 2>/dev/null || echo read-only'");
  EXPECT_EQ(run.output, "mounted\nread-only\n") << run.errors;
}

TEST_F(HandsetIsolation, EndsEveryProcessWithTheCommand) {
  RunningHandset run(
      "caller post block; handset wait-start >/dev/null; cat /dev/zero >/dev/null &\n"
      "setsid cat /dev/zero >/dev/null & echo ready; read -r line");
  ASSERT_EQ(run.nextLine(), "ready");
  std::vector<FileDescriptor> inside = HoldDescendants(run.pid());
  // The first process, the shell, the helper and two that write nowhere.
  ASSERT_GE(inside.size(), 5U);
  static_cast<void>(run.finish());
  for (const FileDescriptor& process : inside) {
    pollfd ended{process.get(), POLLIN, 0};
    EXPECT_EQ(poll(&ended, 1, 0), 1) << "a process outlived the handset";
  }
}

TEST_F(HandsetIsolation, EndsEveryProcessWithTheToolEvenWhenThatIsKilled) {
  const std::string before = handset::ReadWholeFile("/proc/self/mountinfo");
  RunningHandset run(
      "caller post block; handset wait-start >/dev/null; cat /dev/zero >/dev/null &\n"
      "setsid cat /dev/zero >/dev/null & echo ready; read -r line");
  ASSERT_EQ(run.nextLine(), "ready");
  std::vector<FileDescriptor> inside = HoldDescendants(run.pid());
  ASSERT_GE(inside.size(), 5U);
  ASSERT_EQ(kill(run.pid(), SIGKILL), 0);
  // The script's input is still open, so that nothing but the kill can end it. Nobody waits for
  // these processes any more, so their ends come a moment after the tool's.
  for (const FileDescriptor& process : inside) {
    pollfd ended{process.get(), POLLIN, 0};
    EXPECT_EQ(poll(&ended, 1, -1), 1);
  }
  EXPECT_EQ(run.finish().status, 128 + SIGKILL);
  EXPECT_EQ(handset::ReadWholeFile("/proc/self/mountinfo"), before);
}

TEST_F(HandsetIsolation, ReapsOrphans) {
  // An orphan that nobody waits for would stay in /proc as a zombie.
  const Outcome run = RunHandset(
      "mkfifo /tmp/pid /tmp/go; (sh -c 'echo $$ > /tmp/pid; read -r line < /tmp/go' &)\n"
      "read -r orphan < /tmp/pid; grep PPid /proc/$orphan/status\n"
      "echo > /tmp/go; while [ -e /proc/$orphan ]; do :; done; echo reaped");
  EXPECT_EQ(run.output, "PPid:\t1\nreaped\n") << run.errors;
}

TEST_F(HandsetIsolation, TwoHandsetsDoNotDisturbEachOther) {
  RunningHandset first(
      "caller post block; handset log --follow-until blocking >/dev/null\n"
      "echo first > /var/mobile/name; echo ready; read -r line\n"
      "cat /var/mobile/name; handset status --json; handset log");
  ASSERT_EQ(first.nextLine(), "ready");
  const Outcome second = RunHandset(
      "handset status --json | grep -o '\"starts\":[0-9]*'; ls -A /var/mobile; logger other\n"
      "cat /proc/[0-9]*/comm | grep -c HalvecMobile; caller rounds 20; handset log | wc -l");
  EXPECT_EQ(second.output, "\"starts\":0\n0\n20 rounds, 20 instances\n1\n") << second.errors;
  const Outcome rest = first.finish();
  EXPECT_TRUE(rest.output.starts_with("first\n{\"running\":true,")) << rest.output;
  EXPECT_NE(rest.output.find("\"starts\":1,\"exits\":0,"), std::string::npos) << rest.output;
  EXPECT_TRUE(rest.output.ends_with("\n<5>blocking\n")) << rest.output;
}

}  // namespace
}  // namespace handset_tests
