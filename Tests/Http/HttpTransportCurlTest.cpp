// SPDX-License-Identifier: Apache-2.0
//
// The real transport against servers that misbehave. A server that is silent for ever is answered
// by the limits, which are short here; what a test waits for is the outcome, never a time.
#include "Helper/Platform/Linux/HttpTransportCurl.h"

#include <gtest/gtest.h>
#include <stdlib.h>

#include "Helper/Platform/vlu/Http.h"
#include "Tests/Http/Retrieval.h"
#include "Tests/Http/WebServer.h"

namespace {

using support::BytesOf;
using support::TextOf;
using vlu::Http::ErrorType;
using Response = std::shared_ptr<vlu::Http::HttpResponse>;

constexpr std::size_t kLongestBody = 1'000'000;
const vlu::Http::HeaderMap kGzip{{"Accept-Encoding", "gzip"}};

platform::HttpProfile ShortProfile() {
  platform::HttpProfile profile;
  profile.certificates = support::WebServer::authority();
  profile.connectLimit = std::chrono::milliseconds(1500);
  profile.quietLimit = std::chrono::seconds(1);
  profile.overallLimit = std::chrono::seconds(20);
  profile.longestBody = kLongestBody;
  return profile;
}

class HttpTransfers : public ::testing::Test {
 protected:
  explicit HttpTransfers(const platform::HttpProfile& profile = ShortProfile())
      : transport(profile) {}

  Response get(const std::string& server, const std::string& path,
               const vlu::Http::HeaderMap& headers = {}) {
    return support::Retrieve(web.url(server, path), headers);
  }
  ErrorType errorOf(const std::string& server, const std::string& path) {
    const Response response = get(server, path);
    EXPECT_TRUE(response);
    return response ? response->errorType() : ErrorType::kUnknown;
  }

