// SPDX-License-Identifier: Apache-2.0
//
// The real helper, killed at every step of an install.
#include <sys/stat.h>

#include <fstream>
#include <string>

#include "Tests/LASD/WebSuite.h"

namespace {

using process_tests::Outcome;

/// The parameter tells which half of the calls is tried: 0 the even ones, 1 the odd ones.
class KilledInstall : public process_tests::ProcessSuite, public testing::WithParamInterface<int> {
 protected:
  /// Runs install_kills.py with `scenario`; what it printed.
  static Outcome tryEveryCall(const std::string& scenario) {
    const handset_tests::TemporaryFolder folder;
    const std::string starter = folder.path() + "/helper-with-kill-point";
    // A sanitizer's runtime wants to be first; here it comes second.
    std::ofstream(starter) << "#!/bin/sh\n"
                              "export LD_PRELOAD=/usr/libexec/halvec/kill-point.so\n"
                              "export ASAN_OPTIONS=$ASAN_OPTIONS:verify_asan_link_order=0\n"
                              "exec /usr/libexec/halvec/helper\n";
    ::chmod(starter.c_str(), 0755);
    return run(lasd_test::kServe + "python3 /mnt/install_kills.py /tmp/web " MANIFEST_HOST " " +
                   scenario + " " + std::to_string(GetParam()),
               {"--helper", starter, "--install", KILL_POINT ":kill-point.so", "--bind",
                LASD_TESTS ":/mnt"});
  }
};

TEST_P(KilledInstall, LeavesTheOldFileOrTheNewOneOrNoneAndNeverARecordWithoutItsFile) {
  const Outcome outcome = tryEveryCall("renewal");
  EXPECT_EQ(outcome.status, 0) << outcome.errors;
  EXPECT_TRUE(outcome.output.ends_with(" calls\n")) << outcome.output << outcome.errors;
}

TEST_P(KilledInstall, LeavesTheNewFileOrNoneWhereThereWasNone) {
  const Outcome outcome = tryEveryCall("first");
  EXPECT_EQ(outcome.status, 0) << outcome.errors;
  EXPECT_TRUE(outcome.output.ends_with(" calls\n")) << outcome.output << outcome.errors;
}

INSTANTIATE_TEST_SUITE_P(Calls, KilledInstall, testing::Values(0, 1),
                         [](const auto& half) { return half.param == 0 ? "Even" : "Odd"; });

}  // namespace
