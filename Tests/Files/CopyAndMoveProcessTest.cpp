// SPDX-License-Identifier: Apache-2.0
//
// The real helper as root in the handset: whose the copies are, what is left where, what is logged.
#include "Tests/Process/ProcessSuite.h"

namespace process_tests {
namespace {

using CopyFile = ProcessSuite;
using CopyCrashLogs = ProcessSuite;
using MoveCarrierBundles = ProcessSuite;

const std::string kHome = "cd /var/mobile; mkdir -p Library; chown mobile:mobile Library\n";
const std::string kLog = "; handset log --json | grep -o '\"priority\":[35].*\"pid\"'";

std::string Line(int priority, const std::string& text) {
  return "\"priority\":" + std::to_string(priority) +
         ",\"identifier\":\"HalvecMobileHelper\",\"text\":\"" + text + "\\n\",\"pid\"\n";
}

TEST_F(CopyFile, IntoANewBundleDirectoryGivesTheCopyToTheMobileUserAndTheSourceToRoot) {
  const Outcome outcome =
      run(kHome +
          "mkdir /tmp/s; echo text >/tmp/s/f; chown mobile:mobile /tmp/s/f; umask 077\n"
          "halvecctl call CopyFile /tmp/s '/var/mobile/Library/Carrier Bundles/new' f >/dev/null\n"
          "echo $?; cd Library; cat 'Carrier Bundles/new/f'\n"
          "stat -c '%a %U:%G' 'Carrier Bundles/new' 'Carrier Bundles/new/f' /tmp/s/f" +
          kLog);
  EXPECT_EQ(outcome.output, "0\ntext\n755 root:root\n644 mobile:mobile\n644 root:root\n" +
                                Line(5, "'/tmp/s', '/var/mobile/Library/Carrier Bundles/new', 'f'"))
      << outcome.errors;
}

TEST_F(CopyFile, OutsideEveryAllowedPlaceTouchesNothing) {
  const Outcome outcome =
      run("mkdir /tmp/s; echo text >/tmp/s/f; chown mobile /tmp/s/f\n"
          "halvecctl call CopyFile /tmp/s /etc/new f >/dev/null 2>&1; echo $?\n"
          "ls -d /etc/new 2>/dev/null; stat -c %U /tmp/s/f; handset log | grep 'Destination'");
  EXPECT_TRUE(outcome.output.starts_with("1\nmobile\n")) << outcome.output << outcome.errors;
  EXPECT_NE(
      outcome.output.find("Destination directory /etc/new/f is not within the allowed directories"),
      std::string::npos)
      << outcome.output;
}

TEST_F(CopyFile, ThatIsALinkGivesTheFileBehindItToTheMobileUserAndNotTheLink) {
  const Outcome outcome =
      run(kHome +
          "mkdir /tmp/s; echo text >/tmp/behind; ln -s /tmp/behind /tmp/s/f\n"
          "ln -s /none /tmp/s/dangling\n"
          "for name in f dangling; do halvecctl call CopyFile /tmp/s "
          "'/var/mobile/Library/Carrier Bundles' $name >/dev/null 2>&1; echo $?; done\n"
          "stat -c '%F %U' '/var/mobile/Library/Carrier Bundles/f' /tmp/behind");
  EXPECT_EQ(outcome.output, "0\n1\nsymbolic link root\nregular file mobile\n") << outcome.errors;
}

TEST_F(CopyFile, ThatIsALinkToWhatIsOnlyBesideItsSourceStaysButFailsWithoutALine) {
  const Outcome outcome =
      run(kHome +
          "mkdir /tmp/s; echo text >/tmp/s/beside; ln -s beside /tmp/s/f\n"
          "halvecctl call CopyFile /tmp/s '/var/mobile/Library/Carrier Bundles' f >/dev/null 2>&1\n"
          "echo $?; readlink '/var/mobile/Library/Carrier Bundles/f'" +
          kLog);
  EXPECT_EQ(outcome.output,
            "1\nbeside\n" + Line(5, "'/tmp/s', '/var/mobile/Library/Carrier Bundles', 'f'"))
      << outcome.errors;
}

TEST_F(CopyFile, ReplacesALinkThatTheMobileUserPlantedAndGivesNothingBehindItAway) {
  const Outcome outcome =
      run(kHome +
          "mkdir -p /tmp/s /tmp/guarded 'Library/Carrier Bundles'; echo text >/tmp/s/f\n"
          "cd 'Library/Carrier Bundles'; ln -s /tmp/guarded f; chown -h mobile f\n"
          "halvecctl call CopyFile /tmp/s \"$PWD\" f >/dev/null; echo $?\n"
          "stat -c '%F %U' f /tmp/guarded; ls -A /tmp/guarded");
  EXPECT_EQ(outcome.output, "0\nregular file mobile\ndirectory root\n") << outcome.errors;
}

TEST_F(CopyFile, GoesThroughNoLinkOfTheMobileUserOnTheWay) {
  const Outcome outcome =
      run(kHome +
          "mkdir -p /tmp/s /tmp/guarded; echo text >/tmp/s/f; cd Library\n"
          "ln -s /tmp/guarded 'Carrier Bundles'; chown -h mobile 'Carrier Bundles'\n"
          "halvecctl call CopyFile /tmp/s \"$PWD/Carrier Bundles\" f >/dev/null 2>&1; echo $?\n"
          "halvecctl call RemoveCarrierBundleLink \"$PWD/Carrier Bundles/f\" ''\n"
          "ls -A /tmp/guarded; stat -c %U /tmp/guarded" +
          kLog + " | tail -n 1");
  EXPECT_EQ(outcome.output,
            "1\ncode 5 (KERN_FAILURE)\nroot\n" +
                Line(3,
                     "Failed to copy the file /tmp/s to /var/mobile/Library/Carrier "
                     "Bundles"))
      << outcome.errors;
}

TEST_F(CopyFile, LeavesNothingOfAKillWhenTheNextCopyIsDone) {
  const Outcome outcome =
      run(kHome +
          "mkdir -p /tmp/s Library/Logs/CrashReporter/.halvec-copy-0/half\n"
          "echo a >/tmp/s/f; halvecctl crash-logs copy /tmp/s; ls -A Library/Logs/CrashReporter");
  EXPECT_EQ(outcome.output, "s\n") << outcome.errors;
}

TEST_F(CopyFile, ThatIsAFifoFailsAtOnceAndTheHelperServesOn) {
  const Outcome outcome =
      run(kHome +
          "mkdir /tmp/s; mkfifo /tmp/s/f\n"
          "halvecctl call CopyFile /tmp/s '/var/mobile/Library/Carrier Bundles' f >/dev/null 2>&1\n"
          "echo $?; ls -A 'Library/Carrier Bundles'; client connect");
  EXPECT_EQ(outcome.output, "1\n0\n") << outcome.errors;
}

TEST_F(CopyCrashLogs, GoWithTheirOwnersAndOnlyTheTopBecomesRoots) {
  const Outcome outcome =
      run(kHome +
          "mkdir -p /tmp/crash/sub Library/Logs/CrashReporter; echo a >/tmp/crash/sub/a\n"
          "chown -R mobile:mobile /tmp/crash\n"
          "halvecctl call CopyCrashLogs /tmp/crash >/dev/null; echo $?\n"
          "cd Library/Logs/CrashReporter; stat -c '%n %U' crash crash/sub crash/sub/a /tmp/crash" +
          kLog);
  EXPECT_EQ(outcome.output,
            "0\ncrash root\ncrash/sub mobile\ncrash/sub/a mobile\n/tmp/crash root\n" +
                Line(5, "'/tmp/crash', '/var/mobile/Library/Logs/CrashReporter/'"))
      << outcome.errors;
}

TEST_F(CopyCrashLogs, ThatAreMissingAreLoggedAtNoticeWithMinus1) {
  const Outcome outcome = run("halvecctl call CopyCrashLogs /none >/dev/null 2>&1; echo $?" + kLog);
  EXPECT_EQ(outcome.output, "1\n" + Line(5, "'/none', '/var/mobile/Library/Logs/CrashReporter/'") +
                                Line(5,
                                     "Failed to copy the directory /none to "
                                     "/var/mobile/Library/Logs/CrashReporter/. Error: -1"))
      << outcome.errors;
}

TEST_F(CopyCrashLogs, MergedAreNotLedAwayByALinkInTheDestination) {
  const Outcome outcome =
      run(kHome +
          "mkdir -p /tmp/crash/sub Library/Logs/CrashReporter/crash /tmp/elsewhere\n"
          "echo a >/tmp/crash/sub/a; echo b >/tmp/crash/b\n"
          "ln -s /tmp/elsewhere Library/Logs/CrashReporter/crash/sub\n"
          "halvecctl call CopyCrashLogs /tmp/crash >/dev/null; echo $?\n"
          "ls -A /tmp/elsewhere; cat Library/Logs/CrashReporter/crash/b");
  EXPECT_EQ(outcome.output, "0\nb\n") << outcome.errors;
}

TEST_F(MoveCarrierBundles, ToAPackageBelowTmpMakesTheWholeTreeRoots) {
  const Outcome outcome =
      run("mkdir -p /tmp/b/sub; echo a >/tmp/b/sub/a; chown -R mobile:mobile /tmp/b\n"
          "halvecctl call MoveCarrierBundles /tmp/b /tmp x.tcbk >/dev/null; echo $?\n"
          "ls -d /tmp/b 2>/dev/null; stat -c '%n %U' /tmp/x.tcbk /tmp/x.tcbk/sub/a");
  EXPECT_EQ(outcome.output, "0\n/tmp/x.tcbk root\n/tmp/x.tcbk/sub/a root\n") << outcome.errors;
}

TEST_F(MoveCarrierBundles, ThatAreALinkOfTheMobileUserMovesTheLinkAndGivesNothingAway) {
  const Outcome outcome =
      run("mkdir -p /tmp/guarded/sub; chown -R daemon /tmp/guarded\n"
          "ln -s guarded /tmp/b; chown -h mobile /tmp/b\n"
          "halvecctl call MoveCarrierBundles /tmp/b /tmp x.tcbk >/dev/null; echo $?\n"
          "stat -c '%F %U' /tmp/x.tcbk /tmp/guarded /tmp/guarded/sub");
  EXPECT_EQ(outcome.output, "0\nsymbolic link root\ndirectory daemon\ndirectory daemon\n")
      << outcome.errors;
}

TEST_F(MoveCarrierBundles, ThatAreRefusedLeaveANewEmptyDirectory) {
  const Outcome outcome =
      run("mkdir /tmp/b; halvecctl call MoveCarrierBundles /tmp/b /tmp/new/deep x >/dev/null 2>&1\n"
          "echo $?; stat -c '%a %U' /tmp/new/deep; ls -A /tmp/new/deep; ls -d /tmp/b");
  EXPECT_EQ(outcome.output, "1\n755 root\n/tmp/b\n") << outcome.errors;
}

TEST_F(MoveCarrierBundles, OntoWhatIsThereFailWithCode17) {
  const Outcome outcome =
      run("mkdir /tmp/b /tmp/x.tcbk\n"
          "halvecctl call MoveCarrierBundles /tmp/b /tmp x.tcbk >/dev/null 2>&1; echo $?" +
          kLog + " | tail -n 1");
  EXPECT_EQ(outcome.output,
            "1\n" + Line(3, "Failed to move the directory /tmp/b to /tmp. Error: 17"))
      << outcome.errors;
}

}  // namespace
}  // namespace process_tests
