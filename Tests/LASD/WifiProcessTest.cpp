// SPDX-License-Identifier: Apache-2.0
//
// Checks by the real helper where Wi-Fi and cellular both lead to the server, and cellular is the
// default route: nothing goes over it, come what may.
#include <string>
#include <vector>

#include "Tests/Process/ProcessSuite.h"

namespace {

using handset_tests::TemporaryFolder;
using process_tests::Outcome;

class WifiChecks : public process_tests::ProcessSuite {
 protected:
  static Outcome check(const std::string& script) {
    const TemporaryFolder web;
    // `counted` tells whether the cellular link still has the counters that it had at first.
    return run(
        "mkdir -p /var/mobile/Library /run/handset/web/1/v3\n"
        "echo content | gzip >/run/handset/web/gsm.db.gz\n"
        "cat >/run/handset/web/1/v3/lasd.plist <<'END'\n"
        "<plist version=\"1.0\"><dict><key>gsm</key><dict>\n"
        "<key>Version</key><string>1</string>\n"
        "<key>ContentURL</key><string>https://" MANIFEST_HOST
        "/gsm.db.gz</string></dict></dict></plist>\n"
        "END\n"
        "told() { handset telephony log --count $1 --timeout 100 | sed 's/.*lasd  //'; }\n"
        "counters() { handset network counters --json pdp_ip0; }\n"
        "counted() { [ \"$(counters)\" = \"$before\" ] && echo nothing over cellular; }\n"
        "before=$(counters)\n" +
            script,
        {"--web", web.path(), "--bind", LASD_TESTS ":/mnt"});
  }
};

TEST_F(WifiChecks, SendNothingOverCellularNameResolutionIncluded) {
  const Outcome outcome = check(
      "halvecctl lasd update; told 1; counted\n"
      "handset web log --count 2 --timeout 20 | cut -d' ' -f1");
  EXPECT_EQ(outcome.output,
            "UpdateAvailable gsm\nnothing over cellular\n192.168.64.2\n192.168.64.2\n")
      << outcome.errors;
}

TEST_F(WifiChecks, FailWhereThereIsCellularAlone) {
  const Outcome outcome = check(
      "handset network down wlan0; halvecctl lasd update; told 1; counted\n"
      "handset log | grep -o 'Could not fetch data from source.*'; ls /var/mobile/Library");
  EXPECT_EQ(outcome.output,
            "UpdateFailed\nnothing over cellular\n"
            "Could not fetch data from source https://" MANIFEST_HOST "/1/v3/lasd.plist\n")
      << outcome.errors;
}

TEST_F(WifiChecks, FailWhereWifiGoesInMidTransferAndLeaveTheOldDatabase) {
  // Takes the minute after which a transfer without a byte is given up.
  const Outcome outcome = check(
      "halvecctl lasd update; told 1; sed -i 's/>1</>2</' /run/handset/web/1/v3/lasd.plist\n"
      "handset web stop\n"
      "handset world -- python3 /mnt/stalling_server.py /run/handset/web/1/v3/lasd.plist "
      "/tmp/ready /tmp/half &\n"
      "until [ -e /tmp/ready ]; do :; done\n"
      "halvecctl lasd update; until [ -e /tmp/half ]; do :; done\n"
      "handset network remove wlan0; told 2 | tail -n 1; kill $!; counted\n"
      "cat /var/mobile/Library/LASD/*; handset log | grep -o 'cannot download file.*'");
  EXPECT_EQ(outcome.output,
            "UpdateAvailable gsm\nUpdateFailed\nnothing over cellular\ncontent\n"
            "cannot download file https://" MANIFEST_HOST
            "/gsm.db.gz. Either Wifi is turned OFF or not Wifi attached\n")
      << outcome.errors;
}

}  // namespace
