// SPDX-License-Identifier: Apache-2.0
//
// The stand-in telephony daemon, spoken to by a sender that shares no code with it. One thread.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "Tests/Handset/HandsetRun.h"

namespace handset_tests {
namespace {

class HandsetTelephony : public HandsetSuite {
 protected:
  static Outcome run(const std::string& script, std::vector<std::string> options = {}) {
    options.insert(options.end(), {"--install", std::string(TELEPHONY_CALLER) + ":tell"});
    return RunHandset(script, options);
  }
};

TEST_F(HandsetTelephony, ShowsWhatItWasToldInOneLinePerMessage) {
  const Outcome outcome = run(
      "tell update com.zarvo.lasd.UpdateAvailable gsm; tell update com.zarvo.lasd.UpdateFailed\n"
      "tell radio 1; tell connect HalvecMobileHelper -- US,California,-,95014\n"
      "handset telephony log");
  EXPECT_EQ(outcome.output,
            "5501101 0 0\n"
            "com.zarvo.Halvec.lasd  UpdateAvailable gsm\n"
            "com.zarvo.Halvec.lasd  UpdateFailed\n"
            "com.zarvo.radio-manager  log to file 1\n"
            "com.zarvo.Halvec.connection  connect [\"HalvecMobileHelper\"]\n"
            "com.zarvo.Halvec.connection  civic country=\"US\" state=\"California\" city=null "
            "postalCode=\"95014\"\n")
      << outcome.errors;
}

TEST_F(HandsetTelephony, KeepsEveryMessageAsJsonWithItsBytes) {
  const Outcome outcome =
      run("tell radio 0; tell connect A B -- FR,,,\n"
          "handset telephony log --json | head -n 1 | cut -d, -f 2-\n"
          "handset telephony log --json | python3 -c 'import json, sys\n"
          "entries = [json.loads(line) for line in sys.stdin]\n"
          "times = [entry[\"monotonic_ns\"] for entry in entries]\n"
          "print(len(times), times == sorted(times))\n"
          "for entry in entries[1:]:\n"
          "  print(entry[\"connection\"], entry[\"id\"], json.dumps(entry[\"payload\"]),"
          " bytes.fromhex(entry[\"hex\"]).count(b\"bplist00\"))'");
  EXPECT_EQ(outcome.output,
            "5501101 0 0\n"
            "\"port\":\"com.zarvo.radio-manager\",\"id\":1,\"payload\":0,\"hex\":"
            "\"0000000020000000000000000000000000000000010000000400000000000000\"}\n"
            "3 True\n"
            "1 5501000 [\"A\", \"B\"] 1\n"
            "1 5501001 {\"city\": \"\", \"country\": \"FR\", \"postalCode\": \"\", "
            "\"state\": \"\"} 1\n");
}

TEST_F(HandsetTelephony, WaitsForMessagesThatAreToCome) {
  const Outcome outcome =
      run("handset telephony log --skip 1 --count 2 --timeout 60 & wait=$!\n"
          "tell radio 0; tell radio 1; tell radio 0; tell radio 0; wait $wait; echo $?\n"
          "handset telephony log --count 5 --timeout 0; echo $?");
  const std::string zero = "com.zarvo.radio-manager  log to file 0\n";
  const std::string one = "com.zarvo.radio-manager  log to file 1\n";
  EXPECT_EQ(outcome.output, one + zero + "0\n" + zero + one + zero + zero + "124\n");
  EXPECT_EQ(outcome.errors, "handset: timed out\n");
}

TEST_F(HandsetTelephony, AnswersCivicCallsWithWhatItIsTold) {
  const Outcome outcome =
      run("handset telephony answer 1 22; tell connect A -- US,,, FR,,,\n"
          "handset telephony answer -1 0; tell connect A -- US,,,");
  EXPECT_EQ(outcome.output, "5501101 1 22\n5501101 1 22\n5501101 -1 0\n");
}

TEST_F(HandsetTelephony, NotifiesOpenConnectionsAndOnceMoreBeforeTheNextAnswer) {
  RunningHandset handset(
      "exec 3<&0; tell connect A -- hold US,,, FR,,, <&3 >/tmp/answers &\n"
      "handset telephony log --count 1 >/dev/null; handset telephony notify; echo notified\n"
      "wait $!; cat /tmp/answers",
      {"--install", std::string(TELEPHONY_CALLER) + ":tell"});
  EXPECT_EQ(handset.nextLine(), "notified");
  handset.say("go");
  EXPECT_EQ(handset.finish().output, "held\n5501002\n5501002\n5501101 0 0\n5501101 0 0\n");
}

TEST_F(HandsetTelephony, ReadsNothingWhilePaused) {
  const Outcome outcome =
      run("handset telephony pause; tell radio 1; handset telephony log --count 1 --timeout 0; "
          "echo $?\n"
          "handset telephony resume; handset telephony log");
  EXPECT_EQ(outcome.output, "124\ncom.zarvo.radio-manager  log to file 1\n");
}

TEST_F(HandsetTelephony, PublishesItsPortsOnlyWhileItRuns) {
  const Outcome outcome = run(
      "cd /run/halvec/ports; stat -c '%n %U %G %a' com.zarvo.[Hr]*\n"
      "handset telephony stop; ls com.zarvo.[Hr]*; tell radio 1; handset telephony stop; echo $?\n"
      "handset telephony start; tell radio 0; handset telephony start; handset telephony log");
  EXPECT_EQ(outcome.output,
            "com.zarvo.Halvec.connection halvec halvec 660\n"
            "com.zarvo.Halvec.lasd halvec halvec 660\n"
            "com.zarvo.radio-manager halvec halvec 660\n"
            "1\n"
            "com.zarvo.radio-manager  log to file 0\n");
  EXPECT_NE(outcome.errors.find("No such file or directory\nhandset: the telephony daemon does not "
                                "run\nhandset: the telephony daemon runs already\n"),
            std::string::npos)
      << outcome.errors;
}

TEST_F(HandsetTelephony, IsLeftOutOnRequest) {
  const Outcome outcome = run("ls /run/halvec/ports; handset telephony log", {"--no-telephony"});
  EXPECT_EQ(outcome.output, "com.zarvo.halvec.mobile-helper\n");
}

TEST_F(HandsetTelephony, DoesNotTakeTheNameOfADaemonThatRuns) {
  const Outcome outcome =
      run("touch /run/halvec/ports/com.zarvo.radio-manager\n"
          "handset telephony start; echo $?; ls /run/halvec/ports; handset telephony log",
          {"--no-telephony"});
  EXPECT_EQ(outcome.output, "125\ncom.zarvo.halvec.mobile-helper\ncom.zarvo.radio-manager\n");
}

TEST_F(HandsetTelephony, ClosesItsConnectionsWhenItStops) {
  RunningHandset handset(
      "exec 3<&0; tell connect A -- hold US,,, <&3 & handset telephony log --count 1\n"
      "handset telephony stop; echo stopped; wait $!; echo $?",
      {"--install", std::string(TELEPHONY_CALLER) + ":tell"});
  for (std::string line; line != "stopped"; line = handset.nextLine()) ASSERT_NE(line, "0");
  handset.say("go");
  EXPECT_EQ(handset.nextLine(), "1");
  EXPECT_EQ(handset.finish().errors, "Broken pipe\n");
}

TEST_F(HandsetTelephony, SaysWhatIsWrongWithAMessage) {
  const Outcome outcome =
      run("tell raw com.zarvo.radio-manager 00; tell radio 7; tell raw com.zarvo.Halvec.lasd "
          "000000001c00000000000000000000000000000000000000"
          "00000000\n"
          "handset telephony log; handset telephony log --json | head -n 1 | cut -d, -f 2-");
  EXPECT_EQ(outcome.output,
            "com.zarvo.radio-manager  1 bytes (shorter than a header)\n"
            "com.zarvo.radio-manager  log to file 7 (neither 0 nor 1)\n"
            "com.zarvo.Halvec.lasd  message 0, 28 bytes (no property list: not in the binary "
            "form)\n"
            "\"port\":\"com.zarvo.radio-manager\",\"id\":null,\"payload\":null,"
            "\"error\":\"shorter than a header\",\"hex\":\"00\"}\n");
}

TEST_F(HandsetTelephony, RefusesUsageThatItDoesNotKnow) {
  for (const char* words : {"", "sing", "answer", "answer 1", "answer x 1", "log --what"}) {
    EXPECT_EQ(run(std::string("handset telephony ") + words).status, 2) << words;
  }
}

}  // namespace
}  // namespace handset_tests
