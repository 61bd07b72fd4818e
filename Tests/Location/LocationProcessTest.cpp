// SPDX-License-Identifier: Apache-2.0
//
// The real helper in the handset: coordinates in, civic info at the telephony daemon, the lines in
// between, and what happens when that daemon or the atlas is not there.
#include "Tests/Process/ProcessSuite.h"

namespace process_tests {
namespace {

const std::string kInZurich = "ln -sf /usr/share/zoneinfo/Europe/Zurich /etc/localtime\n";
/// Prints what the telephony daemon got: COUNT messages behind the first SKIP.
std::string Delivered(int count, int skip = 0) {
  return "handset telephony log --timeout 30 --count " + std::to_string(count) + " --skip " +
         std::to_string(skip) + "\n";
}
/// Waits for the last line of a delivery and prints every line of the helper's, as it was logged.
std::string LoggedUntil(const std::string& text) {
  return "handset log --timeout 30 --follow-until '" + text + "' >/dev/null\n" +
         "handset log --json | sed -n 's/.*\"priority\":\\([0-9]\\),\"identifier\":"
         "\"HalvecMobileHelper\",\"text\":\\(\".*\"\\),\"pid\".*/\\1 \\2/p'\n";
}

const std::string kConnect = "com.zarvo.Halvec.connection  connect [\"HalvecMobileHelper\"]\n";
const std::string kAsked = "3 \"server_HvMobileHelperRequestCountryCodeFromLocation \\n\"\n";
const std::string kSent = "5 \"sendCivicInfoToVL sent civic info to Halvec successfully\"\n";

std::string Civic(const std::string& parts) {
  return "com.zarvo.Halvec.connection  civic " + parts + "\n";
}

class Location : public ProcessSuite {
 protected:
  static Outcome runWithAtlas(const std::string& script) {
    return run(script, {"--bind", ATLAS ":" HALVEC_ATLAS_FILE});
  }
};

TEST_F(Location, OfACityReachesTheTelephonyDaemonWithALineForEachPart) {
  const Outcome outcome = runWithAtlas("halvecctl location resolve 47.3769 8.5417; echo $?\n" +
                                       Delivered(2) + LoggedUntil("successfully"));
  EXPECT_EQ(outcome.output,
            "0\n" + kConnect +
                Civic("country=\"CH\" state=\"Zurich\" city=\"Z\xc3\xbcrich\" postalCode=\"\"") +
                kAsked +
                "5 \"_RequestCivicInfoFromLatitudeLongitude mapItems: (1)\"\n"
                "5 \"_RequestCivicInfoFromLatitudeLongitude country code: CH\"\n"
                "5 \"_RequestCivicInfoFromLatitudeLongitude state: Zurich\"\n"
                "5 \"_RequestCivicInfoFromLatitudeLongitude city: Z\xc3\xbcrich\"\n" +
                kSent)
      << outcome.errors;
}

TEST_F(Location, OfZeroZeroIsTheConfiguredCountryWithoutALookUp) {
  const Outcome outcome =
      run(kInZurich + "halvecctl location resolve 0 0; halvecctl location resolve -- -0 0\n" +
          Delivered(4));
  const std::string delivery =
      kConnect + Civic("country=\"CH\" state=\"\" city=\"\" postalCode=\"\"");
  EXPECT_EQ(outcome.output, delivery + delivery) << outcome.errors;
}

TEST_F(Location, InTheOpenSeaIsTheConfiguredCountry) {
  const Outcome outcome = runWithAtlas(kInZurich + "halvecctl location resolve -- -48.9 -123.4\n" +
                                       Delivered(2) + LoggedUntil("successfully"));
  EXPECT_EQ(outcome.output,
            kConnect + Civic("country=\"CH\" state=\"\" city=\"\" postalCode=\"\"") + kAsked +
                "3 \"_RequestCivicInfoFromLatitudeLongitude didn't get any mapItems\\n\"\n" + kSent)
      << outcome.errors;
}

TEST_F(Location, ThatIsNoCoordinateIsAnErrorAndThenTheConfiguredCountry) {
  for (const char* place : {"nan 0", "0 nan", "inf 0", "90.001 0", "0 -180.001"}) {
    const Outcome outcome = runWithAtlas(kInZurich + "halvecctl location resolve -- " + place +
                                         "\n" + Delivered(2) + LoggedUntil("successfully"));
    EXPECT_TRUE(outcome.output.starts_with(
        kConnect + Civic("country=\"CH\" state=\"\" city=\"\" postalCode=\"\"") + kAsked +
        "3 \"_RequestCivicInfoFromLatitudeLongitude error: ("))
        << outcome.output << outcome.errors;
  }
}

TEST_F(Location, AtTheEdgesOfTheWorldIsAnswered) {
  for (const char* place : {"90 0", "-90 0", "0 180", "0 -180", "90 180"}) {
    const Outcome outcome = runWithAtlas(kInZurich + "halvecctl location resolve -- " + place +
                                         "\n" + Delivered(2) + "handset log | grep -c 'error: ('");
    EXPECT_TRUE(outcome.output.ends_with("postalCode=\"\"\n0\n")) << place << outcome.output;
  }
}

TEST_F(Location, WithoutAnAtlasIsTheConfiguredCountry) {
  const Outcome outcome = run(kInZurich + "halvecctl location resolve 47.3769 8.5417\n" +
                              Delivered(2) + "handset log | grep -c 'error: ('");
  EXPECT_EQ(outcome.output,
            kConnect + Civic("country=\"CH\" state=\"\" city=\"\" postalCode=\"\"") + "1\n")
      << outcome.errors;
}

TEST_F(Location, WithADamagedAtlasIsTheConfiguredCountryAndTheHelperServesOn) {
  const Outcome outcome = run(
      kInZurich +
      "mkdir -p $(dirname " HALVEC_ATLAS_FILE
      "); head -c 100000 /dev/urandom "
      ">" HALVEC_ATLAS_FILE
      "\n"
      "halvecctl location resolve 47.3769 8.5417\n" +
      Delivered(2) + "halvecctl location country; handset status --json | grep -c '\"starts\":1'");
  EXPECT_EQ(outcome.output,
            kConnect + Civic("country=\"CH\" state=\"\" city=\"\" postalCode=\"\"") + "CH\n1\n")
      << outcome.errors;
}

TEST_F(Location, ThatComesTooLateIsDroppedAfterTheFallback) {
  // Only the look-up's own thread is held up, at its opening of the atlas.
  const Outcome outcome =
      runWithAtlas(kInZurich +
                   "command -v strace >/dev/null || { echo no strace; exit; }\n"
                   "client connect >/dev/null; pid=$(handset wait-start)\n"
                   "strace -f -qq -o /dev/null -p $pid -P " HALVEC_ATLAS_FILE
                   " -e trace=openat "
                   "-e inject=openat:delay_enter=5500000 2>/dev/null & tracer=$!\n"
                   "until grep -q '^TracerPid:.[1-9]' /proc/$pid/status; do :; done\n"
                   "halvecctl location resolve 47.3769 8.5417\n" +
                   LoggedUntil("waiting for response") + Delivered(2) + "kill $tracer");
  if (outcome.output == "no strace\n") GTEST_SKIP() << "strace is not installed";
  EXPECT_EQ(outcome.output,
            kAsked + kSent +
                "3 \"_RequestCivicInfoFromLatitudeLongitude wasn't waiting for response from "
                "GEO\"\n" +
                kConnect + Civic("country=\"CH\" state=\"\" city=\"\" postalCode=\"\""))
      << outcome.errors;
}

TEST_F(Location, WithoutTheTelephonyDaemonIsOneErrorLine) {
  const Outcome outcome = run("handset telephony stop; halvecctl location resolve 0 0\n" +
                              LoggedUntil("could not open") + "handset telephony log");
  EXPECT_TRUE(outcome.output.ends_with(
      "3 \"sendCivicInfoToVL to Halvec failed, could not open VLServerConnection\"\n"))
      << outcome.output << outcome.errors;
}

TEST_F(Location, WithATelephonyDaemonThatDoesNotReadFailsWith60WithinASecondOrTwo) {
  const Outcome outcome = run("handset telephony pause; halvecctl location resolve 0 0\n" +
                              LoggedUntil("error: ") + "halvecctl location country; echo $?\n");
  EXPECT_TRUE(outcome.output.ends_with(
      "5 \"sendCivicInfoToVL failed civic info to Halvec due to error: 60\"\n6\n"))
      << outcome.output << outcome.errors;
}

TEST_F(Location, ThatTheTelephonyDaemonRefusesIsOneNoticeLine) {
  const Outcome outcome = run("handset telephony answer 3 7; halvecctl location resolve 0 0\n" +
                              LoggedUntil("error: ") +
                              "handset telephony answer 3 0; halvecctl location resolve 0 0\n" +
                              LoggedUntil("successfully") + "true");
  EXPECT_NE(
      outcome.output.find("5 \"sendCivicInfoToVL failed civic info to Halvec due to error: 7\"\n"),
      std::string::npos)
      << outcome.output;
  EXPECT_TRUE(outcome.output.ends_with(kSent)) << outcome.output << outcome.errors;
}

TEST_F(Location, DeliveryLogsANotificationThatComesBeforeTheAnswer) {
  const Outcome outcome = run("handset telephony notify; halvecctl location resolve 0 0\n" +
                              LoggedUntil("successfully"));
  EXPECT_TRUE(
      outcome.output.ends_with("5 \"_ServerConnectionCallback for HalvecMobileHelper\"\n" + kSent))
      << outcome.output << outcome.errors;
}

TEST_F(Location, IsShownByTheToolWhereThereIsNoTelephonyDaemon) {
  const Outcome outcome = run(kInZurich +
                                  "halvecctl location resolve 0 0 --wait\n"
                                  "ls /run/halvec/ports | grep -c connection",
                              {"--no-telephony"});
  EXPECT_EQ(outcome.output, "country:     CH\nstate:       \ncity:        \npostal code: \n0\n")
      << outcome.errors;
}

TEST_F(Location, LeavesNoDescriptorBehind) {
  const Outcome outcome = runWithAtlas(
      "count() { ls /proc/$(handset wait-start)/fd | wc -l; }\n"
      "halvecctl location resolve 47 8\n" +
      Delivered(2) + LoggedUntil("successfully") +
      "halvecctl location country >/dev/null; before=$(count)\n"
      "for i in 1 2 3 4 5 6 7 8; do halvecctl location resolve 0 0; done\n" +
      Delivered(18) + "halvecctl location country; test $(count) = $before; echo $?");
  EXPECT_TRUE(outcome.output.ends_with("\n0\n")) << outcome.output << outcome.errors;
}

/// The same program with an endpoint, and in the world beyond the handset the server that it names.
class OnlineLocation : public ProcessSuite {
 protected:
  static Outcome runOnline(const std::string& script) {
    const handset_tests::TemporaryFolder web;
    return run(
        "handset web stop; mkfifo /tmp/input /tmp/output\n"
        "handset world -- python3 -B /mnt/geocoder_server.py /run/handset/web-certificate.pem "
        "/run/handset/web-key.pem 198.51.100.1 443 </tmp/input >/tmp/output &\n"
        "exec 3>/tmp/input 4</tmp/output; read port <&4\n" +
            script,
        {"--bind", ATLAS ":" HALVEC_ATLAS_FILE, "--helper", ONLINE_HELPER, "--web", web.path(),
         "--web-host", "geocoder.example", "--bind", LOCATION_TEST_SCRIPTS ":/mnt"});
  }
};

TEST_F(OnlineLocation, HasStateCityAndPostCodeOfTheServiceInTheAtlassCountry) {
  const Outcome outcome =
      runOnline("halvecctl location resolve 47.376888 8.541694\n" + Delivered(2));
  EXPECT_EQ(outcome.output,
            kConnect + Civic("country=\"CH\" state=\"Z\xc3\xbcrich\" city=\"47.3769 8.5417\" "
                             "postalCode=\"HalvecMobileHelper/" HALVEC_VERSION "\""))
      << outcome.errors;
}

TEST_F(OnlineLocation, KeepsTheAtlassAnswerWhereTheServiceNamesAnotherCountry) {
  const Outcome outcome = runOnline("halvecctl location resolve 48.8566 2.3522\n" + Delivered(2));
  EXPECT_EQ(outcome.output,
            kConnect + Civic("country=\"FR\" state=\"\xc3\x8ele-de-France\" city=\"Paris\" "
                             "postalCode=\"\""))
      << outcome.errors;
}

TEST_F(OnlineLocation, IsTheAtlassAnswerInTimeWhenTheServiceIsSilent) {
  const Outcome outcome = runOnline("halvecctl location resolve -- 4.711 -74.0721\n" +
                                    Delivered(2) + "handset log | grep -c 'waiting'");
  EXPECT_TRUE(outcome.output.starts_with(kConnect + "com.zarvo.Halvec.connection  civic "
                                                    "country=\"CO\" state=\"Bogota D.C.\" "))
      << outcome.output << outcome.errors;
  EXPECT_TRUE(outcome.output.ends_with("\n0\n")) << outcome.output;
}

using Country = ProcessSuite;

TEST_F(Country, IsThatOfTheTimeZoneUntilAnotherIsChosen) {
  const Outcome outcome =
      run("ln -sf /usr/share/zoneinfo/Pacific/Ponape /etc/localtime; halvecctl location country\n"
          "halvecctl preference set com.zarvo.halvec.mobile-helper CountryCode DE\n"
          "halvecctl location country\n"
          "halvecctl preference remove com.zarvo.halvec.mobile-helper CountryCode\n"
          "halvecctl location country --json");
  EXPECT_EQ(outcome.output, "FM\nDE\n{\"countryCode\":\"FM\"}\n") << outcome.errors;
}

TEST_F(Country, FillsItsFieldWithoutAZeroFrom64BytesOn) {
  const Outcome outcome =
      run("x=$(printf 'x%.0s' $(seq 70))\n"
          "halvecctl preference set com.zarvo.halvec.mobile-helper CountryCode $x\n"
          "halvecctl location country");
  EXPECT_EQ(outcome.output, std::string(64, 'x') + "\n") << outcome.errors;
}

TEST_F(Country, ThatNobodyKnowsIsEmptyAndALine) {
  const Outcome outcome =
      run("ln -sf /usr/share/zoneinfo/Etc/UTC /etc/localtime; rm -f /etc/default/locale "
          "/etc/locale.conf\n"
          "halvecctl location country; echo $?\n" +
          LoggedUntil("country code"));
  EXPECT_EQ(outcome.output, "6\n3 \"Didn't get valid country code from Mapsvc.\\n\"\n")
      << outcome.errors;
}

}  // namespace
}  // namespace process_tests
