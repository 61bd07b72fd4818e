// SPDX-License-Identifier: Apache-2.0
//
// The handset as its users meet it: command, users, log, entitlements, control. One thread.
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <string>

#include "Tests/Handset/HandsetRun.h"
#include "Tools/handset/Files.h"

namespace handset_tests {
namespace {

class Handset : public HandsetSuite {};

TEST_F(Handset, EndsWithTheStatusOfTheCommand) {
  EXPECT_EQ(RunHandset("exit 0").status, 0);
  EXPECT_EQ(RunHandset("exit 7").status, 7);
  EXPECT_EQ(RunHandset("kill -KILL $$").status, 128 + SIGKILL);
}

TEST_F(Handset, SaysWhyACommandDoesNotStart) {
  const Outcome absent = RunProgram({HANDSET, "run", "--helper", FAKE_HELPER, "no-such-command"});
  EXPECT_EQ(absent.status, 127);
  EXPECT_EQ(absent.errors, "handset: cannot run no-such-command: No such file or directory\n");
  EXPECT_EQ(RunProgram({HANDSET, "run", "--helper", FAKE_HELPER, "/etc/passwd"}).status, 126);
}

TEST_F(Handset, RefusesAHelperThatIsNone) {
  const Outcome run = RunProgram({HANDSET, "run", "--helper", "/etc/passwd", "true"});
  EXPECT_EQ(run.status, 125);
  EXPECT_EQ(run.errors, "handset: --helper /etc/passwd: not an executable file\n");
}

TEST(HandsetUsage, IsRefusedWithStatus2) {
  EXPECT_EQ(RunProgram({HANDSET}).status, 2);
  EXPECT_EQ(RunProgram({HANDSET, "run"}).status, 2);
  EXPECT_EQ(RunProgram({HANDSET, "run", "--no-such-option", "true"}).status, 2);
  EXPECT_EQ(RunProgram({HANDSET, "run", "--verbose=yes", "true"}).status, 2);
}

TEST(HandsetUsage, QuestionsNeedAHandsetAroundThem) {
  const Outcome run = RunProgram({HANDSET, "status"});
  EXPECT_EQ(run.status, 125);
  EXPECT_EQ(run.errors, "handset: this command works inside a handset only (handset run -- ...)\n");
}

TEST_F(Handset, PassesASignalToTheCommand) {
  RunningHandset run("trap 'echo ended; exit 9' TERM; echo ready; read -r line");
  ASSERT_EQ(run.nextLine(), "ready");
  ASSERT_EQ(kill(run.pid(), SIGTERM), 0);
  EXPECT_EQ(run.nextLine(), "ended");
  EXPECT_EQ(run.finish().status, 9);
}

TEST_F(Handset, HasItsTwoUsers) {
  const Outcome run = RunHandset(
      "getent passwd mobile halvec; getent group mobile halvec\n"
      "handset as mobile -- id; handset as --without-group mobile -- id -G\n"
      "handset as 502 -- sh -c 'id -un; echo $HOME $USER $LOGNAME'; handset as no-such-user id");
  EXPECT_EQ(run.output,
            "mobile:x:501:501:Mobile User:/var/mobile:/bin/sh\n"
            "halvec:x:502:502:Telephony Daemon:/var/empty:/bin/sh\n"
            "mobile:x:501:\nhalvec:x:502:\n"
            "uid=501(mobile) gid=501(mobile) groups=501(mobile),502(halvec)\n"
            "501\n"
            "halvec\n/var/empty halvec halvec\n");
  EXPECT_EQ(run.errors, "handset: there is no user no-such-user\n");
}

TEST_F(Handset, TakesAMemberOutOfThePortGroupOnRequest) {
  const Outcome run = RunHandset(
      "sed -i 's/^halvec:x:502:/&mobile/' /etc/group\n"
      "handset as --without-group mobile id -G; handset as mobile id -G");
  EXPECT_EQ(run.output, "501\n501 502\n");
}

TEST_F(Handset, RunsTheCommandAsTheUserAsked) {
  const Outcome run = RunHandset("id -un; id -Gn; echo $HOME", {"--user", "mobile"});
  EXPECT_EQ(run.output, "mobile\nmobile halvec\n/var/mobile\n");
}

TEST_F(Handset, GivesTheCleanEnvironmentOfAUserOnRequest) {
  ASSERT_EQ(setenv("HANDSET_TEST_MARK", "set", 1), 0);  // NOLINT(concurrency-mt-unsafe)
  const Outcome inherited = RunHandset("echo $HANDSET_TEST_MARK $HOME");
  const Outcome clean = RunHandset("echo x$HANDSET_TEST_MARK $HOME $USER", {"--env-as", "mobile"});
  EXPECT_EQ(inherited.output, "set /root\n");
  EXPECT_EQ(clean.output, "x /var/mobile mobile\n");
}

TEST_F(Handset, LetsOnlyThePortGroupReachTheHelper) {
  const Outcome run = RunHandset(
      "handset as --without-group mobile -- caller post x; echo $?\n"
      "handset as mobile -- caller post x; echo $?");
  EXPECT_EQ(run.output, "1\n0\n");
}

TEST_F(Handset, LetsTheTelephonyDaemonPublishPortsButNotReplaceTheHelpers) {
  const Outcome run = RunHandset(
      "cd /run/halvec/ports\n"
      "handset as halvec -- sh -c 'touch own && rm own && echo published\n"
      "rm -f com.zarvo.halvec.mobile-helper 2>/dev/null || echo kept'");
  EXPECT_EQ(run.output, "published\nkept\n");
}

TEST_F(Handset, AnswersQuestionsOfRootOnly) {
  const Outcome run = RunHandset(
      "handset as mobile -- handset status; echo $?; stat -c '%U %a' /run/handset/control");
  EXPECT_EQ(run.output, "125\nroot 600\n");
  EXPECT_EQ(run.errors, "handset: connect to /run/handset/control: Permission denied\n");
}

TEST_F(Handset, DropsWhoAsksASecondQuestionBeforeTheAnswer) {
  EXPECT_EQ(RunHandset("caller ask-twice; handset status | head -n 1").output,
            "dropped\nnot running\n");
}

TEST_F(Handset, KeepsTheSystemLogByteForByte) {
  const Outcome run = RunHandset("caller call log >/dev/null; handset log --json --skip 1");
  // "<29>Mmm dd hh:mm:ss FakeHelper[PID]: ..." is what the C library sends.
  EXPECT_NE(run.output.find("\"facility\":3,\"priority\":5,\"identifier\":\"FakeHelper\","
                            "\"text\":\"trailing blank and newline \\n\",\"pid\":"),
            std::string::npos)
      << run.output;
  EXPECT_NE(run.output.find("\"text\":\"two: colons: no newline\""), std::string::npos)
      << run.output;
  EXPECT_EQ(run.output.find("unable to start"), std::string::npos) << "--skip 1 skips the first";
}

TEST_F(Handset, ShowsTheLogInThreeForms) {
  // "<11>a: x\n", then bytes that are not UTF-8 and have no header.
  const Outcome run = RunHandset(
      "caller log 3c31313e613a20780a; caller log fe00ff\n"
      "handset log; echo; handset log --raw; handset log --json | tail -n 1");
  const std::string lines = std::string("<3>x\n<5>\xfe\0\xff\n\n", 13);
  const std::string raw = std::string("<11>a: x\n\n\xfe\0\xff\n", 14);
  ASSERT_TRUE(run.output.starts_with(lines + raw)) << run.output;
  const std::string json = run.output.substr(lines.size() + raw.size());
  EXPECT_NE(json.find("\"text_hex\":\"fe00ff\",\"raw_hex\":\"fe00ff\"}\n"), std::string::npos)
      << json;
}

TEST_F(Handset, FollowsTheLogUntilATextComes) {
  const Outcome run = RunHandset(
      "handset log --follow-until colons & follow=$!\n"
      "caller call log >/dev/null; wait $follow");
  EXPECT_EQ(run.output,
            "<3>unable to start\n<5>trailing blank and newline \n<5>two: colons: no newline\n");
  EXPECT_EQ(run.status, 0);
}

TEST_F(Handset, LosesNoLineOfALogBurst) {
  const TemporaryFolder folder;
  const std::string file = folder.path() + "/log";
  const Outcome run = RunHandset(
      "i=0; while [ $i -lt 2000 ]; do echo line $i; i=$((i+1)); done | logger -t burst\n"
      "handset log | wc -l",
      {"--log", file});
  EXPECT_EQ(run.output, "2000\n") << run.errors;
  const std::string log = handset::ReadWholeFile(file);
  EXPECT_EQ(std::count(log.begin(), log.end(), '\n'), 2000);
  EXPECT_NE(log.find("\"text\":\"line 1999\""), std::string::npos);
}

TEST_F(Handset, HoldsTheLogLinesOfAWriterThatDoesNotWaitWhileItIsBusy) {
  RunningHandset run(
      "echo ready; read -r line; caller log-burst 200; read -r line\n"
      "handset log | wc -l");
  ASSERT_EQ(run.nextLine(), "ready");
  const std::string id = std::to_string(run.pid());
  const int first = std::stoi(handset::ReadWholeFile("/proc/" + id + "/task/" + id + "/children"));
  ASSERT_EQ(kill(first, SIGSTOP), 0);
  run.say("go");
  EXPECT_EQ(run.nextLine(), "200");
  ASSERT_EQ(kill(first, SIGCONT), 0);
  run.say("go");
  EXPECT_EQ(run.finish().output, "200\n");
}

TEST_F(Handset, ShowsLogAndStartsWhenVerbose) {
  const Outcome run = RunHandset("caller call log >/dev/null; handset wait-exit", {"--verbose"});
  EXPECT_NE(run.errors.find("log <3>unable to start\n"), std::string::npos) << run.errors;
  EXPECT_NE(run.errors.find(" started (message)\n"), std::string::npos) << run.errors;
  EXPECT_NE(run.errors.find(" exited 0 after "), std::string::npos) << run.errors;
}

TEST_F(Handset, InstallsExecutablesWhereTheyCanBeEntitled) {
  const Outcome run = RunHandset(
      "cp /bin/echo /tmp/mine; handset install /tmp/mine; mine called\n"
      "stat -c '%U %a' /usr/libexec/halvec/mine /usr/libexec/halvec /usr/libexec /usr /");
  EXPECT_EQ(run.output,
            "/usr/libexec/halvec/mine\ncalled\nroot 755\nroot 755\nroot 755\nroot 755\nroot 755\n");
}

TEST_F(Handset, WritesAnEntitlementForAnInstalledExecutable) {
  const Outcome run = RunHandset(
      "handset entitle /usr/libexec/halvec/caller mobile && cd /etc/halvec/entitlements.d &&\n"
      "ls && stat -c '%U %a' . * && cat *");
  EXPECT_EQ(run.output,
            "usr%2Flibexec%2Fhalvec%2Fcaller.plist\nroot 755\nroot 644\n"
            "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n"
            "  <key>Executable</key>\n  <string>/usr/libexec/halvec/caller</string>\n"
            "  <key>User</key>\n  <string>mobile</string>\n"
            "  <key>Entitlements</key>\n  <dict>\n"
            "    <key>com.zarvo.Vintrel.HalvecHelper.allow</key>\n    <true/>\n"
            "  </dict>\n</dict>\n</plist>\n")
      << run.errors;
}

TEST_F(Handset, RefusesToEntitleWhatTheSystemWouldNotTrust) {
  const Outcome run = RunHandset(
      "cp /bin/true /tmp/mine; ln -s caller /usr/libexec/halvec/link\n"
      "cp /bin/true /usr/libexec/halvec/loose; chmod g+w /usr/libexec/halvec/loose\n"
      "cp /bin/true /usr/libexec/halvec/foreign; chown mobile /usr/libexec/halvec/foreign\n"
      "for name in /tmp/mine /usr/libexec/halvec/link /usr/libexec/halvec/loose "
      "/usr/libexec/halvec/foreign /usr/libexec/halvec /usr/libexec/halvec/absent relative; do\n"
      "handset entitle $name mobile && echo entitled $name; done; ls /etc/halvec/entitlements.d");
  EXPECT_EQ(run.output, "");
  for (const char* reason :
       {"/tmp is writable by others", "link is a symbolic link", "loose is writable by others",
        "foreign is not root's", "halvec is not an executable file", "No such file or directory",
        "relative is not an absolute path"}) {
    EXPECT_NE(run.errors.find(reason), std::string::npos) << reason << " in:\n" << run.errors;
  }
  EXPECT_EQ(RunHandset("handset entitle --unchecked relative nobody; "
                       "ls /etc/halvec/entitlements.d")
                .output,
            "relative.plist\n");
}

}  // namespace
}  // namespace handset_tests
