// SPDX-License-Identifier: Apache-2.0
//
// What the real helper answers and what it leaves on disk and in the log.
#include "Tests/Process/ProcessSuite.h"

namespace process_tests {
namespace {

using Service = ProcessSuite;

constexpr char kValue[] = "'<plist version=\"1.0\"><string>value</string></plist>'";

TEST_F(Service, RefusesACallerWithoutTheEntitlement) {
  const Outcome outcome =
      run("cp /usr/libexec/halvec/client /usr/libexec/halvec/stranger\n"
          "stranger=/usr/libexec/halvec/stranger; $stranger connect\n"
          "handset as halvec -- /usr/libexec/halvec/client connect; client connect");
  EXPECT_EQ(outcome.output, "35\n35\n0\n")
      << "another program, another user, the entitled one: " << outcome.errors;
}

TEST_F(Service, RefusesACallerWhoseEntitlementIsNotTheBooleanTrue) {
  for (const char* value : {"<string>true</string>", "<integer>1</integer>", "<false/>"}) {
    const Outcome outcome = run("handset entitle /usr/libexec/halvec/client root --value '" +
                                std::string(value) + "' >/dev/null; client connect");
    EXPECT_EQ(outcome.output, "35\n") << value << outcome.errors;
  }
}

TEST_F(Service, StoresAPreferenceWhereTheUsersPreferencesAre) {
  const Outcome outcome = run(std::string("client set com.zarvo.carrier key ") + kValue +
                              "; stat -c '%a %U' /root/Library/Preferences/com.zarvo.carrier.plist;"
                              " client get com.zarvo.carrier key");
  EXPECT_EQ(outcome.output,
            "0\n600 root\n<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n"
            "<string>value</string>\n</plist>\n")
      << outcome.errors;
}

TEST_F(Service, RemovesAPreferenceWithASingleByte) {
  const Outcome outcome =
      run(std::string("client set d k ") + kValue + "; client set d k x; client get d k; echo end");
  EXPECT_EQ(outcome.output, "0\n0\nend\n") << outcome.errors;
}

TEST_F(Service, ServesTheCommandLineFromSetToRemoval) {
  const Outcome outcome =
      run("halvecctl=/usr/libexec/halvec/halvecctl\n"
          "$halvecctl preference set com.zarvo.carrier Mtu 1430 --integer\n"
          "$halvecctl preference get com.zarvo.carrier Mtu\n"
          "$halvecctl preference get com.zarvo.carrier Mtu --app --xml\n"
          "$halvecctl preference remove com.zarvo.carrier Mtu\n"
          "$halvecctl preference get com.zarvo.carrier Mtu; echo $?\n"
          "handset as mobile -- $halvecctl preference get com.zarvo.carrier Mtu; echo $?");
  EXPECT_EQ(outcome.output,
            "1430\n<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n"
            "<integer>1430</integer>\n</plist>\n6\n4\n")
      << outcome.errors;
}

TEST_F(Service, CarriesALargeValueBothWaysThroughSealedMemory) {
  const Outcome outcome =
      run("halvecctl=/usr/libexec/halvec/halvecctl\n"
          "{ echo '<plist version=\"1.0\"><string>'; head -c 400000 /dev/zero | tr '\\0' x;\n"
          "  echo '</string></plist>'; } >/tmp/large.plist\n"
          "$halvecctl preference set d large --plist /tmp/large.plist\n"
          "$halvecctl preference get d large | tr -d '\\n' | wc -c");
  EXPECT_EQ(outcome.output, "400000\n") << outcome.errors;
}

TEST_F(Service, LogsTheAllocationOfACopyByteForByte) {
  const Outcome outcome = run(std::string("client set d k ") + kValue +
                              "; client get d k >/dev/null; handset log --json");
  EXPECT_NE(outcome.output.find("\"VM_ALLOCATE 93l (mhs1)\\n\""), std::string::npos)
      << outcome.output << outcome.errors;
}

TEST_F(Service, LosesNothingThatItAcknowledgedWhenItIsKilled) {
  const Outcome outcome =
      run("for i in $(seq 50); do\n"
          "  client set d k \"<plist version='1.0'><integer>$i</integer></plist>\" >/dev/null\n"
          "  handset kill KILL >/dev/null; handset wait-exit --exits $i --timeout 20 >/dev/null\n"
          "  client get d k | grep -q \"<integer>$i</integer>\" || echo lost $i\n"
          "done; client get d k | grep integer; ls -A /root/Library/Preferences | grep -v lock");
  EXPECT_EQ(outcome.output, "<integer>50</integer>\nd.plist\n") << outcome.errors;
}

TEST_F(Service, ReportsACorruptPreferenceFileKeepsItAsideAndGoesOn) {
  const Outcome outcome =
      run(std::string("mkdir -p /root/Library/Preferences; cd /root/Library/Preferences\n"
                      "echo rubbish >d.plist; client set d k ") +
          kValue + "; client get d k | grep string; grep -l rubbish *; handset log");
  EXPECT_TRUE(outcome.output.starts_with("0\n<string>value</string>\nd.plist"))
      << outcome.output << outcome.errors;
  EXPECT_NE(outcome.output.find("d.plist", outcome.output.find("rubbish") + 1), std::string::npos);
}

TEST_F(Service, LetsAThousandClientsInOneAfterTheOther) {
  const Outcome outcome = run("client rounds 1000; handset status --json");
  EXPECT_TRUE(outcome.output.starts_with("1000\n")) << outcome.output << outcome.errors;
  EXPECT_NE(outcome.output.find("\"starts\":1,\"exits\":0"), std::string::npos) << outcome.output;
}

TEST_F(Service, IsFollowedByTheNextInstanceWhenItIsKilledUnderAClient) {
  const Outcome outcome =
      run("mkfifo /tmp/in /tmp/out; client hold </tmp/in >/tmp/out & exec 3>/tmp/in 4</tmp/out\n"
          "read line <&4; handset kill KILL; read line <&4; echo \"$line\"; client connect");
  EXPECT_EQ(outcome.output, "the helper is gone\n0\n") << outcome.errors;
}

}  // namespace
}  // namespace process_tests
