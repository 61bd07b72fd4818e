// SPDX-License-Identifier: Apache-2.0
//
// The three copy and move requests over real ports, on a file manager in memory. The user database
// of the machine that runs the tests need not know the mobile user: what the home is, is asked.
#include "Helper/Files/MobileUser.h"
#include "Tests/Fakes/FakeFileManager.h"
#include "Tests/Files/PathRefusal.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using platform::LogPriority;
using support::Bytes;
using support::Get;
using Line = fakes::FakeSystemLog::Line;
using Lines = std::vector<Line>;

constexpr std::int32_t kCopyFile = 8683564;
constexpr std::int32_t kCopyCrashLogs = 8683565;
constexpr std::int32_t kMoveCarrierBundles = 8683566;

std::string Home() {
  const char* home = GetMobileUserDirectory();
  return home ? home : "";
}

class CopyAndMove : public support::ServerFixture {
 protected:
  void SetUp() override {
    start();
    client = connect();
    files.addDirectory("/source");
    files.addFile("/source/file", "text");
    files.addDirectory("/tmp");
    (void)files.createDirectory(bundles, true, {}, nullptr);
    (void)log.takeLines();
  }
  /// Sends the texts; the success flag of a reply that is otherwise as it must be.
  std::uint32_t send(std::int32_t id, const std::vector<std::string>& texts) {
    Bytes bytes = support::Message(id, static_cast<std::uint32_t>(32 + 256 * texts.size()));
    for (std::size_t i = 0; i < texts.size(); ++i) {
      support::PutText(bytes, 32 + 256 * i, texts[i]);
    }
    const Bytes reply = request(*client, bytes).bytes;
    EXPECT_EQ(reply.size(), 40U);
    EXPECT_EQ(Get<std::int32_t>(reply, 20), id + 100);
    EXPECT_EQ(Get<std::int32_t>(reply, 32), 0) << "the return code is always 0";
    return Get<std::uint32_t>(reply, 36);
  }
  /// What was logged, the lines of a path that the allow-list lets through left out.
  Lines lines() {
    Lines kept = log.takeLines();
    std::erase_if(kept, [](const Line& line) { return line.second.starts_with("Allowing path "); });
    return kept;
  }

  /// The lines of a request that is refused: `before`, the allow-list's, the request's own.
  static Lines aroundRefusalOf(const std::string& path, Lines before) {
    const Lines refusal = files_test::RefusalOf(path);
    before.insert(before.end(), refusal.begin(), refusal.end());
    before.emplace_back(LogPriority::kError, "Destination directory " + path +
                                                 " is not within the allowed directories\n");
    return before;
  }

  const std::string bundles = Home() + "/Library/Carrier Bundles";
  const std::string crashLogs = Home() + "/Library/Logs/CrashReporter/";
  fakes::FakeFileManager files;
  platform::ScopedReplacement<platform::FileManager> replacement{files};
  std::unique_ptr<support::WireClient> client;
};

TEST_F(CopyAndMove, CopyAFileIntoANewDirectoryAmongTheCarrierBundles) {
  files.nodes["/source/file"].uid = 99;
  EXPECT_EQ(send(kCopyFile, {"/source", bundles + "/new", "file"}), 1U);
  EXPECT_EQ(lines(), (Lines{{LogPriority::kNotice, "'/source', '" + bundles + "/new', 'file'\n"}}));
  EXPECT_EQ(files.contentOf(bundles + "/new/file"), "text");
  EXPECT_EQ(files.nodes[bundles + "/new"].mode, 0040755U);
  EXPECT_EQ(files.nodes[bundles + "/new/file"].uid, GetMobileUserUID());
  EXPECT_EQ(files.nodes[bundles + "/new/file"].gid, GetMobileUserGID());
  EXPECT_EQ(files.nodes["/source/file"].uid, ::getuid());
}

