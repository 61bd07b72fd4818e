// SPDX-License-Identifier: Apache-2.0
//
// The web that a handset may have: https with an authority of its own, names, log. One thread.
#include <gtest/gtest.h>

#include <fstream>
#include <string>
#include <vector>

#include "Tests/Handset/HandsetRun.h"

namespace handset_tests {
namespace {

class HandsetWeb : public HandsetSuite {
 protected:
  void SetUp() override {
    HandsetSuite::SetUp();
    for (const char* name : {"list.plist", "list.plist.gz", "other"}) {
      std::ofstream(folder_.path() + "/" + name) << "some text\n";
    }
  }

  Outcome run(const std::string& script, std::vector<std::string> options = {}) const {
    options.insert(options.end(),
                   {"--web", folder_.path(), "--install", std::string(WEB_CALLER) + ":ask-web"});
    return RunHandset(script, options);
  }

  TemporaryFolder folder_;
};

TEST_F(HandsetWeb, ServesAFolderByHttpsAsTheManifestsHost) {
  const Outcome outcome =
      run("for name in list.plist list.plist.gz other absent; do\n"
          "ask-web get https://" MANIFEST_HOST "/$name; done");
  EXPECT_EQ(outcome.output,
            "200 application/x-plist None 10\n200 application/gzip None 10\n"
            "200 application/octet-stream None 10\n404\n")
      << outcome.errors;
}

TEST_F(HandsetWeb, ShowsWhatChangesInTheFolder) {
  EXPECT_EQ(run("ask-web get https://" MANIFEST_HOST "/new; echo text >/run/handset/web/new\n"
                "ask-web get https://" MANIFEST_HOST "/new")
                .output,
            "404\n200 application/octet-stream None 5\n");
}

TEST_F(HandsetWeb, HasTheNamesThatItIsGiven) {
  const Outcome outcome = run("for name in a.example b.example " MANIFEST_HOST
                              "; do\n"
                              "ask-web get https://$name/other; done",
                              {"--web-host", "a.example", "--web-host", "b.example"});
  EXPECT_EQ(outcome.output,
            "200 application/octet-stream None 10\n200 application/octet-stream None 10\n"
            "Name or service not known\n");
}

TEST_F(HandsetWeb, IsTrustedUnderItsNamesAndByThisHandsetOnly) {
  const Outcome outcome =
      run("ask-web get https://198.51.100.1/other; ls /etc/ssl/certs | grep -v '\\.0$'\n"
          "openssl x509 -noout -subject -in /etc/ssl/certs/ca-certificates.crt\n"
          "ls /run/handset/*key.pem; stat -c %a /run/handset/web-key.pem\n"
          "rm /etc/ssl/certs/*; ask-web get https://" MANIFEST_HOST "/other");
  EXPECT_EQ(outcome.output,
            "CERTIFICATE_VERIFY_FAILED\nca-certificates.crt\nsubject=CN = Handset authority\n"
            "/run/handset/web-key.pem\n600\nCERTIFICATE_VERIFY_FAILED\n");
}

TEST_F(HandsetWeb, IsReachedOverTheCellularLinkUnlessThatIsDown) {
  const Outcome outcome = run("ask-web get https://" MANIFEST_HOST
                              "/other; handset network down pdp_ip0\n"
                              "ask-web get https://" MANIFEST_HOST
                              "/list.plist; handset web log --count 2 --timeout 60");
  EXPECT_EQ(outcome.output,
            "200 application/octet-stream None 10\n200 application/x-plist None 10\n"
            "10.64.0.2 " MANIFEST_HOST
            " \"GET /other HTTP/1.1\" 200 10 \"identity\"\n"
            "192.168.64.2 " MANIFEST_HOST " \"GET /list.plist HTTP/1.1\" 200 10 \"identity\"\n");
}

TEST_F(HandsetWeb, StopsAndStartsItsServer) {
  const Outcome outcome = run("handset web stop; ask-web get https://" MANIFEST_HOST
                              "/other; handset web stop; echo $?\n"
                              "handset web start; ask-web get https://" MANIFEST_HOST
                              "/other; handset web start; echo $?");
  EXPECT_EQ(outcome.output, "Connection refused\n1\n200 application/octet-stream None 10\n1\n");
  EXPECT_EQ(outcome.errors,
            "handset: the web server does not run\nhandset: the web server runs already\n");
}

TEST_F(HandsetWeb, SaysWhenItsServerDies) {
  const Outcome outcome = run("ask-web get https://" MANIFEST_HOST
                              "/other; server=$(cat /run/handset/nginx.pid)\n"
                              "kill -KILL $server; while kill -0 $server 2>/dev/null; do :; done\n"
                              "handset web stop; echo $?");
  EXPECT_EQ(outcome.output, "200 application/octet-stream None 10\n1\n");
  EXPECT_EQ(outcome.errors,
            "handset: the web server ended; see /run/handset/web-error.log inside\n"
            "handset: the web server does not run\n");
}

TEST_F(HandsetWeb, GivesItsPlaceAndCertificateToATestsOwnServer) {
  const Outcome outcome =
      run("handset web stop\n"
          "handset world ask-web serve 'HTTP/1.0 200 X\\r\\nContent-Encoding: odd\\r\\n\\r\\nabc' "
          ">/tmp/said & until grep -q ready /tmp/said; do :; done\n"
          "ask-web get https://" MANIFEST_HOST "/other; wait");
  EXPECT_EQ(outcome.output, "200 None odd 3\n");
}

TEST_F(HandsetWeb, ResolvesItsNamesAndNoOther) {
  const Outcome outcome =
      run("cat /etc/resolv.conf; getent ahosts " MANIFEST_HOST
          " | cut -d' ' -f 1 | sort -u\n"
          "ask-web look " MANIFEST_HOST " 1; ask-web look " MANIFEST_HOST
          " 28\n"
          "ask-web look elsewhere.example 1; ask-web look " MANIFEST_HOST " 1 10.64.0.1");
  EXPECT_EQ(outcome.output,
            "nameserver 192.168.64.1\n198.51.100.1\n77 0 1 198.51.100.1\n77 0 0 -\n77 3 0 -\n"
            "77 0 1 198.51.100.1\n");
}

TEST_F(HandsetWeb, HasANameServerThatMayKeepSilent) {
  // What was asked meanwhile is not answered later.
  const Outcome outcome =
      run("handset capture start wlan0; handset web dns off; ask-web ask " MANIFEST_HOST
          " 1\n"
          "handset web dns on; ask-web look " MANIFEST_HOST
          " 1\n"
          "handset capture show | cut -d' ' -f 1-3");
  EXPECT_EQ(outcome.output, "77 0 1 198.51.100.1\nwlan0 out udp\nwlan0 out udp\nwlan0 in udp\n");
}

TEST_F(HandsetWeb, RefusesUsageThatItDoesNotKnow) {
  for (const char* words : {"web", "web sing", "web dns", "web dns maybe", "web log --what"}) {
    EXPECT_EQ(run(std::string("handset ") + words).status, 2) << words;
  }
  EXPECT_EQ(RunHandset("handset web log").status, 2) << "there is none";
  EXPECT_EQ(RunHandset("true", {"--web-host", "a.example"}).status, 2);
  EXPECT_EQ(RunHandset("true", {"--no-network", "--web", "/tmp"}).status, 2);
  EXPECT_EQ(RunHandset("true", {"--web", "/etc/passwd"}).errors, "handset: --web needs a folder\n");
}

}  // namespace
}  // namespace handset_tests