  support::WebServer web;
  platform::HttpTransportCurl transport;
  platform::ScopedReplacement<vlu::Http::HttpTransport> replacement{transport};
};

TEST_F(HttpTransfers, GoOverHttpsWhereTheCertificateIsTheHosts) {
  EXPECT_EQ(TextOf(get("https", "hello")->takeBody()), "hello");
}

TEST_F(HttpTransfers, RefuseEveryCertificateThatIsNot) {
  for (const char* server : {"wrong-name", "expired", "stranger", "old-tls"}) {
    const Response response = get(server, "hello");
    EXPECT_EQ(response->errorType(), ErrorType::kNotTrusted) << server;
    EXPECT_EQ(response->statusCode(), 0) << server;
  }
}

TEST_F(HttpTransfers, TrustNobodyWithoutTheAuthoritysFile) {
  auto profile = ShortProfile();
  profile.certificates = "/nonexistent/authorities.pem";
  platform::HttpTransportCurl strict(profile);
  const platform::ScopedReplacement<vlu::Http::HttpTransport> other{strict};
  EXPECT_EQ(errorOf("https", "hello"), ErrorType::kNotTrusted);
}

TEST_F(HttpTransfers, SendTheGivenFieldsOnceAndNoneThatTellsMore) {
  const std::string request = TextOf(get("http", "request", kGzip)->takeBody());
  const std::string host = web.url("http", "").substr(7, web.url("http", "").size() - 8);
  EXPECT_EQ(request, "GET /request HTTP/1.1\r\nHost: " + host +
                         "\r\nAccept: */*\r\nAccept-Encoding: gzip\r\n\r\n");
  const vlu::Http::HeaderMap two{{"X-One", "1"}, {"accept-encoding", "br"}};
  const std::string other = TextOf(get("http", "request", two)->takeBody());
  EXPECT_NE(other.find("\r\nX-One: 1\r\n"), std::string::npos);
  EXPECT_NE(other.find("\r\naccept-encoding: br\r\n"), std::string::npos);
  EXPECT_EQ(other.find("gzip"), std::string::npos);
}

TEST_F(HttpTransfers, UndoTransferCompressionThatWasAskedFor) {
  EXPECT_EQ(TextOf(get("http", "encoded", kGzip)->takeBody()), "hello");
  EXPECT_EQ(TextOf(get("http", "encoded")->takeBody()), "not asked");
}

TEST_F(HttpTransfers, LeaveACompressedFileAsItIs) {
  const Response plain = get("http", "gzip-type", kGzip);
  EXPECT_EQ(plain->takeHeaders().at("Content-Type"), "application/gzip");
  const auto body = plain->takeBody();
  ASSERT_GT(body.size(), 2U);
  EXPECT_EQ(body[0], 0x1f);
  EXPECT_EQ(body[1], 0x8b);
  EXPECT_EQ(get("http", "gzip-both", kGzip)->takeBody()[0], 0x1f)
      << "compressed twice, undone once";
}

TEST_F(HttpTransfers, JoinTheValuesOfARepeatedField) {
  const auto headers = get("http", "twice")->takeHeaders();
  EXPECT_EQ(headers.at("X-Field"), "one, two");
  EXPECT_EQ(headers.at("X-Other"), "x");
}

TEST_F(HttpTransfers, TakeTheFieldsOfTheFinalResponseAlone) {
  for (const char* path : {"interim", "trailer", "redirect?/hello"}) {
    const Response response = get("http", path);
    EXPECT_EQ(TextOf(response->takeBody()), "hello") << path;
    const auto headers = response->takeHeaders();
    EXPECT_FALSE(headers.contains("X-Early"));
    EXPECT_FALSE(headers.contains("X-Late"));
    EXPECT_FALSE(headers.contains("X-Redirect"));
    const auto type = headers.find("Content-Type");
    EXPECT_TRUE(type == headers.end() || type->second == "text/plain") << type->second;
  }
}

TEST_F(HttpTransfers, TakeBodiesUpToTheLimitHoweverTheyAreSent) {
  for (const std::string form : {"length", "chunked", "until-close"}) {
    EXPECT_EQ(get("http", form + "/1000000")->takeBody().size(), kLongestBody) << form;
    const Response longer = get("http", form + "/1000001");
    EXPECT_EQ(longer->errorType(), ErrorType::kTooLarge) << form;
    EXPECT_EQ(longer->statusCode(), 200) << form;
    EXPECT_TRUE(longer->takeBody().empty()) << form;
  }
}

TEST_F(HttpTransfers, EndWhenTheServerNeverDoes) {
  for (const char* path : {"endless-body", "endless-chunks", "endless-head", "endless-line",
                           "endless-interim", "announced/1000000000000"}) {
    EXPECT_EQ(errorOf("http", path), ErrorType::kTooLarge) << path;
  }
}

TEST_F(HttpTransfers, CountACompressedBodyAsWhatItBecomes) {
  EXPECT_EQ(get("http", "bomb", kGzip)->errorType(), ErrorType::kTooLarge);
}

TEST_F(HttpTransfers, EndWhenTheServerIsSilentOrNearlySo) {
  for (const char* path : {"silent", "drip-head", "drip-body", "stall"}) {
    EXPECT_EQ(errorOf("http", path), ErrorType::kTimedOut) << path;
  }
  EXPECT_EQ(errorOf("silent-tls", "hello"), ErrorType::kTimedOut);
}

TEST_F(HttpTransfers, EndAtTheOverallLimitWhateverArrives) {
  auto profile = ShortProfile();
  profile.overallLimit = std::chrono::milliseconds(300);
  profile.quietLimit = std::chrono::hours(1);
  profile.longestBody = std::size_t{64} << 30;
  platform::HttpTransportCurl impatient(profile);
  const platform::ScopedReplacement<vlu::Http::HttpTransport> other{impatient};
  EXPECT_EQ(errorOf("http", "drip-body"), ErrorType::kTimedOut);
}

TEST_F(HttpTransfers, EndAtTheRequestsOwnLimits) {
  auto profile = ShortProfile();
  profile.overallLimit = std::chrono::hours(1);
  profile.quietLimit = std::chrono::hours(1);
  platform::HttpTransportCurl patient(profile);
  const platform::ScopedReplacement<vlu::Http::HttpTransport> other{patient};
  const auto outcome = [&](const std::string& path, platform::Duration limit, std::size_t longest) {
    const auto request =
        vlu::Http::HttpRequest::create(vlu::Http::RequestType::kRetrieval, web.url("http", path),
                                       {}, vlu::Http::HttpSession::create());
    request->setLimits(limit, longest);
    return support::ResponseTo(*request)->errorType();
  };
  constexpr std::size_t kAny = std::size_t{1} << 40;
  EXPECT_EQ(outcome("drip-body", std::chrono::milliseconds(300), kAny), ErrorType::kTimedOut);
  for (const std::string form : {"length", "chunked", "until-close"}) {
    EXPECT_EQ(outcome(form + "/1000", std::chrono::hours(2), 1000), ErrorType::kSuccess) << form;
    EXPECT_EQ(outcome(form + "/1001", std::chrono::hours(2), 1000), ErrorType::kTooLarge) << form;
    EXPECT_EQ(outcome(form + "/1000001", std::chrono::hours(2), kAny), ErrorType::kTooLarge)
        << form << ": the profile's limit stays";
  }
}

TEST_F(HttpTransfers, TellABrokenConnectionFromAWholeBody) {
  for (const char* path : {"announced/100", "close", "reset", "cut-chunk", "half-line"}) {
    EXPECT_EQ(errorOf("http", path), ErrorType::kConnectionLost) << path;
  }
}

TEST_F(HttpTransfers, RefuseWhatIsNotHttp) {
  for (const char* path : {"garbage", "no-head", "negative", "bad-encoding"}) {
    EXPECT_EQ(get("http", path, kGzip)->errorType(), ErrorType::kMalformedResponse) << path;
  }
  for (const char* path : {"two-lengths", "bad-chunk"}) {
    EXPECT_EQ(errorOf("http", path), ErrorType::kConnectionLost) << path;
  }
}

TEST_F(HttpTransfers, TakeNoMoreThanWasAnnounced) {
  EXPECT_EQ(TextOf(get("http", "longer")->takeBody()), "hello");
}

TEST_F(HttpTransfers, SayWhenNobodyListensOrNobodyIsThere) {
  EXPECT_EQ(support::Retrieve("http://127.0.0.1:1/")->errorType(), ErrorType::kCannotConnect);
  EXPECT_EQ(support::Retrieve("http://nobody.invalid/")->errorType(), ErrorType::kHostNotFound);
}

TEST_F(HttpTransfers, IgnoreTheProxyOfTheEnvironment) {
  for (const char* name : {"http_proxy", "https_proxy", "all_proxy", "ALL_PROXY"}) {
    ASSERT_EQ(::setenv(name, "http://127.0.0.1:1/", 1), 0);
  }
  EXPECT_EQ(TextOf(get("http", "hello")->takeBody()), "hello");
  EXPECT_EQ(TextOf(get("https", "hello")->takeBody()), "hello");
  for (const char* name : {"http_proxy", "https_proxy", "all_proxy", "ALL_PROXY"}) {
    ASSERT_EQ(::unsetenv(name), 0);
  }
}

TEST_F(HttpTransfers, FollowEveryKindOfRedirect) {
  for (const char* status : {"301", "302", "303", "307", "308"}) {
    const Response response = get("http", std::string("redirect/") + status + "?/hello");
    EXPECT_EQ(response->statusCode(), 200) << status;
    EXPECT_EQ(TextOf(response->takeBody()), "hello") << status;
  }
}

TEST_F(HttpTransfers, AnswerWithARedirectThatLeadsNowhere) {
  EXPECT_EQ(get("http", "status/302")->statusCode(), 302);
  EXPECT_EQ(get("http", "redirect/300?/hello")->statusCode(), 300);
  EXPECT_EQ(get("http", "redirect/304?/hello")->statusCode(), 304);
}

TEST_F(HttpTransfers, FollowAFewRedirectsAndNotMore) {
  EXPECT_EQ(TextOf(get("http", "redirects/5")->takeBody()), "arrived");
  const Response response = get("http", "redirects/6");
  EXPECT_EQ(response->errorType(), ErrorType::kTooManyRedirects);
  EXPECT_EQ(response->statusCode(), 302);
}

TEST_F(HttpTransfers, FollowFromHttpToHttpsAndNeverBack) {
  EXPECT_EQ(TextOf(get("http", "redirect?" + web.url("https", "hello"))->takeBody()), "hello");
  EXPECT_EQ(TextOf(get("https", "redirect?" + web.url("https", "hello"))->takeBody()), "hello");
  const Response back = get("https", "redirect?" + web.url("http", "hello"));
  EXPECT_EQ(back->errorType(), ErrorType::kRedirectRefused);
  EXPECT_EQ(back->statusCode(), 302);
}

TEST_F(HttpTransfers, FollowToNoOtherScheme) {
  for (const char* target :
       {"file:///etc/passwd", "ftp://127.0.0.1/", "gopher://127.0.0.1/", "dict://127.0.0.1/",
        "data:text/plain,hello", "https://user@127.0.0.1/"}) {
    EXPECT_EQ(get("http", std::string("redirect?") + target)->errorType(),
              ErrorType::kRedirectRefused)
        << target;
  }
}

TEST_F(HttpTransfers, GoOverLoopbackToALoopbackAddressWithoutCellular) {
  const auto get = [&](const std::string& url) {
    return support::Retrieve(url, {}, /*allowsCellular=*/false);
  };
  EXPECT_EQ(TextOf(get(web.url("http", "hello"))->takeBody()), "hello");
  EXPECT_EQ(TextOf(get(web.url("https", "redirect?/hello"))->takeBody()), "hello");
  EXPECT_EQ(TextOf(get(web.url("http", "hello", "localhost"))->takeBody()), "hello")
      << "by the hosts file";
}

}  // namespace
