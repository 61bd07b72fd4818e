// SPDX-License-Identifier: Apache-2.0
//
// The online geocoder over the real HTTP transport, against an https server that speaks the
// protocol and refuses every other request.
#include <gtest/gtest.h>

#include <filesystem>
#include <semaphore>
#include <string>

#include "Helper/Platform/Linux/HttpTransportCurl.h"
#include "Helper/Platform/Linux/NominatimGeocoder.h"
#include "Tests/Http/Script.h"
#include "Tests/Http/WebServer.h"

namespace {

using platform::CivicAddress;
using platform::GeocodeError;
using platform::OpenSea;

platform::HttpProfile ProfileForTest() {
  platform::HttpProfile profile;
  profile.certificates = support::WebServer::authority();
  return profile;
}

/// The real transport, which tells when a transfer has ended.
class WatchedTransport final : public vlu::Http::HttpTransport {
 public:
  explicit WatchedTransport(const platform::HttpProfile& profile) : transport_(profile) {}
  bool accepts(const std::string& url) override { return transport_.accepts(url); }
  std::shared_ptr<vlu::Http::HttpResponse> retrieve(const vlu::Http::Transfer& transfer) override {
    auto response = transport_.retrieve(transfer);
    ended_.release();
    return response;
  }
  void waitForTheEnd() { ended_.acquire(); }

 private:
  platform::HttpTransportCurl transport_;
  std::counting_semaphore<> ended_{0};
};

class OnlineGeocoder : public ::testing::Test {
 protected:
  explicit OnlineGeocoder(const platform::HttpProfile& profile = ProfileForTest())
      : transport(profile) {}

  /// Waits for the end of the transfer, too.
  std::string lookUp(double latitude, double longitude,
                     platform::Duration limit = std::chrono::seconds(20)) {
    platform::NominatimGeocoder geocoder("https://127.0.0.1:" + server.lines().at(0) + "/base",
                                         limit);
    const platform::GeocodeAnswer answer = geocoder.lookUp({latitude, longitude});
    transport.waitForTheEnd();
    if (const auto* error = std::get_if<GeocodeError>(&answer)) return error->description;
    if (std::holds_alternative<OpenSea>(answer)) return "sea";
    const auto& address = std::get<CivicAddress>(answer);
    return *address.countryCode + '/' + address.state.value_or("-") + '/' +
           address.city.value_or("-") + '/' + address.postCode.value_or("-");
  }

  support::Script server{
      {LOCATION_TEST_SCRIPTS "/geocoder_server.py",
       std::filesystem::path(support::WebServer::authority()).parent_path() / "good.pem"}};
  WatchedTransport transport;
  platform::ScopedReplacement<vlu::Http::HttpTransport> replacement{transport};
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

TEST_F(OnlineGeocoder, EndsTheTransferOfAServerThatNeverEndsItsAnswer) {
  EXPECT_EQ(lookUp(6, 1, std::chrono::milliseconds(200)), "the geocoder did not answer in time");
}

TEST_F(OnlineGeocoder, EndsTheTransferOfAnAnswerThatIsTooLong) {
  EXPECT_EQ(lookUp(7, 1), "the geocoder's answer is too long");
}

class DistrustfulGeocoder : public OnlineGeocoder {
 protected:
  DistrustfulGeocoder() : OnlineGeocoder(platform::HttpProfile()) {}
};

TEST_F(DistrustfulGeocoder, AsksNobodyWhomTheSystemDoesNotTrust) {
  EXPECT_EQ(lookUp(47, 8), std::string("the geocoder cannot be asked: ") +
                               vlu::Http::asString(vlu::Http::ErrorType::kNotTrusted));
}

}  // namespace
