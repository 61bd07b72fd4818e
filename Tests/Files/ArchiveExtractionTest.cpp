// SPDX-License-Identifier: Apache-2.0
//
// The request that extracts an archive, over real ports, on archives in memory.
#include "Tests/Fakes/FakeArchiveCopier.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using platform::ArchiveCopyOptions;
using platform::LogPriority;
using support::Bytes;
using support::Get;
using Line = fakes::FakeSystemLog::Line;
using Lines = std::vector<Line>;

constexpr std::int32_t kExtractArchive = 8683570;

class ArchiveExtraction : public support::ServerFixture {
 protected:
  void SetUp() override {
    start();
    client = connect();
    (void)log.takeLines();
  }
  /// The success flag of a reply that is otherwise as it must be.
  std::uint32_t send(const std::string& source, const std::string& destination) {
    Bytes bytes = support::Message(kExtractArchive, 544);
    support::PutText(bytes, 32, source);
    support::PutText(bytes, 288, destination);
    const Bytes reply = request(*client, bytes).bytes;
    EXPECT_EQ(reply.size(), 40U);
    EXPECT_EQ(Get<std::int32_t>(reply, 20), kExtractArchive + 100);
    EXPECT_EQ(Get<std::int32_t>(reply, 32), 0) << "the return code is always 0";
    return Get<std::uint32_t>(reply, 36);
  }

  fakes::FakeArchiveCopierFactory copiers;
  platform::ScopedReplacement<platform::ArchiveCopierFactory> replacement{copiers};
  std::unique_ptr<support::WireClient> client;
};

TEST_F(ArchiveExtraction, SucceedsWithoutALogLine) {
  copiers.archives["/a.tcbk"] = {.items = {{"file", "text"}}};
  EXPECT_EQ(send("/a.tcbk", "/to"), 1U);
  EXPECT_EQ(copiers.files["/to/file"], "text");
  EXPECT_EQ(log.takeLines(), Lines{});
}

TEST_F(ArchiveExtraction, AsksForPackagesExtendedAttributesAndResourcesAndNothingElse) {
  copiers.archives["/a.tcbk"] = {};
  EXPECT_EQ(send("/a.tcbk", "/to"), 1U);
  EXPECT_EQ(copiers.copies, (std::vector<ArchiveCopyOptions>{{{"extractPKZip", true},
                                                              {"copyExtendedAttributes", true},
                                                              {"copyResources", true}}}));
}

TEST_F(ArchiveExtraction, LeavesItemsThatFailOutWithoutALogLine) {
  copiers.archives["/a.tcbk"] = {.items = {{"bad", "", EIO}, {"file", "text"}}};
  EXPECT_EQ(send("/a.tcbk", "/to"), 1U);
  EXPECT_EQ(copiers.files["/to/file"], "text");
  EXPECT_EQ(log.takeLines(), Lines{});
}

TEST_F(ArchiveExtraction, LogsAFatalErrorOnceAndAnswersFalse) {
  copiers.archives["/a.tcbk"] = {.items = {{"file", "text"}}, .damaged = true};
  EXPECT_EQ(send("/a.tcbk", "/to"), 0U);
  EXPECT_EQ(log.takeLines(),
            (Lines{{LogPriority::kError, "ArchiveCopier signaled fatal file error"}}));
}

TEST_F(ArchiveExtraction, AnswersFalseWithoutALogLineWhenTheSourceIsMissing) {
  EXPECT_EQ(send("/none", "/to"), 0U);
  EXPECT_EQ(log.takeLines(), Lines{});
}

TEST_F(ArchiveExtraction, AnswersFalseWithoutALogLineWhenThereIsNoCopier) {
  copiers.available = false;
  EXPECT_EQ(send("/a.tcbk", "/to"), 0U);
  EXPECT_EQ(log.takeLines(), Lines{});
}

TEST_F(ArchiveExtraction, FreesItsCopier) {
  copiers.archives["/a.tcbk"] = {.damaged = true};
  EXPECT_EQ(send("/a.tcbk", "/to"), 0U);
  EXPECT_EQ(copiers.copies.size(), 1U);
  EXPECT_EQ(copiers.copiersAlive, 0);
}

TEST_F(ArchiveExtraction, ReadsAFieldWithoutItsZeroAs255BytesAndChecksNoPath) {
  EXPECT_EQ(send(std::string(256, 's'), std::string("/etc/\xff/..")), 0U);
  EXPECT_EQ(copiers.source, std::string(255, 's'));
  EXPECT_EQ(copiers.destination, "/etc/\xff/..");
}

}  // namespace
