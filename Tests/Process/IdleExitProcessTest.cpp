// SPDX-License-Identifier: Apache-2.0
//
// The life of the real helper, from the first message to the idle exit.
#include "Tests/Process/ProcessSuite.h"

namespace process_tests {
namespace {

using Life = ProcessSuite;

/// Seconds in "exited 0 after 10.0 s ..." as the handset says it.
double Lifetime(const std::string& text) {
  const std::size_t at = text.find("exited 0 after ");
  return at == std::string::npos ? -1 : std::strtod(text.c_str() + at + 15, nullptr);
}

TEST_F(Life, BeginsWithTheFirstConnectAndEndsTenSecondsAfterTheLastClient) {
  const Outcome outcome = run("client connect && handset wait-exit --timeout 60");
  EXPECT_TRUE(outcome.output.starts_with("0\n")) << outcome.output << outcome.errors;
  EXPECT_GE(Lifetime(outcome.output), 9.9) << outcome.output;
  EXPECT_EQ(outcome.status, 0);
}

TEST_F(Life, DoesNotEndByItselfBeforeAnyClientHasCome) {
  const Outcome outcome = run("handset start-helper && handset wait-exit --timeout 15");
  EXPECT_EQ(outcome.status, 124) << outcome.output << outcome.errors;
}

TEST_F(Life, DoesNotEndWhileAClientIsConnected) {
  const Outcome outcome = run(
      "mkfifo /tmp/in; client hold </tmp/in & exec 3>/tmp/in\n"
      "handset wait-start >/dev/null; handset wait-exit --timeout 15; echo $?; exec 3>&-; wait");
  EXPECT_NE(outcome.output.find("connected\n"), std::string::npos) << outcome.errors;
  EXPECT_NE(outcome.output.find("124\n"), std::string::npos) << outcome.output;
}

TEST_F(Life, GoesOnWhenAClientComesWithinTheTenSeconds) {
  const Outcome outcome =
      run("client connect; handset wait-exit --timeout 7; client connect\n"
          "handset wait-exit --timeout 60; handset status --json");
  EXPECT_NE(outcome.output.find("\"starts\":1,\"exits\":1"), std::string::npos) << outcome.output;
  EXPECT_GE(Lifetime(outcome.output), 16.9) << outcome.output;
}

TEST_F(Life, EndsTenSecondsAfterAClientWasKilled) {
  const Outcome outcome =
      run("mkfifo /tmp/in; client hold </tmp/in & exec 3>/tmp/in\n"
          "handset wait-start >/dev/null; handset wait-exit --timeout 3; kill -9 $!\n"
          "handset wait-exit --timeout 60");
  EXPECT_GE(Lifetime(outcome.output), 12.9) << outcome.output << outcome.errors;
}

TEST_F(Life, BeginsAnewWithTheNextConnect) {
  const Outcome outcome =
      run("client connect; handset wait-exit --timeout 60; client connect; handset status --json");
  EXPECT_NE(outcome.output.find("\"starts\":2,\"exits\":1"), std::string::npos) << outcome.output;
}

TEST_F(Life, EndsWithStatus1AndTwoLinesWhenThePortCannotBeCheckedIn) {
  // What the launcher's variables announce is no service port.
  const Outcome outcome =
      run("cat >/tmp/start <<'END'\n"
          "export LISTEN_PID=$$ LISTEN_FDS=1 LISTEN_FDNAMES=com.zarvo.halvec.mobile-helper\n"
          "exec 3</dev/null\n"
          "exec /usr/libexec/halvec/helper\n"
          "END\n"
          "sh /tmp/start; echo $?; handset log --json");
  EXPECT_TRUE(outcome.output.starts_with("1\n")) << outcome.output << outcome.errors;
  const std::size_t first =
      outcome.output.find("\"unable to create server objects - out of resources\"");
  const std::size_t second =
      outcome.output.find("\"unable to startup HalvecMobileHelper server\\n\"");
  EXPECT_NE(first, std::string::npos) << outcome.output;
  EXPECT_NE(second, std::string::npos) << outcome.output;
  EXPECT_LT(first, second);
}

TEST_F(Life, WithoutALauncherServesUnderItsOwnNameAndLeavesThatToNobody) {
  const Outcome outcome =
      run("rm /run/halvec/ports/*; /usr/libexec/halvec/helper &\n"
          "until [ -S /run/halvec/ports/com.zarvo.halvec.mobile-helper ]; do :; done\n"
          "stat -c %a /run/halvec/ports/*; client connect; wait $!; echo $?; ls /run/halvec/ports");
  EXPECT_EQ(outcome.output, "660\n0\n0\ncom.zarvo.halvec.mobile-helper\n") << outcome.errors;
}

}  // namespace
}  // namespace process_tests