TEST_F(CopyAndMove, CopyNoFileOutsideEveryAllowedPlaceAndTouchNothing) {
  files.nodes["/source/file"].uid = 99;
  const auto before = files.nodes.size();
  EXPECT_EQ(send(kCopyFile, {"/source", "/etc", "file"}), 0U);
  EXPECT_EQ(lines(),
            aroundRefusalOf("/etc/file", {{LogPriority::kNotice, "'/source', '/etc', 'file'\n"}}));
  EXPECT_EQ(files.nodes.size(), before);
  EXPECT_EQ(files.nodes["/source/file"].uid, 99U) << "nor is the source given away";
}

TEST_F(CopyAndMove, NameTheTwoDirectoriesWhenTheFileDoesNotExist) {
  EXPECT_EQ(send(kCopyFile, {"/source", bundles, "none"}), 0U);
  EXPECT_EQ(lines(),
            (Lines{{LogPriority::kNotice, "'/source', '" + bundles + "', 'none'\n"},
                   {LogPriority::kError, "Failed to copy the file /source to " + bundles + "\n"}}));
}

TEST_F(CopyAndMove, FailToCopyAFileWhoseDirectoryCannotBeMade) {
  files.failAt(bundles + "/new", 71);
  EXPECT_EQ(send(kCopyFile, {"/source", bundles + "/new", "file"}), 0U);
  EXPECT_EQ(lines().back(), (Line{LogPriority::kError,
                                  "Failed to copy the file /source to " + bundles + "/new\n"}));
}

TEST_F(CopyAndMove, KeepTheCopyButFailWithoutALineWhenTheOwnerCannotBeChanged) {
  // The fault is for the path: the copy ends elsewhere, in the directory of that name.
  files.addDirectory(bundles + "/file");
  files.failAt(bundles + "/file", 71);
  EXPECT_EQ(send(kCopyFile, {"/source", bundles, "file"}), 0U);
  EXPECT_EQ(lines(), (Lines{{LogPriority::kNotice, "'/source', '" + bundles + "', 'file'\n"}}));
  EXPECT_EQ(files.contentOf(bundles + "/file/file"), "text");
}

TEST_F(CopyAndMove, GiveTheDirectoryToTheMobileUserWhenTheFileLandsInIt) {
  files.addDirectory(bundles + "/file");
  files.nodes[bundles + "/file"].uid = 99;
  files.nodes["/source/file"].uid = 98;
  EXPECT_EQ(send(kCopyFile, {"/source", bundles, "file"}), 1U);
  EXPECT_EQ(files.nodes[bundles + "/file"].uid, GetMobileUserUID());
  EXPECT_EQ(files.contentOf(bundles + "/file/file"), "text");
}

TEST_F(CopyAndMove, GiveWhatALinkPointsToToTheMobileUser) {
  files.addFile("/elsewhere", "text");
  files.nodes["/elsewhere"].uid = 99;
  files.addLink("/source/link", "/elsewhere");
  EXPECT_EQ(send(kCopyFile, {"/source", bundles, "link"}), 1U);
  EXPECT_EQ(files.nodes["/elsewhere"].uid, GetMobileUserUID());
}

TEST_F(CopyAndMove, FailToCopyALinkToNothing) {
  files.addLink("/source/link", "/elsewhere");
  EXPECT_EQ(send(kCopyFile, {"/source", bundles, "link"}), 0U);
  EXPECT_EQ(lines().back(),
            (Line{LogPriority::kError, "Failed to copy the file /source to " + bundles + "\n"}));
  EXPECT_FALSE(files.nodes.contains(bundles + "/link"));
}

TEST_F(CopyAndMove, ReadAFieldWithoutItsZeroAs255Bytes) {
  const std::string name(256, 'n');
  EXPECT_EQ(send(kCopyFile, {"/source", "/etc", name}), 0U);
  EXPECT_EQ(lines().front(),
            (Line{LogPriority::kNotice, "'/source', '/etc', '" + std::string(255, 'n') + "'\n"}));
}

