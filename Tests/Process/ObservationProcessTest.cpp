// SPDX-License-Identifier: Apache-2.0
//
// halvecctl status and monitor against the real helper in the simulated handset.
#include "Tests/Process/ProcessSuite.h"

namespace process_tests {
namespace {

using Observer = ProcessSuite;

constexpr const char* kHalvecctl = "halvecctl=/usr/libexec/halvec/halvecctl\n";

TEST_F(Observer, LearnsThatNothingRunsAndStartsNothing) {
  const Outcome outcome = run(std::string(kHalvecctl) +
                              "$halvecctl status; echo $?; handset status | tail -n +2 | head -1");
  EXPECT_EQ(outcome.output, "3\nstarts: 0\n") << outcome.errors;
  EXPECT_NE(outcome.errors.find("halvecctl: the helper is not running"), std::string::npos);
}

TEST_F(Observer, SeesTheIdleExitApproach) {
  const Outcome outcome =
      run(std::string(kHalvecctl) + "client connect; $halvecctl status | sed 's/[0-9.]* s$/N s/'");
  EXPECT_NE(outcome.output.find("clients: 0\nwork tokens: 0\nidle exit in N s\n"),
            std::string::npos)
      << outcome.output << outcome.errors;
}

TEST_F(Observer, SeesEachMessageWithCallerAndCode) {
  const Outcome outcome =
      run(std::string(kHalvecctl) +
          "client connect >/dev/null\n"
          "$halvecctl --json monitor --count 4 >/tmp/events 2>/tmp/watching & watcher=$!\n"
          "tail -f /tmp/watching --pid=$watcher | grep -q watching\n"
          "client connect >/dev/null; $halvecctl preference get d k 2>/dev/null\n"
          "handset as mobile -- $halvecctl preference get d k 2>/dev/null\n"
          "wait $watcher; sed 's/.*\"Request\":\\(\"[A-Za-z]*\"\\).*\"User\":\\([0-9]*\\)"
          ",\"Code\":\\([0-9]*\\).*/\\1 \\2 \\3/' /tmp/events");
  EXPECT_EQ(outcome.output,
            "\"connect\" 0 0\n\"connect\" 0 0\n\"CopyPreferenceValue\" 0 0\n\"connect\" 501 35\n")
      << outcome.errors;
}

TEST_F(Observer, MustBeRoot) {
  const Outcome outcome = run(std::string(kHalvecctl) +
                              "client connect >/dev/null\n"
                              "handset as halvec -- $halvecctl status; echo $?");
  EXPECT_EQ(outcome.output, "3\n") << outcome.errors;
  EXPECT_NE(outcome.errors.find("Permission denied"), std::string::npos) << outcome.errors;
}

}  // namespace
}  // namespace process_tests
