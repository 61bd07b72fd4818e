// SPDX-License-Identifier: Apache-2.0
//
// The downloader on a web in memory: its steps, and its lines byte for byte.
#include "Helper/LASD/HttpDownloader.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <pthread.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <optional>
#include <semaphore>
#include <thread>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/SystemLog.h"
#include "Tests/Fakes/FakeHttpTransport.h"
#include "Tests/Fakes/FakeSystemLog.h"
#include "Tests/Http/GzipForTest.h"
#include "Tests/Support/ThreadsRefused.h"

namespace {

using platform::LogPriority;
using vlu::Http::ErrorType;
using vlu::Http::HttpResponse;
using Bytes = std::vector<std::uint8_t>;
using Line = fakes::FakeSystemLog::Line;
using Lines = std::vector<Line>;

const std::string kUrl = "https://host.example/versions.plist";

Bytes BytesOf(const std::string& text) { return {text.begin(), text.end()}; }

Line Notice(std::string text) { return {LogPriority::kNotice, std::move(text)}; }

Line Fetching(const std::string& url) { return Notice("Fetching URL " + url); }

class HttpDownloads : public ::testing::Test {
 protected:
  HttpDownloads() {
    EXPECT_NE(::mkdtemp(folder.data()), nullptr);
    path = folder + "/database";
  }
  ~HttpDownloads() override { std::filesystem::remove_all(folder); }

  /// Fetches a body of that content type.
  void fetchBody(const Bytes& body, const vlu::Http::HeaderMap& headers) {
    web.put(kUrl, 200, body, headers);
    ASSERT_TRUE(downloader.fetch(kUrl, true));
    (void)log.takeLines();
  }
  /// What stands in the file; "(none)" without one.
  [[nodiscard]] std::string content() const {
    std::ifstream file(path);
    if (!file) return "(none)";
    return {std::istreambuf_iterator<char>(file), {}};
  }

