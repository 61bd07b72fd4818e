// SPDX-License-Identifier: Apache-2.0
//
// The launcher of the handset, with a helper that serves one message per instance. One thread.
#include <fcntl.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Tests/Handset/HandsetRun.h"
#include "Tools/handset/Files.h"

namespace handset_tests {
namespace {

class Launcher : public HandsetSuite {};

TEST_F(Launcher, StartsNothingBeforeTheFirstMessage) {
  const Outcome run = RunHandset("handset status --json");
  EXPECT_EQ(run.output,
            "{\"running\":false,\"pid\":null,\"starts\":0,\"exits\":0,\"stopped\":false,"
            "\"message_queued\":false,\"log_lines\":0,\"last_exit\":null}\n");
  EXPECT_EQ(run.status, 0) << run.errors;
}

TEST_F(Launcher, StartsTheHelperWithTheSendersCredentialsOnTheFirstMessage) {
  for (const std::string user : {"halvec", "mobile", "root"}) {
    const Outcome run = RunHandset("handset as " + user + " -- caller who && handset wait-exit");
    EXPECT_TRUE(run.output.starts_with("own\nexited 0 after ")) << user << ": " << run.output;
    EXPECT_EQ(run.status, 0) << run.errors;
  }
}

TEST_F(Launcher, HandsOverTheServicePortAndNothingElse) {
  // One that the tool's own caller has left open across the start of programs.
  const platform::FileDescriptor nothing(open("/dev/null", O_RDONLY | O_CLOEXEC));
  const platform::FileDescriptor stray(fcntl(nothing.get(), F_DUPFD, 20));
  ASSERT_GE(stray.get(), 20);
  const Outcome run = RunHandset("caller call descriptors");
  EXPECT_EQ(run.output, "0 1 2 3 \n") << run.errors;
}

TEST_F(Launcher, DoesNotWatchThePortWhileTheHelperRuns) {
  // The kernel lists what the first process's epoll descriptor watches, with inode numbers.
  const Outcome run = RunHandset(
      "port=$(printf 'ino:%x ' $(grep com.zarvo.halvec.mobile-helper /proc/net/unix |"
      " (read -r a b c d e f inode rest; echo $inode)))\n"
      "watched() { cat /proc/1/fdinfo/* | grep ^tfd: | grep -c \"$port\"; }\n"
      "watched; caller post block; handset log --follow-until blocking >/dev/null; watched\n"
      "handset kill; handset wait-exit >/dev/null; watched");
  EXPECT_EQ(run.output, "1\n0\n1\n") << run.errors;
}

TEST_F(Launcher, GivesTheHelperAServicesEnvironment) {
  const Outcome run = RunHandset("caller call environment");
  EXPECT_EQ(run.output, "PATH LISTEN_PID LISTEN_FDS LISTEN_FDNAMES \n") << run.errors;
}

TEST_F(Launcher, ServesEveryMessageThatMeetsAnEndingHelperWithTheNextInstance) {
  const Outcome run = RunHandset(
      "caller rounds 300 && handset wait-exit --exits 300 >/dev/null && "
      "handset status --json");
  EXPECT_NE(run.output.find("300 rounds, 300 instances\n"), std::string::npos) << run.output;
  EXPECT_NE(run.output.find("\"starts\":300,\"exits\":300,\"stopped\":false"), std::string::npos)
      << run.output;
  EXPECT_EQ(run.status, 0) << run.errors;
}

TEST_F(Launcher, KeepsTheOrderOfMessagesThatWaitTogether) {
  const Outcome run = RunHandset("caller batch 10");
  EXPECT_EQ(run.output, "0\n1\n2\n3\n4\n5\n6\n7\n8\n9\n") << run.errors;
}

TEST_F(Launcher, KeepsAQueuedMessageAndItsSenderWhenTheHelperIsKilled) {
  const Outcome run = RunHandset(
      "caller post block; handset log --follow-until blocking >/dev/null\n"
      "handset as mobile -- caller who & handset log --follow-until sent >/dev/null\n"
      "handset kill KILL; handset wait-exit --exits 2 >/dev/null; wait; handset status --json");
  EXPECT_TRUE(run.output.starts_with("own\n")) << run.output;
  EXPECT_NE(run.output.find("\"starts\":2,\"exits\":2"), std::string::npos) << run.output;
  EXPECT_EQ(run.status, 0) << run.errors;
}

TEST_F(Launcher, StartsAgainAtOnceForAMessageThatWaitsAtTheExit) {
  const Outcome run = RunHandset(
      "caller post 'exit 3'; caller post 'exit 4'; caller post 'exit 5'\n"
      "handset wait-exit --exits 3; handset status --json");
  EXPECT_TRUE(run.output.starts_with("exited 5 after ")) << run.output;
  EXPECT_NE(run.output.find("\"starts\":3,\"exits\":3"), std::string::npos) << run.output;
}

TEST_F(Launcher, ReportsTheSignalThatEndedTheHelper) {
  const Outcome run = RunHandset("caller post abort; handset wait-exit");
  EXPECT_TRUE(run.output.starts_with("killed by signal 6 after ")) << run.output;
}

TEST_F(Launcher, StopsACrashLoopAndSaysSo) {
  const Outcome run =
      RunHandset("caller post x; handset wait-exit --exits 10 >/dev/null; handset status --json",
                 {"--helper", "/bin/false"});
  EXPECT_NE(run.output.find("\"starts\":10,\"exits\":10,\"stopped\":true,\"message_queued\":true"),
            std::string::npos)
      << run.output;
  EXPECT_NE(run.errors.find("the helper ended 10 times in a row without serving a message"),
            std::string::npos)
      << run.errors;
}

TEST_F(Launcher, TakesAHelperThatEndsWellWithoutReadingForACrashLoopToo) {
  const Outcome run =
      RunHandset("caller post x; handset wait-exit --exits 10 >/dev/null; handset status --json",
                 {"--helper", "/bin/true"});
  EXPECT_NE(run.output.find("\"starts\":10,\"exits\":10,\"stopped\":true"), std::string::npos)
      << run.output;
}

TEST_F(Launcher, CountsOnlyInstancesInARowForACrashLoop) {
  const Outcome run = RunHandset(
      "caller post 'late 9'; caller post 'late 9'\n"
      "handset wait-exit --exits 20 >/dev/null; handset status --json");
  EXPECT_NE(run.output.find("\"starts\":20,\"exits\":20,\"stopped\":false,"
                            "\"message_queued\":false"),
            std::string::npos)
      << run.output;
}

TEST_F(Launcher, DoesNotTakeHelpersThatServeAndFailForACrashLoop) {
  const Outcome run = RunHandset(
      "for i in 1 2 3 4 5 6 7 8 9 10 11 12 13 14 15; do caller post \"exit $i\"; done\n"
      "handset wait-exit --exits 15 >/dev/null; handset status --json");
  EXPECT_NE(run.output.find("\"starts\":15,\"exits\":15,\"stopped\":false"), std::string::npos)
      << run.output;
}

TEST_F(Launcher, StartsWithoutAMessageOnRequestOnceAtATime) {
  const Outcome run = RunHandset(
      "handset start-helper; handset start-helper; echo $?; handset kill TERM; handset wait-exit\n"
      "handset kill; echo $?");
  EXPECT_TRUE(run.output.starts_with("1\nkilled by signal 15 after ")) << run.output;
  EXPECT_TRUE(run.output.ends_with(" ms\n1\n")) << run.output;
  EXPECT_EQ(run.errors, "handset: a helper runs already\nhandset: no helper runs\n");
}

TEST_F(Launcher, EndsAWaitThatIsNotMetWithStatus124) {
  const Outcome run = RunHandset(
      "handset wait-start --timeout 0.01; echo $?; handset wait-exit --timeout 0.01; echo $?\n"
      "handset log --follow-until never --timeout 0.01; echo $?");
  EXPECT_EQ(run.output, "124\n124\n124\n");
}

TEST_F(Launcher, QueuesAsManyDatagramsAsAsked) {
  // The helper blocks with the first message in hand, so everything after it stays queued.
  const std::string script =
      "caller post block; handset log --follow-until blocking >/dev/null; caller burst";
  // The kernel lets one more in than the setting says.
  EXPECT_EQ(RunHandset(script, {"--queue", "4"}).output, "5\n");
  EXPECT_EQ(RunHandset(script, {"--queue", "100"}).output, "101\n");
}

TEST_F(Launcher, AppendsStartsAndExitsToTheEventsFile) {
  const TemporaryFolder folder;
  const std::string file = folder.path() + "/events";
  const Outcome run =
      RunHandset("caller post 'exit 3'; handset wait-exit >/dev/null", {"--events", file});
  ASSERT_EQ(run.status, 0) << run.errors;
  const std::string events = handset::ReadWholeFile(file);
  EXPECT_TRUE(events.starts_with("{\"event\":\"start\",\"monotonic_ns\":")) << events;
  EXPECT_NE(events.find("\"reason\":\"message\"}\n{\"event\":\"exit\","), std::string::npos)
      << events;
  EXPECT_NE(events.find("\"code\":3,\"signal\":0,\"lived_ms\":"), std::string::npos) << events;
}

}  // namespace
}  // namespace handset_tests
