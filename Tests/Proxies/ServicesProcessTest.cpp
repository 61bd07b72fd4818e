// SPDX-License-Identifier: Apache-2.0
//
// The real helper with a real visual-voicemail library, a radio manager that listens, and its token
// store on a file system.
#include "Tests/Process/ProcessSuite.h"

namespace process_tests {
namespace {

using Subscription = ProcessSuite;
using RadioLog = ProcessSuite;
using TokenStore = ProcessSuite;

/// The library, where a script can take it from, and its place.
const std::vector<std::string> kLibrary{"--bind",
                                        VISUAL_VOICEMAIL ":/usr/local/lib/visual-voicemail.so"};
const std::string kPlace = HALVEC_VOICEMAIL_LIBRARY;
const std::string kInstall = "install -D /usr/local/lib/visual-voicemail.so " + kPlace + "\n";
const std::string kStore = HALVEC_TOKEN_STORE;

TEST_F(Subscription, IsWhatTheLibraryAnswersEachTime) {
  const Outcome outcome = run(kInstall +
                                  "halvecctl voicemail subscribed; touch /tmp/subscribed\n"
                                  "halvecctl voicemail subscribed; rm /tmp/subscribed\n"
                                  "halvecctl voicemail subscribed; handset log",
                              kLibrary);
  EXPECT_EQ(outcome.output, "false\ntrue\nfalse\n") << outcome.errors;
}

TEST_F(Subscription, IsFalseForTheLifeOfAHelperThatDidNotFindTheLibrary) {
  const Outcome outcome = run("touch /tmp/subscribed; halvecctl voicemail subscribed\n" + kInstall +
                                  "halvecctl voicemail subscribed; handset kill KILL\n"
                                  "handset wait-exit >/dev/null; halvecctl voicemail subscribed\n"
                                  "handset log",
                              kLibrary);
  EXPECT_EQ(outcome.output, "false\nfalse\ntrue\n") << outcome.errors;
}

TEST_F(Subscription, IsFalseWhereTheLibraryLacksTheFunction) {
  const Outcome outcome = run("install -D /lib/x86_64-linux-gnu/libm.so.6 " + kPlace +
                              "; halvecctl voicemail subscribed; handset log");
  EXPECT_EQ(outcome.output, "false\n") << outcome.errors;
}

TEST_F(RadioLog, ReachesTheRadioManagersPortAndIsLoggedAsItCame) {
  const Outcome outcome =
      run("halvecctl radio-log on; halvecctl call SetRadioManagerLogging 2 >/dev/null\n"
          "halvecctl call SetRadioManagerLogging -7 >/dev/null; halvecctl radio-log off\n"
          "handset telephony log --count 4 --timeout 20; handset log");
  EXPECT_EQ(outcome.output,
            "com.zarvo.radio-manager  log to file 1\ncom.zarvo.radio-manager  log to file 1\n"
            "com.zarvo.radio-manager  log to file 1\ncom.zarvo.radio-manager  log to file 0\n"
            "<3>Enabling wireless radio manager logs: 1\n"
            "<3>Enabling wireless radio manager logs: 2\n"
            "<3>Enabling wireless radio manager logs: -7\n"
            "<3>Enabling wireless radio manager logs: 0\n")
      << outcome.errors;
}

TEST_F(RadioLog, IsLoggedWithoutARadioManagerAndNeverWaitsForOne) {
  const Outcome outcome =
      run("handset telephony pause; for i in $(seq 30); do halvecctl radio-log on; done\n"
          "handset telephony stop; halvecctl radio-log off; handset log | sort | uniq -c");
  EXPECT_NE(outcome.output.find(" 30 <3>Enabling wireless radio manager logs: 1\n"),
            std::string::npos)
      << outcome.output << outcome.errors;
  EXPECT_NE(outcome.output.find(" 1 <3>Enabling wireless radio manager logs: 0\n"),
            std::string::npos)
      << outcome.output;
}

TEST_F(TokenStore, KeepsTokensFromOneHelperToTheNextAndLosesNoneWhenItIsKilled) {
  const Outcome outcome =
      run("halvecctl voicemail token set 'first \xe2\x82\xac' --key k\n"
          "for i in $(seq 30); do\n"
          "  halvecctl voicemail token set token$i; handset kill KILL >/dev/null\n"
          "  handset wait-exit --exits $i --timeout 20 >/dev/null\n"
          "  [ \"$(halvecctl voicemail token get)\" = token$i ] || echo lost $i\n"
          "done; halvecctl voicemail token get; halvecctl voicemail token get --key k\n"
          "handset log");
  EXPECT_EQ(outcome.output, "token30\nfirst \xe2\x82\xac\n") << outcome.errors;
}

TEST_F(TokenStore, IsReadableByNobodyElse) {
  const Outcome outcome =
      run("umask 0; halvecctl voicemail token set secret; cd $(dirname " + kStore +
          "); stat -c '%a %U' . " + kStore +
          "*\n"
          "handset as mobile -- cat " +
          kStore + " 2>&1 | grep -o 'Permission denied'; grep -c secret *-wal >/dev/null; echo $?");
  EXPECT_EQ(outcome.output, "700 root\n600 root\n600 root\n600 root\nPermission denied\n0\n")
      << outcome.errors;
}

TEST_F(TokenStore, AnswersTheEmptyTextAfterAResetAndKeepsThatOfAKey) {
  const Outcome outcome =
      run("halvecctl voicemail token set a; halvecctl voicemail token set b --key k\n"
          "halvecctl voicemail reset; halvecctl voicemail token get; echo $?\n"
          "halvecctl voicemail token get --key k; halvecctl voicemail token clear --key k\n"
          "halvecctl voicemail token get --key k; echo $?; halvecctl call CopyVoicemailToken");
  EXPECT_EQ(outcome.output, "6\nb\n6\ncode 0 (KERN_SUCCESS)\ntoken: \n") << outcome.errors;
}

TEST_F(TokenStore, RefusesTokensThatAreNotUtf8) {
  const Outcome outcome =
      run("halvecctl voicemail token set good; halvecctl call SetVoicemailToken \"$(printf "
          "'bad\\377')\"; halvecctl voicemail token get");
  EXPECT_EQ(outcome.output, "code 5 (KERN_FAILURE)\ngood\n") << outcome.errors;
}

TEST_F(TokenStore, ThatIsDamagedIsKeptAsideAndBegunAnew) {
  const Outcome outcome =
      run("mkdir -p $(dirname " + kStore + "); head -c 9000 /dev/zero | tr '\\0' x >" + kStore +
          "; halvecctl voicemail token set new; halvecctl voicemail token get\n"
          "wc -c <" +
          kStore + ".corrupt-1; handset log | grep -c 'is damaged'");
  EXPECT_EQ(outcome.output, "new\n9000\n1\n") << outcome.errors;
}

TEST_F(TokenStore, WithoutItsLibraryAnswersZeroAndLogs) {
  const Outcome outcome = run(
      "rm -f /usr/lib/*/libsqlite3.so*; halvecctl call SetVoicemailToken t\n"
      "halvecctl voicemail token get; echo $?; handset log | grep -c 'cannot .* token: .*sqlite'");
  EXPECT_EQ(outcome.output, "code 0 (KERN_SUCCESS)\n6\n2\n") << outcome.errors;
}

}  // namespace
}  // namespace process_tests
