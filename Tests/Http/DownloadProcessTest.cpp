// SPDX-License-Identifier: Apache-2.0
//
// Downloads by the real helper from the handset's web: over Wi-Fi, never over cellular.
#include <stdlib.h>

#include <filesystem>
#include <string>

#include "Tests/Process/ProcessSuite.h"

namespace {

using process_tests::Outcome;

const std::string kHost = MANIFEST_HOST;

/// A manifest with one database; `lines` prints what the downloader logged about failures, and
/// `cellular` how many packets went over cellular. The kernel's own resets are left out: it answers
/// what comes after a connection has been closed, and asks its routes alone which way.
const std::string kOffer =
    "handset capture start pdp_ip0; cd /run/handset/web; mkdir -p 1/v3 /var/mobile/Library\n"
    "echo the database | gzip >gsm.db.gz\n"
    "cat >1/v3/lasd.plist <<'END'\n"
    "<plist version=\"1.0\"><dict><key>gsm</key><dict>\n"
    "<key>Version</key><string>1</string>\n"
    "<key>ContentURL</key><string>https://" MANIFEST_HOST
    "/gsm.db.gz</string></dict></dict></plist>\n"
    "END\n"
    "check() { halvecctl lasd update --types gsm\n"
    "  handset telephony log --count 1 --timeout 60 | sed 's/.*lasd  //'; }\n"
    "lines() { handset log | sed -n 's/.*HTTP request failed for URL //p'; }\n"
    "cellular() { handset capture show --count 99 --timeout 0 pdp_ip0 2>/dev/null | awk '\n"
    "  !($3 == \"tcp\" && substr($7, 67, 2) ~ /^[01]4$/) { n++ }\n"
    "  END { print \"cellular \" n + 0 }'; }\n";

class Downloads : public process_tests::ProcessSuite {
 protected:
  Downloads() { EXPECT_NE(::mkdtemp(web.data()), nullptr); }
  ~Downloads() override { std::filesystem::remove_all(web); }

  Outcome download(const std::string& script) {
    return run(kOffer + script, {"--web", web, "--verbose"});
  }
  static std::string failed(const std::string& error) {
    return "UpdateFailed\nhttps://" + kHost + "/1/v3/lasd.plist with error " + error +
           " errorcode 0 (no status)\n";
  }

  std::string web = "/tmp/downloads-XXXXXX";
};

TEST_F(Downloads, GoOverWifiWithNamesAndAll) {
  const Outcome outcome = download(
      "check; cat /var/mobile/Library/LASD/gsm.db; cellular\n"
      "handset web log --count 2 --timeout 60 | cut -d' ' -f1 | sort -u\n"
      "handset web log --count 2 | grep -c gzip");
  EXPECT_EQ(outcome.output, "UpdateAvailable gsm\nthe database\ncellular 0\n192.168.64.2\n2\n")
      << outcome.errors;
}

TEST_F(Downloads, FailWhereOnlyCellularIsLeft) {
  const Outcome outcome = download("handset network down wlan0; check; lines; cellular");
  EXPECT_EQ(outcome.output, failed("no network that may be used") + "cellular 0\n")
      << outcome.errors;
}

TEST_F(Downloads, AskNoNameOverCellularWhenWifiTellsNone) {
  const Outcome outcome = download("handset web dns off; check; lines; cellular");
  EXPECT_EQ(outcome.output, failed("host not found") + "cellular 0\n") << outcome.errors;
}

TEST_F(Downloads, TrustOnlyTheAuthoritiesOfTheSystem) {
  const Outcome outcome = download(
      "openssl req -x509 -newkey ec -pkeyopt ec_paramgen_curve:prime256v1 -nodes -days 2 "
      "-keyout /dev/null -out /etc/ssl/certs/ca-certificates.crt -subj /CN=stranger 2>/dev/null\n"
      "check; lines; cellular");
  EXPECT_EQ(outcome.output, failed("not trusted") + "cellular 0\n") << outcome.errors;
}

TEST_F(Downloads, LeaveNothingOfADatabaseForWhichThereIsNoRoom) {
  const Outcome outcome = download(
      "mkdir -p /var/mobile/Library/LASD\n"
      "mount -t tmpfs -o size=64k none /var/mobile/Library/LASD\n"
      "head -c 1000000 /dev/zero | gzip >gsm.db.gz\n"
      "check; handset log | grep -c 'Could not uncompress'; ls -A /var/mobile/Library/LASD");
  EXPECT_EQ(outcome.output, "UpdateFailed\n1\n") << outcome.errors;
}

}  // namespace