TEST_F(CopyAndMove, CopyCrashLogsToTheMobileUsersOwn) {
  (void)files.createDirectory(crashLogs, true, {}, nullptr);
  EXPECT_EQ(send(kCopyCrashLogs, {"/source"}), 1U);
  EXPECT_EQ(lines(), (Lines{{LogPriority::kNotice, "'/source', '" + crashLogs + "'\n"}}));
  EXPECT_EQ(files.contentOf(crashLogs + "source/file"), "text");
}

TEST_F(CopyAndMove, LogMinus1AtNoticeWhenTheCrashLogsDoNotExist) {
  EXPECT_EQ(send(kCopyCrashLogs, {"/none"}), 0U);
  EXPECT_EQ(lines(), (Lines{{LogPriority::kNotice, "'/none', '" + crashLogs + "'\n"},
                            {LogPriority::kNotice, "Failed to copy the directory /none to " +
                                                       crashLogs + ". Error: -1\n"}}));
}

TEST_F(CopyAndMove, MoveABundleToTmpUnderTheWildcardRule) {
  EXPECT_EQ(send(kMoveCarrierBundles, {"/source", "/tmp", "x.tcbk"}), 1U);
  Lines expected{{LogPriority::kNotice, "'/source', '/tmp'\n"},
                 {LogPriority::kNotice, "'/source', '/tmp', 'x.tcbk'\n"}};
  const Lines refusal = files_test::RefusalOf("/tmp/x.tcbk");  // written before the rule is tried
  expected.insert(expected.end(), refusal.begin(), refusal.end());
  EXPECT_EQ(lines(), expected);
  EXPECT_EQ(files.contentOf("/tmp/x.tcbk/file"), "text");
  EXPECT_FALSE(files.nodes.contains("/source"));
}

TEST_F(CopyAndMove, MakeTheDirectoryOfABundleThatIsThenRefused) {
  EXPECT_EQ(send(kMoveCarrierBundles, {"/source", "/srv/new", "x"}), 0U);
  EXPECT_EQ(lines(), aroundRefusalOf("/srv/new/x",
                                     {{LogPriority::kNotice, "'/source', '/srv/new'\n"},
                                      {LogPriority::kNotice, "'/source', '/srv/new', 'x'\n"}}));
  EXPECT_EQ(files.nodes["/srv/new"].mode, 0040755U);
  EXPECT_TRUE(files.nodes.contains("/source"));
}

TEST_F(CopyAndMove, LogTwoBlanksWhenTheDirectoryOfABundleCannotBeMade) {
  files.failAt("/srv", 71);
  EXPECT_EQ(send(kMoveCarrierBundles, {"/source", "/srv", "x"}), 0U);
  EXPECT_EQ(
      lines(),
      (Lines{{LogPriority::kNotice, "'/source', '/srv'\n"},
             {LogPriority::kNotice, "Failed to create CarrierBundles Dir  to /srv. Error: 71\n"}}));
}

TEST_F(CopyAndMove, NameTheDirectoryNotTheBundleWhenAMoveFails) {
  EXPECT_EQ(send(kMoveCarrierBundles, {"/none", "/tmp", "x.tcbk"}), 0U);
  EXPECT_EQ(lines().back(),
            (Line{LogPriority::kError, "Failed to move the directory /none to /tmp. Error: -1\n"}));
  files.addDirectory("/tmp/x.tcbk");
  EXPECT_EQ(send(kMoveCarrierBundles, {"/source", "/tmp", "x.tcbk"}), 0U);
  EXPECT_EQ(lines().back(), (Line{LogPriority::kError,
                                  "Failed to move the directory /source to /tmp. Error: 17\n"}));
}

TEST_F(CopyAndMove, KeepADoubledSlash) {
  EXPECT_EQ(send(kCopyFile, {"/source", "/etc/", "file"}), 0U);
  EXPECT_EQ(lines().back(),
            (Line{LogPriority::kError,
                  "Destination directory /etc//file is not within the allowed directories\n"}));
}

}  // namespace
