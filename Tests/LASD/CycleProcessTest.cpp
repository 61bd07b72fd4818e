// SPDX-License-Identifier: Apache-2.0
//
// Whole checks by the real helper against a real web server: files, records, notifications, and how
// long the helper stays.
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

#include "Tests/LASD/WebSuite.h"

namespace {

using process_tests::Outcome;

/// Shell functions: `offer VERSION TYPE...` puts a manifest with these types at this version, whose
/// databases say so; `told N M` prints the M notifications behind the first N.
const std::string kFunctions =
    "offer() {\n"
    "  version=$1; shift\n"
    "  { echo '<plist version=\"1.0\"><dict>'\n"
    "    for type; do\n"
    "      echo \"<key>$type</key><dict><key>Version</key><string>$version</string>\"\n"
    "      echo \"<key>ContentURL</key><string>https://" MANIFEST_HOST
    "/$type.db.gz</string></dict>\"\n"
    "      echo $type $version | gzip >/tmp/web/$type.db.gz\n"
    "    done; echo '</dict></plist>'; } >/tmp/web/1/v3/lasd.plist\n"
    "}\n"
    "told() { handset telephony log --skip $1 --count $2 --timeout 60 | sed 's/.*lasd  //'; }\n";

class Checks : public process_tests::ProcessSuite {
 protected:
  static Outcome check(const std::string& script, const std::vector<std::string>& options = {}) {
    return run(lasd_test::kServe + kFunctions + script, options);
  }
  /// Seconds in "exited 0 after 10.0 s ..." as the handset says it.
  static double lifetime(const std::string& text) {
    const std::size_t at = text.find("exited 0 after ");
    return at == std::string::npos ? -1 : std::strtod(text.c_str() + at + 15, nullptr);
  }
};

TEST_F(Checks, InstallAllFiveThenWhatChangedUpwardsAndDownwards) {
  const Outcome outcome = check(
      "offer 2 gsm umts cdma lte scdma; halvecctl lasd update; told 0 5\n"
      "cd /var/mobile/Library/LASD; stat -c '%A %U' . gsm.db; cat *.db\n"
      "python3 - <<'END'\n"
      "import plistlib\n"
      "path = '/tmp/web/1/v3/lasd.plist'\n"
      "manifest = plistlib.load(open(path, 'rb'))\n"
      "manifest['lte']['Version'] = '3'\n"
      "manifest['umts']['Version'] = '1'\n"
      "manifest['gsm']['Version'] = '02'\n"
      "plistlib.dump(manifest, open(path, 'wb'), fmt=plistlib.FMT_BINARY, sort_keys=False)\n"
      "END\n"
      "echo newer | gzip >/tmp/web/lte.db.gz; echo older | gzip >/tmp/web/umts.db.gz\n"
      "halvecctl lasd update; told 5 2; cat *.db; halvecctl lasd status --json; ls -A");
  const std::string host = MANIFEST_HOST;
  const auto entry = [&](const std::string& type, const std::string& version) {
    return "\"" + type + "\":{\"Version\":\"" + version + "\",\"ContentURL\":\"https://" + host +
           "/" + type + ".db.gz\"}";
  };
  EXPECT_EQ(outcome.output,
            "UpdateAvailable gsm\nUpdateAvailable umts\nUpdateAvailable cdma\n"
            "UpdateAvailable lte\nUpdateAvailable scdma\n"
            "drwxr-xr-x root\n-rw-r--r-- root\n"
            "cdma 2\ngsm 2\nlte 2\nscdma 2\numts 2\n"
            "UpdateAvailable umts\nUpdateAvailable lte\n"
            "cdma 2\ngsm 2\nnewer\nscdma 2\nolder\n"
            "{\"recorded\":{" +
                entry("gsm", "2") + "," + entry("umts", "1") + "," + entry("cdma", "2") + "," +
                entry("lte", "3") + "," + entry("scdma", "2") +
                "},\"files\":{\"cdma.db\":7,\"gsm.db\":6,\"lte.db\":6,\"scdma.db\":8,\"umts.db\":6}"
                "}\ncdma.db\ngsm.db\nlte.db\nscdma.db\numts.db\n")
      << outcome.errors;
}

TEST_F(Checks, WriteTheKeysOfTheirConnectionsNowhereWhateverTheEnvironmentSays) {
  const handset_tests::TemporaryFolder folder;
  const std::string starter = folder.path() + "/helper-with-environment";
  std::ofstream(starter) << "#!/bin/sh\n"
                            "export SSLKEYLOGFILE=/tmp/keys\n"
                            "exec /usr/libexec/halvec/helper\n";
  std::filesystem::permissions(starter, std::filesystem::perms::owner_all |
                                            std::filesystem::perms::group_exec |
                                            std::filesystem::perms::others_exec);
  const Outcome outcome = check("offer 1 gsm; halvecctl lasd update; told 0 1; ls /tmp | grep keys",
                                {"--helper", starter});
  EXPECT_EQ(outcome.output, "UpdateAvailable gsm\n") << outcome.errors;
}

TEST_F(Checks, RunOneAfterTheOther) {
  const Outcome outcome = check(
      "offer 1 gsm; halvecctl lasd update & halvecctl lasd update; wait; told 0 2\n"
      "handset log | grep -c 'Trying to see if update available for mask 1f'");
  EXPECT_EQ(outcome.output, "UpdateAvailable gsm\nNoUpdateRequired\n2\n") << outcome.errors;
}

TEST_F(Checks, TellOfAFailureAndGoOnWithTheNextType) {
  const Outcome outcome = check(
      "offer 1 gsm umts cdma; rm /tmp/web/umts.db.gz; halvecctl lasd update; told 0 3\n"
      "ls /var/mobile/Library/LASD\n"
      "nginx -p /tmp/nginx -c /tmp/nginx/nginx.conf -s stop\n"
      "while [ -e /tmp/nginx/pid ]; do :; done\n"
      "halvecctl lasd update; told 3 1");
  EXPECT_EQ(outcome.output,
            "UpdateAvailable gsm\nUpdateFailed\nUpdateAvailable cdma\ncdma.db\ngsm.db\n"
            "UpdateFailed\n")
      << outcome.errors;
}

TEST_F(Checks, OnAFullDiskLeaveTheOldDatabaseAndTheHelperServing) {
  const Outcome outcome = check(
      "mount -t tmpfs -o size=64k none /var/mobile/Library\n"
      "offer 1 gsm; halvecctl lasd update; told 0 1\n"
      "offer 2 gsm; head -c 200000 /dev/urandom | gzip >/tmp/web/gsm.db.gz\n"
      "halvecctl lasd update; told 1 1; ls -A /var/mobile/Library/LASD\n"
      "cat /var/mobile/Library/LASD/gsm.db\n"
      "handset log | grep Failed; handset status --json | grep -o '\"starts\":[0-9]*'");
  EXPECT_EQ(outcome.output,
            "UpdateAvailable gsm\nUpdateFailed\ngsm.db\ngsm 1\n"
            "<5>Failed to commit the data to file for /var/mobile/Library/LASD/gsm.db.tmp\n"
            "\"starts\":1\n")
      << outcome.errors;
}

TEST_F(Checks, DoNotLetTheHelperLeaveUntilTenSecondsAfterTheirEnd) {
  // The transfer alone takes longer than an idle helper stays.
  const Outcome outcome = check(
      "offer 1 gsm; sed -i s,/gsm.db,/slow/gsm.db, /tmp/web/1/v3/lasd.plist\n"
      "head -c 130000 /dev/urandom | gzip >/tmp/web/slow/gsm.db.gz\n"
      "halvecctl lasd update; told 0 1; handset wait-exit --timeout 60");
  EXPECT_TRUE(outcome.output.starts_with("UpdateAvailable gsm\n")) << outcome.output;
  EXPECT_GE(lifetime(outcome.output), 20.0) << outcome.output << outcome.errors;
}

TEST_F(Checks, AreWatchedByHalvecctlWhereNobodyElseIsTold) {
  const Outcome outcome = check(
      "offer 1 gsm lte scdma; rm /tmp/web/scdma.db.gz\n"
      "halvecctl lasd update --wait --types gsm,umts,lte,scdma; echo $?\n"
      "halvecctl lasd update --wait --types gsm,lte --json; echo $?; ls /run/halvec/ports",
      {"--no-telephony"});
  EXPECT_EQ(outcome.output,
            "gsm    installed\numts   up to date\nlte    installed\nscdma  failed\n1\n"
            "{\"gsm\":\"up to date\",\"lte\":\"up to date\"}\n0\n"
            "com.zarvo.halvec.mobile-helper\n")
      << outcome.errors;
}

TEST_F(Checks, AreNotWatchedWhereTheTelephonyDaemonIsTold) {
  const Outcome outcome = check("halvecctl lasd update --wait; echo $?");
  EXPECT_EQ(outcome.output, "7\n");
  EXPECT_NE(outcome.errors.find("another program holds"), std::string::npos) << outcome.errors;
}

TEST_F(Checks, LogTheirLinesAsNotices) {
  const Outcome outcome = check(
      "offer 1 gsm; halvecctl lasd update --types gsm; told 0 1; handset log --json |\n"
      "  grep -o '\"priority\":[0-9],.*\"pid\"' | sed 's/,\"identifier\":.*\"text\"//'");
  const std::string host = MANIFEST_HOST;
  const auto line = [](const std::string& text) {
    return "\"priority\":5:\"" + text + "\",\"pid\"\n";
  };
  const std::string output = outcome.output;
  for (const std::string& text :
       {std::string("Trying to see if update available for mask 8"),
        std::string("Reading local resource com.zarvo.lasd\\n"),
        "Fetching URL https://" + host + "/1/v3/lasd.plist",
        std::string("We have don't have a previously downloaded gsm database, server has 1, update "
                    "required\\n"),
        std::string("uncompressing to /var/mobile/Library/LASD/gsm.db.tmp\\n"),
        std::string("Moving /var/mobile/Library/LASD/gsm.db.tmp to "
                    "/var/mobile/Library/LASD/gsm.db\\n"),
        std::string("Downloaded gsm database version 1 successfully\\n")}) {
    EXPECT_NE(output.find(line(text)), std::string::npos) << text << "\nis not in\n" << output;
  }
}

}  // namespace