  std::string folder = "/tmp/http-downloads-XXXXXX";
  std::string path;
  fakes::FakeSystemLog log;
  platform::ScopedReplacement<platform::SystemLog> logReplacement{log};
  fakes::FakeHttpTransport web;
  platform::ScopedReplacement<vlu::Http::HttpTransport> webReplacement{web};
  HttpDownloader downloader;
};

TEST_F(HttpDownloads, KeepBodyAndHeadersOfAWholeResponse) {
  web.put(kUrl, 200, BytesOf("versions"), {{"content-type", "text/xml"}});
  EXPECT_TRUE(downloader.fetch(kUrl, true));
  EXPECT_EQ(downloader.body(), BytesOf("versions"));
  EXPECT_EQ(downloader.headers().at("Content-Type"), "text/xml");
  EXPECT_EQ(log.takeLines(),
            (Lines{Fetching(kUrl), Notice("URL retrieved " + kUrl + ", size: 8 \n")}));
}

TEST_F(HttpDownloads, SendOneHeaderFieldThatAsksForGzip) {
  web.put(kUrl, 200, BytesOf("x"), {});
  EXPECT_TRUE(downloader.fetch(kUrl, true));
  ASSERT_EQ(web.transfers().size(), 1U);
  EXPECT_EQ(web.transfers()[0].url, kUrl);
  EXPECT_EQ(web.transfers()[0].headers, (vlu::Http::HeaderMap{{"Accept-Encoding", "gzip"}}));
}

TEST_F(HttpDownloads, UseCellularOnlyWhereWifiIsNotDemanded) {
  web.put(kUrl, 200, BytesOf("x"), {});
  EXPECT_TRUE(downloader.fetch(kUrl, true));
  EXPECT_TRUE(downloader.fetch(kUrl, false));
  EXPECT_FALSE(web.transfers()[0].allowsCellular);
  EXPECT_TRUE(web.transfers()[1].allowsCellular);
}

TEST_F(HttpDownloads, FailWithoutWifi) {
  web.put(kUrl, 200, BytesOf("x"), {});
  web.loseWifi();
  EXPECT_FALSE(downloader.fetch(kUrl, true));
  EXPECT_EQ(log.takeLines(),
            (Lines{Fetching(kUrl), Notice("HTTP request failed for URL " + kUrl +
                                          " with error no network that may be used errorcode 0 "
                                          "(no status)\n")}));
  EXPECT_TRUE(downloader.fetch(kUrl, false));
}

TEST_F(HttpDownloads, RefuseAnEmptyUrlBeforeAnythingElse) {
  EXPECT_FALSE(downloader.fetch("", true));
  EXPECT_EQ(log.takeLines(), (Lines{Notice("URL is empty")}));
  EXPECT_TRUE(web.transfers().empty());
}

TEST_F(HttpDownloads, SayWhenNoRequestCanBeMade) {
  EXPECT_FALSE(downloader.fetch("file:///etc/passwd", true));
  EXPECT_EQ(log.takeLines(),
            (Lines{Fetching("file:///etc/passwd"), Notice("Cannot create HTTP request for URL "
                                                          "file:///etc/passwd")}));
  EXPECT_TRUE(web.transfers().empty());
}

TEST_F(HttpDownloads, SayWhenNoResponseCame) {
  web.answer(kUrl, [](const auto&) { return nullptr; });
  EXPECT_FALSE(downloader.fetch(kUrl, true));
  EXPECT_EQ(log.takeLines(), (Lines{Fetching(kUrl), Notice("Did not receive HTTP response!\n")}));
}

TEST_F(HttpDownloads, FailWhereTheSystemHasNoThreadForTheTransfer) {
  web.put(kUrl, 200, BytesOf("x"), {});
  {
    const support::ThreadsRefused refused;
    EXPECT_FALSE(downloader.fetch(kUrl, true));
  }
  EXPECT_EQ(log.takeLines(), (Lines{Fetching(kUrl), Notice("Did not receive HTTP response!\n")}));
  EXPECT_TRUE(web.transfers().empty());
  EXPECT_TRUE(downloader.fetch(kUrl, true)) << "nothing is left of the attempt";
}

TEST_F(HttpDownloads, ReceiveTheResponseWhereTheirQueueGetsNoThread) {
  std::optional<support::ThreadsRefused> refused;
  web.answer(kUrl, [&](const vlu::Http::Transfer&) {
    refused.emplace();
    return std::make_shared<HttpResponse>(ErrorType::kSuccess, 200, BytesOf("x"),
                                          vlu::Http::HeaderMap());
  });
  EXPECT_TRUE(downloader.fetch(kUrl, true));
  refused.reset();
  EXPECT_EQ(log.takeLines(),
            (Lines{Fetching(kUrl), Notice("URL retrieved " + kUrl + ", size: 1 \n")}));
}

TEST_F(HttpDownloads, AnEmptyBodyIsRetrievedAndYetAFailure) {
  web.put(kUrl, 200, {}, {{"Content-Type", "text/xml"}});
  EXPECT_FALSE(downloader.fetch(kUrl, true));
  EXPECT_EQ(log.takeLines(),
            (Lines{Fetching(kUrl), Notice("URL retrieved " + kUrl + ", size: 0 \n")}));
}

TEST_F(HttpDownloads, EveryOtherStatusIsAFailureAndItsBodyIsNotKept) {
  const std::vector<std::pair<int, std::string>> answers{{206, "partial content"},
                                                         {304, "not modified"},
                                                         {404, "not found"},
                                                         {500, "internal server error"},
                                                         {599, "unknown status"}};
  for (const auto& [status, phrase] : answers) {
    web.put(kUrl, status, BytesOf("a page of words"), {{"Content-Type", "text/html"}});
    EXPECT_FALSE(downloader.fetch(kUrl, true));
    EXPECT_EQ(log.takeLines(),
              (Lines{Fetching(kUrl), Notice("HTTP request failed for URL " + kUrl +
                                            " with error success errorcode " +
                                            std::to_string(status) + " (" + phrase + ")\n")}));
    EXPECT_TRUE(downloader.body().empty());
    EXPECT_TRUE(downloader.headers().empty());
  }
}

TEST_F(HttpDownloads, AStatusOf200DoesNotOutweighAnError) {
  web.fail(kUrl, ErrorType::kConnectionLost, 200);
  EXPECT_FALSE(downloader.fetch(kUrl, true));
  EXPECT_EQ(log.takeLines(),
            (Lines{Fetching(kUrl), Notice("HTTP request failed for URL " + kUrl +
                                          " with error connection lost errorcode 200 (ok)\n")}));
}

TEST_F(HttpDownloads, AFailureForgetsWhatWasFetchedBefore) {
  fetchBody(BytesOf("versions"), {{"Content-Type", "text/xml"}});
  web.fail(kUrl, ErrorType::kTimedOut);
  EXPECT_FALSE(downloader.fetch(kUrl, true));
  EXPECT_TRUE(downloader.body().empty());
  EXPECT_TRUE(downloader.headers().empty());
}

/// Keeps the name of the thread that wrote the last line.
class ThreadNameLog final : public platform::SystemLog {
 public:
  void write(LogPriority /*priority*/, std::string_view /*text*/) override {
    (void)::pthread_getname_np(::pthread_self(), name.data(), name.size());
  }
  std::array<char, 16> name{};
};

TEST_F(HttpDownloads, ReceiveTheResponseOnTheirOwnQueue) {
  ThreadNameLog names;
  const platform::ScopedReplacement<platform::SystemLog> replacement{names};
  web.put(kUrl, 200, BytesOf("x"), {});
  EXPECT_TRUE(downloader.fetch(kUrl, true));
  EXPECT_STREQ(names.name.data(), "httpdownloadque") << "the queue's label, as far as names go";
}

TEST_F(HttpDownloads, RunSideBySide) {
  // Each answers only when the other has begun.
  std::binary_semaphore first(0);
  std::binary_semaphore second(0);
  const auto meet = [](std::binary_semaphore& own, std::binary_semaphore& other) {
    return [&](const vlu::Http::Transfer&) {
      own.release();
      other.acquire();
      return std::make_shared<HttpResponse>(ErrorType::kSuccess, 200, BytesOf("x"),
                                            vlu::Http::HeaderMap());
    };
  };
  web.answer("http://host.example/1", meet(first, second));
  web.answer("http://host.example/2", meet(second, first));
  std::thread other([] { EXPECT_TRUE(HttpDownloader().fetch("http://host.example/1", true)); });
  EXPECT_TRUE(downloader.fetch("http://host.example/2", true));
  other.join();
}

TEST_F(HttpDownloads, UncompressTheBodyIntoAFile) {
  fetchBody(support::Gzip("the database"), {{"Content-Type", "application/gzip"}});
  const HttpDownloader& unchanged = downloader;
  EXPECT_TRUE(unchanged.uncompressTo(path));
  EXPECT_EQ(content(), "the database");
  EXPECT_EQ(log.takeLines(), Lines{});
  EXPECT_TRUE(unchanged.uncompressTo(path)) << "the body is still there";
}

TEST_F(HttpDownloads, ReplaceWhatTheFileHeld) {
  std::ofstream(path) << "much longer than what comes";
  fetchBody(support::Gzip("short"), {{"Content-Type", "application/gzip"}});
  EXPECT_TRUE(downloader.uncompressTo(path));
  EXPECT_EQ(content(), "short");
}

TEST_F(HttpDownloads, UncompressNothingBeforeAFetch) {
  EXPECT_FALSE(downloader.uncompressTo(path));
  EXPECT_EQ(log.takeLines(),
            (Lines{Notice("Cannot uncompress downloaded buffer without a response!\n")}));
  EXPECT_EQ(content(), "(none)");
}

TEST_F(HttpDownloads, UncompressNothingWithoutAContentType) {
  fetchBody(support::Gzip("x"), {{"Content-Encoding", "gzip"}});
  EXPECT_FALSE(downloader.uncompressTo(path));
  EXPECT_EQ(log.takeLines(), (Lines{Notice("Cannot find Content-Type header in response!\n")}));
  EXPECT_EQ(content(), "(none)");
}

TEST_F(HttpDownloads, FindTheContentTypeInAnyCase) {
  for (const char* name : {"content-type", "CONTENT-TYPE", "cOnTeNt-tYpE"}) {
    fetchBody(support::Gzip("x"), {{name, "application/gzip"}});
    EXPECT_TRUE(downloader.uncompressTo(path)) << name;
  }
}

TEST_F(HttpDownloads, TakeEveryContentTypeThatContainsGzip) {
  for (const char* type :
       {"gzip", "application/gzip", "application/x-gzip", "application/gzip; charset=binary",
        "application/octet-stream, application/x-gzip", "text/gzipped"}) {
    fetchBody(support::Gzip("x"), {{"Content-Type", type}});
    EXPECT_TRUE(downloader.uncompressTo(path)) << type;
  }
}

TEST_F(HttpDownloads, RefuseEveryContentTypeThatDoesNot) {
  for (const std::string type : {"", "gzi", "GZIP", "application/GZip", "application/g-zip",
                                 "application/octet-stream", "application/zip"}) {
    fetchBody(support::Gzip("x"), {{"Content-Type", type}});
    EXPECT_FALSE(downloader.uncompressTo(path));
    EXPECT_EQ(log.takeLines(),
              (Lines{Notice("Expected to find gzip in Content-Type header, found " + type +
                            " instead\n")}));
    EXPECT_EQ(content(), "(none)");
  }
}

TEST_F(HttpDownloads, SayWhyTheFileCannotBeOpened) {
  fetchBody(support::Gzip("x"), {{"Content-Type", "application/gzip"}});
  EXPECT_FALSE(downloader.uncompressTo(folder + "/absent/file"));
  EXPECT_FALSE(downloader.uncompressTo(folder));
  EXPECT_EQ(log.takeLines(),
            (Lines{Notice("Cannot open output file " + folder +
                          "/absent/file: No such file or directory\n"),
                   Notice("Cannot open output file " + folder + ": Is a directory\n")}));
}

TEST_F(HttpDownloads, LeaveNoFileOfCorruptData) {
  Bytes body = support::Gzip(std::string(1 << 20, 'x'));
  body[body.size() / 2] ^= 0xff;
  fetchBody(body, {{"Content-Type", "application/gzip"}});
  std::ofstream(path) << "what was there before";
  EXPECT_FALSE(downloader.uncompressTo(path));
  EXPECT_EQ(log.takeLines(),
            (Lines{Notice("Could not uncompress HTTP response to " + path + "!\n")}));
  EXPECT_EQ(content(), "(none)");
}

TEST_F(HttpDownloads, WriteThroughNoLinkAndNoSecondName) {
  const std::string target = folder + "/target";
  std::ofstream(target) << "something";
  fetchBody(support::Gzip("the database"), {{"Content-Type", "application/gzip"}});
  std::filesystem::create_symlink(target, path);
  EXPECT_FALSE(downloader.uncompressTo(path));
  std::filesystem::remove(path);
  std::filesystem::create_hard_link(target, path);
  EXPECT_FALSE(downloader.uncompressTo(path));
  EXPECT_EQ(content(), "something") << "under either name";
  std::filesystem::remove(path);
  std::filesystem::create_symlink(folder + "/absent", path);
  EXPECT_FALSE(downloader.uncompressTo(path));
  EXPECT_FALSE(std::filesystem::exists(folder + "/absent"));
  const std::string line = "Cannot open output file " + path + ": ";
  EXPECT_EQ(log.takeLines(), (Lines{Notice(line + "Too many levels of symbolic links\n"),
                                    Notice(line + "Too many links\n"),
                                    Notice(line + "Too many levels of symbolic links\n")}));
}

TEST_F(HttpDownloads, WaitForNobodyAtAFifo) {
  fetchBody(support::Gzip("the database"), {{"Content-Type", "application/gzip"}});
  ASSERT_EQ(::mkfifo(path.c_str(), 0600), 0);
  EXPECT_FALSE(downloader.uncompressTo(path));
  const platform::FileDescriptor reader(::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  ASSERT_TRUE(reader);
  EXPECT_FALSE(downloader.uncompressTo(path));
  char byte = 0;
  EXPECT_EQ(::read(reader.get(), &byte, 1), 0) << "nothing is written there either";
  const std::string line = "Cannot open output file " + path + ": ";
  EXPECT_EQ(log.takeLines(), (Lines{Notice(line + "No such device or address\n"),
                                    Notice(line + "Operation not supported\n")}));
}

TEST_F(HttpDownloads, SayWhyAPartialFileCannotBeRemoved) {
  // A file in /proc opens for writing and can be removed by nobody.
  const std::string stubborn = "/proc/self/comm";
  fetchBody(BytesOf("no gzip at all"), {{"Content-Type", "application/gzip"}});
  EXPECT_FALSE(downloader.uncompressTo(stubborn));
  EXPECT_EQ(log.takeLines(),
            (Lines{Notice("Could not uncompress HTTP response to " + stubborn + "!\n"),
                   Notice("Failed to remove partially uncompressed file at " + stubborn +
                          ": Operation not permitted\n")}));
}

}  // namespace
