// SPDX-License-Identifier: Apache-2.0
//
// The real helper as root in the handset: whose links, which log lines, which symbols.
#include <algorithm>
#include <sstream>

#include "Tests/Process/ProcessSuite.h"

namespace process_tests {
namespace {

using Links = ProcessSuite;
using Loading = ProcessSuite;

const std::string kInLibrary =
    "mkdir -p /var/mobile/Library/Preferences \"/var/mobile/Library/Carrier Bundles\"\n"
    "chown -R mobile:mobile /var/mobile/Library\n"
    "cd /private/var/mobile/Library; link=\"/private/var/mobile/Library/Carrier Bundle.bundle\"\n";

TEST_F(Links, OfACarrierBundleReplacesTheOldOneAndBelongsToRoot) {
  const Outcome outcome = run(kInLibrary +
                              "ln -s old \"$link\"; halvecctl bundle link '/new target' \"$link\" "
                              "--domain com.zarvo.carrier; echo $?\n"
                              "stat -c '%N %U:%G' \"Carrier Bundle.bundle\"");
  EXPECT_EQ(outcome.output, "0\n'Carrier Bundle.bundle' -> '/new target' root:root\n")
      << outcome.errors;
}

TEST_F(Links, InTheHomeOfTheUserDatabaseAreAllowedButNotTheSecondCarriersFile) {
  const Outcome outcome =
      run(kInLibrary +
          "cd /var/mobile/Library/Preferences\n"
          "for name in carrier carrier_2 operator carrier.default carrier.bootstrap; do\n"
          "  halvecctl call SetCarrierBundleLink t $PWD/com.zarvo.$name.plist ''\n"
          "done; halvecctl call SetCarrierBundleLink t "
          "/private/var/mobile/Library/Preferences/com.zarvo.carrier_2.plist ''; ls");
  EXPECT_EQ(outcome.output,
            "code 0 (KERN_SUCCESS)\ncode 8 (KERN_NO_ACCESS)\ncode 0 (KERN_SUCCESS)\n"
            "code 0 (KERN_SUCCESS)\ncode 0 (KERN_SUCCESS)\ncode 0 (KERN_SUCCESS)\n"
            "com.zarvo.carrier.bootstrap.plist\ncom.zarvo.carrier.default.plist\n"
            "com.zarvo.carrier.plist\ncom.zarvo.carrier_2.plist\ncom.zarvo.operator.plist\n")
      << outcome.errors;
}

TEST_F(Links, FollowTheHomeThatTheUserDatabaseGaveAtTheStart) {
  const Outcome outcome =
      run("mkdir -p /tmp/home/Library /var/mobile/Library\n"
          "sed -i 's#:/var/mobile:#:/tmp/home:#' /etc/passwd\n"
          "for home in /tmp/home /var/mobile /private/var/mobile; do\n"
          "  halvecctl call SetCarrierBundleLink t $home/Library/CarrierDefault.bundle ''\n"
          "  sed -i 's#:/tmp/home:#:/var/mobile:#' /etc/passwd\n"
          "done");
  EXPECT_EQ(outcome.output,
            "code 0 (KERN_SUCCESS)\ncode 8 (KERN_NO_ACCESS)\ncode 0 (KERN_SUCCESS)\n")
      << outcome.errors;
}

TEST_F(Links, FollowTheHomeOfTheStartEvenWhenTheFirstIsMadeAfterAChange) {
  const Outcome outcome =
      run("mkdir -p /tmp/home/Library /var/mobile/Library; client connect\n"
          "sed -i 's#:/var/mobile:#:/tmp/home:#' /etc/passwd\n"
          "for home in /var/mobile /tmp/home; do\n"
          "  halvecctl call SetCarrierBundleLink t $home/Library/CarrierDefault.bundle ''\n"
          "done");
  EXPECT_EQ(outcome.output, "0\ncode 0 (KERN_SUCCESS)\ncode 8 (KERN_NO_ACCESS)\n")
      << outcome.errors;
}

TEST_F(Links, WithoutAMobileUserGoBelowTheRoot) {
  const Outcome outcome =
      run("sed -i '/^mobile:/d' /etc/passwd; halvecctl path explain /Library/Carrier\\ Bundles/x\n"
          "halvecctl call RemoveCarrierBundleLink '/Library/Carrier Bundles/absent' ''");
  EXPECT_EQ(outcome.output,
            "link there:             refused: is not on the list\n"
            "remove or place there:  allowed: begins with the user's carrier-bundles directory "
            "/Library/Carrier Bundles/\ncode 5 (KERN_FAILURE)\n")
      << outcome.errors;
}

TEST_F(Links, OverADirectoryAreRefusedWithCode8AndALine) {
  const Outcome outcome = run(kInLibrary +
                              "mkdir \"$link\"; halvecctl call SetCarrierBundleLink t \"$link\" d\n"
                              "stat -c %F \"$link\"; handset log --json");
  EXPECT_TRUE(outcome.output.starts_with("code 8 (KERN_NO_ACCESS)\ndirectory\n")) << outcome.output;
  EXPECT_NE(outcome.output.find(
                "\"priority\":3,\"identifier\":\"HalvecMobileHelper\",\"text\":\"Cannot remove "
                "symlink: /private/var/mobile/Library/Carrier Bundle.bundle\""),
            std::string::npos)
      << outcome.output;
}

TEST_F(Links, ThatNobodyChecksGoAnywhereWithoutALine) {
  const Outcome outcome =
      run("halvecctl bundle link /etc/shadow /tmp/anywhere --unchecked; readlink /tmp/anywhere\n"
          "halvecctl bundle link t /proc/anywhere --unchecked 2>/dev/null; echo $?; handset log");
  EXPECT_EQ(outcome.output, "/etc/shadow\n1\n") << outcome.errors;
}

TEST_F(Links, RemovalIsRefusedOutsideAfterTheDomainsLine) {
  const Outcome outcome = run(
      "halvecctl call RemoveCarrierBundleLink /etc/passwd com.zarvo.carrier\n"
      "handset log --json | grep -o '\"priority\":.*\"pid\"'; test -f /etc/passwd && echo there");
  const auto line = [](int priority, const std::string& text) {
    return "\"priority\":" + std::to_string(priority) +
           ",\"identifier\":\"HalvecMobileHelper\",\"text\":\"" + text + "\",\"pid\"\n";
  };
  EXPECT_EQ(outcome.output,
            "code 8 (KERN_NO_ACCESS)\n" + line(5, "Removing domain: com.zarvo.carrier\\n") +
                line(3,
                     "NOT Allowing path /etc/passwd as it isn't within the wild card "
                     "directories:") +
                line(3, "/var/mobile/Library/Carrier Bundles/") +
                line(3, "/private/var/mobile/Library/Carrier Bundles") + "there\n")
      << outcome.errors;
}

TEST_F(Links, RemovalTakesAwayFilesAndEmptyDirectoriesButNoTree) {
  const Outcome outcome =
      run(kInLibrary +
          "cd 'Carrier Bundles'; mkdir empty tree; touch file tree/file; touch /tmp/u.tcbk\n"
          "for path in \"$PWD/empty\" \"$PWD/tree\" \"$PWD/file\" /tmp/u.tcbk; do\n"
          "  halvecctl call RemoveCarrierBundleLink \"$path\" ''; done\n"
          "ls -R; ls /tmp/u.tcbk");
  EXPECT_EQ(outcome.output,
            "code 0 (KERN_SUCCESS)\ncode 5 (KERN_FAILURE)\ncode 0 (KERN_SUCCESS)\n"
            "code 0 (KERN_SUCCESS)\n.:\ntree\n\n./tree:\nfile\n")
      << outcome.errors;
}

/// Stores "old", then sets "new", which cannot be written: it is pending in the helper alone. That
/// is another helper, because one that confines itself has looked at the mounts before.
const std::string kPendingValue =
    "folder=/root/Library/Preferences; set='halvecctl preference set com.example.domain key'\n"
    "$set old; handset kill KILL; handset wait-exit >/dev/null\n"
    "mount --bind $folder $folder; mount -o remount,bind,ro $folder; $set new\n"
    "halvecctl preference get com.example.domain key\n";

TEST_F(Links, WithADomainMakeTheHelperForgetWhatItHadInMemory) {
  const Outcome outcome =
      run(kInLibrary + kPendingValue +
          "halvecctl bundle link t \"$link\"; halvecctl preference get com.example.domain key\n"
          "halvecctl bundle link t \"$link\" --domain com.example.other\n"
          "halvecctl preference get com.example.domain key\n"
          "halvecctl bundle link t \"$link\" --domain com.example.domain\n"
          "halvecctl preference get com.example.domain key");
  EXPECT_EQ(outcome.output, "new\nnew\nnew\nold\n") << outcome.errors;
}

TEST_F(Links, RemovalWithADomainMakesTheHelperForgetAlsoWhenItIsRefused) {
  const Outcome outcome =
      run(kPendingValue +
          "halvecctl bundle unlink /etc/passwd --domain com.example.domain 2>/dev/null; echo $?\n"
          "halvecctl preference get com.example.domain key");
  EXPECT_EQ(outcome.output, "new\n1\nold\n") << outcome.errors;
}

TEST_F(Loading, OfAFileThatOnlyRootMayReadAnswersItsContent) {
  const Outcome outcome =
      run("umask 077; printf '<plist><dict><key>k</key><integer>7</integer></dict></plist>' "
          ">/tmp/p.plist\n"
          "halvecctl plist show /tmp/p.plist --json\n"
          "handset log --json | grep -o '\"priority\":6.*\"pid\"'");
  EXPECT_EQ(outcome.output,
            "{\"k\":7}\n\"priority\":6,\"identifier\":\"HalvecMobileHelper\",\"text\":\"Loading "
            "/tmp/p.plist as plist\",\"pid\"\n")
      << outcome.errors;
}

TEST_F(Loading, OfAFifoAnswers9AndTheHelperServesOn) {
  const Outcome outcome =
      run("mkfifo /tmp/fifo; halvecctl call CopyPropertyListFile /tmp/fifo\n"
          "client connect; handset status --json | grep -o '\"starts\":[0-9]*,\"exits\":[0-9]*'");
  EXPECT_EQ(outcome.output, "code 9 (KERN_MEMORY_FAILURE)\n0\n\"starts\":1,\"exits\":0\n")
      << outcome.errors;
}

TEST(Symbols, OfTheProgramIncludeTheThirteenThatItPromisesAndNoRoutine) {
  const Outcome outcome =
      handset_tests::RunProgram({"/bin/sh", "-c", "nm --dynamic --defined-only \"$0\"", HELPER});
  ASSERT_EQ(outcome.status, 0) << outcome.errors;
  std::vector<std::string> names;
  std::istringstream lines(outcome.output);
  for (std::string address, type, name; lines >> address >> type >> name;) names.push_back(name);
  for (const char* name :
       {"CFStringGetOrCreateCString", "GetMobileUserDirectory", "GetMobileUserGID",
        "GetMobileUserUID", "kBootstrapBundleId", "kCarrierBundleId", "kDefaultBundleId",
        "kOperatorBundleId", "kPlistExtension", "kUserCBDir", "kVLPostponementInfoCarrierID",
        "kVLPostponementInfoICCID", "kVLPostponementInfoIMSI"}) {
    EXPECT_NE(std::find(names.begin(), names.end(), name), names.end()) << name;
  }
  for (const std::string& name : names) {
    EXPECT_EQ(name.find("server_HvMobileHelper"), std::string::npos) << name;
  }
}

}  // namespace
}  // namespace process_tests
