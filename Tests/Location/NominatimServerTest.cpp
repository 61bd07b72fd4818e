// SPDX-License-Identifier: Apache-2.0
//
// The online geocoder over the real HTTP transport, against an https server that speaks the
// protocol and refuses every other request.
#include <gtest/gtest.h>

#include <filesystem>
#include <string>

#include "Helper/Platform/Linux/HttpTransportCurl.h"
#include "Helper/Platform/Linux/NominatimGeocoder.h"
#include "Tests/Http/Script.h"
#include "Tests/Http/WebServer.h"

/// A transfer that is given up goes on until the server is silent for too long, and then this
/// program has ended: what the TLS library holds for it is no leak.
extern "C" const char* __lsan_default_suppressions();   // NOLINT(bugprone-reserved-identifier)
extern "C" const char* __lsan_default_suppressions() {  // NOLINT(bugprone-reserved-identifier)
  return "leak:libcrypto.so\nleak:libssl.so\nleak:libcurl.so\n";
}

namespace {

using platform::CivicAddress;
using platform::GeocodeError;
using platform::OpenSea;

/// Never destroyed: a look-up that was given up goes on in its own thread.
platform::HttpTransportCurl& Transport() {
  static auto& transport = *new platform::HttpTransportCurl([] {
    platform::HttpProfile profile;
    profile.certificates = support::WebServer::authority();
    return profile;
  }());
  return transport;
}

class OnlineGeocoder : public ::testing::Test {
 protected:
  std::string lookUp(double latitude, double longitude,
                     platform::Duration limit = std::chrono::seconds(20)) {
    platform::NominatimGeocoder geocoder("https://127.0.0.1:" + server.lines().at(0) + "/base",
                                         limit);
    const platform::GeocodeAnswer answer = geocoder.lookUp({latitude, longitude});
    if (const auto* error = std::get_if<GeocodeError>(&answer)) return error->description;
    if (std::holds_alternative<OpenSea>(answer)) return "sea";
    const auto& address = std::get<CivicAddress>(answer);
    return *address.countryCode + '/' + address.state.value_or("-") + '/' +
           address.city.value_or("-") + '/' + address.postCode.value_or("-");
  }

  support::Script server{
      {LOCATION_TEST_SCRIPTS "/geocoder_server.py",
       std::filesystem::path(support::WebServer::authority()).parent_path() / "good.pem"}};
  platform::ScopedReplacement<vlu::Http::HttpTransport> replacement{Transport()};
};

TEST_F(OnlineGeocoder, IsUnderstoodByAServerOfItsProtocol) {
  EXPECT_EQ(lookUp(47.376888, 8.541694),
            "CH/Z\xc3\xbcrich/47.3769 8.5417/HalvecMobileHelper/" HALVEC_VERSION);
}

TEST_F(OnlineGeocoder, SaysWhatTheServerDid) {
  EXPECT_EQ(lookUp(1, 1), "sea");
  EXPECT_EQ(lookUp(2, 1), "the geocoder's answer is garbled");
  EXPECT_EQ(lookUp(3, 1), "the geocoder answered with status 503");
}

TEST_F(OnlineGeocoder, FollowsNoRedirectIntoTheClear) {
  EXPECT_EQ(lookUp(5, 1), std::string("the geocoder cannot be asked: ") +
                              vlu::Http::asString(vlu::Http::ErrorType::kRedirectRefused));
}

TEST_F(OnlineGeocoder, GivesASilentServerUp) {
  EXPECT_EQ(lookUp(4, 1, std::chrono::milliseconds(1)), "the geocoder did not answer in time");
}

TEST_F(OnlineGeocoder, AsksNobodyWhomTheSystemDoesNotTrust) {
  platform::HttpTransportCurl strict;
  const platform::ScopedReplacement<vlu::Http::HttpTransport> strictReplacement(strict);
  EXPECT_EQ(lookUp(47, 8), std::string("the geocoder cannot be asked: ") +
                               vlu::Http::asString(vlu::Http::ErrorType::kNotTrusted));
}

}  // namespace
