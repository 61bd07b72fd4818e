// SPDX-License-Identifier: Apache-2.0
//
// The file utility layer on a file manager in memory: every code, every rule of merging.
#include "Helper/Files/FileUtilities.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include "Tests/Fakes/FakeFileManager.h"

namespace {

constexpr std::uint32_t kUid = 501;
constexpr std::uint32_t kGid = 502;

/// Fails to copy the item with this subpath, and does all else.
class FailsAtOne final : public platform::FileManager {
 public:
  FailsAtOne(fakes::FakeFileManager& real, std::string subpath)
      : real_(real), subpath_(std::move(subpath)) {}
  platform::FileKind kind(const platform::FilePlace& place) override { return real_.kind(place); }
  std::optional<std::uint32_t> mode(const std::string& path) override { return real_.mode(path); }
  std::vector<std::string> subpaths(const std::string& path) override {
    return real_.subpaths(path);
  }
  bool createDirectory(const platform::FilePlace& place, bool intermediates,
                       const platform::FileAttributes& attributes,
                       platform::FileError* error) override {
    return real_.createDirectory(place, intermediates, attributes, error);
  }
  bool copyItem(const platform::FilePlace& source, const platform::FilePlace& destination,
                platform::FileError* error) override {
    if (destination.subpath == subpath_) return false;
    return real_.copyItem(source, destination, error);
  }
  bool moveItem(const platform::FilePlace& source, const platform::FilePlace& destination,
                platform::FileError* error) override {
    return real_.moveItem(source, destination, error);
  }
  bool removeItem(const platform::FilePlace& place, platform::FileError* error) override {
    return real_.removeItem(place, error);
  }
  bool removeEmptyDirectory(const std::string& path) override {
    return real_.removeEmptyDirectory(path);
  }
  bool setAttributes(const platform::FileAttributes& attributes, const platform::FilePlace& place,
                     platform::FileError* error) override {
    return real_.setAttributes(attributes, place, error);
  }
  bool changeOwner(const std::string& path, std::uint32_t uid, std::uint32_t gid) override {
    return real_.changeOwner(path, uid, gid);
  }

 private:
  fakes::FakeFileManager& real_;
  const std::string subpath_;
};

class FileUtilities : public ::testing::Test {
 protected:
  FileUtilities() {
    files.addDirectory("/from");
    files.addDirectory("/to");
  }
  std::int32_t copy(const std::string& from, const std::string& to) {
    return CopyOrMoveItem(from.c_str(), to.c_str(), kUid, kGid, /*copy=*/true);
  }
  std::int32_t move(const std::string& from, const std::string& to) {
    return CopyOrMoveItem(from.c_str(), to.c_str(), kUid, kGid, /*copy=*/false);
  }
  [[nodiscard]] bool exists(const std::string& path) const { return files.nodes.contains(path); }

  fakes::FakeFileManager files;
  platform::ScopedReplacement<platform::FileManager> replacement{files};
};

TEST_F(FileUtilities, FindNothingAtAPathThatIsNotUtf8) {
  files.addFile("/from/\xff", "x");
  EXPECT_FALSE(FileExists("/from/\xff"));
  EXPECT_TRUE(FileExists("/from"));
  EXPECT_FALSE(FileExists("/none"));
  EXPECT_FALSE(FileExists(""));
}

TEST_F(FileUtilities, CreateADirectoryWithEmptyNamesWithOnlyItsPermissions) {
  EXPECT_EQ(CreateDirectoryWithAttributes("/a/b", 0755, "", "", true), 0);
  EXPECT_EQ(files.nodes["/a/b"].mode, 0040755U);
  EXPECT_EQ(files.nodes["/a/b"].uid, 0U);
  EXPECT_EQ(files.nodes["/a/b"].gid, 0U);
}

TEST_F(FileUtilities, CreateADirectoryForANamedOwnerAndGroup) {
  EXPECT_EQ(CreateDirectoryWithAttributes("/a", 0700, "daemon", "", false), 0);
  EXPECT_EQ(files.nodes["/a"].uid, 1U);
  EXPECT_EQ(CreateDirectoryWithAttributes("/b", 0700, "", "daemon", false), 0);
  EXPECT_EQ(files.nodes["/b"].gid, 1U);
}

TEST_F(FileUtilities, AnswerTheCodeOfACreationThatFails) {
  EXPECT_EQ(CreateDirectory("/none/a", 0755, false), ENOENT);
  EXPECT_EQ(CreateDirectory("/to", 0755, false), EEXIST);
  EXPECT_EQ(CreateDirectory("/to", 0755, true), 0);
}

TEST_F(FileUtilities, Answer0ToACreationThatFailsWithoutAnErrorObject) {
  files.failAt("/a", std::nullopt);
  EXPECT_EQ(CreateDirectory("/a", 0755, true), 0);
  EXPECT_FALSE(exists("/a"));
  EXPECT_EQ(CreateDirectory("/\xff", 0755, true), 0);
}

TEST_F(FileUtilities, Answer5ToAttributesForAMissingPath) {
  EXPECT_EQ(SetAttributesRecursively("/none", {}), 5);
}

TEST_F(FileUtilities, RemoveNothingForASourceWhoseNameCannotBeDecoded) {
  files.addFile("/\xff", "new");
  files.addFile("/to/\xff", "old");
  EXPECT_EQ(CopyDirectory("/\xff", "/to"), 0) << "what a merge achieves is not reported";
  EXPECT_EQ(files.contentOf("/to/\xff"), "old");
}

TEST_F(FileUtilities, SetAttributesOnATreeAndItsTop) {
  files.addDirectory("/from/sub");
  files.addFile("/from/sub/file", "x");
  EXPECT_EQ(SetItemOwner("/from", kUid, kGid, true), 0);
  for (const char* path : {"/from", "/from/sub", "/from/sub/file"}) {
    EXPECT_EQ(files.nodes[path].uid, kUid) << path;
    EXPECT_EQ(files.nodes[path].gid, kGid) << path;
  }
  EXPECT_EQ(files.nodes["/to"].uid, 0U);
}

TEST_F(FileUtilities, SetAttributesOnASingleFileWithItsErrorOrWithoutOne) {
  files.addFile("/from/file", "x");
  EXPECT_EQ(SetItemOwner("/from/file", kUid, kGid, true), 0);
  EXPECT_EQ(files.nodes["/from/file"].uid, kUid);
  files.failAt("/from/file", 77);
  EXPECT_EQ(SetItemOwner("/from/file", kUid, kGid, true), 77);
  files.failAt("/from/file", std::nullopt);
  EXPECT_EQ(SetItemOwner("/from/file", kUid, kGid, true), 0);
}

TEST_F(FileUtilities, AnswerTheLastFailingItemsCodeWhenTheTopSucceeds) {
  for (const char* path : {"/from/a", "/from/b", "/from/c"}) files.addFile(path, "x");
  files.failAt("/from/a", 71);
  files.failAt("/from/b", 72);
  EXPECT_EQ(SetItemOwner("/from", kUid, kGid, true), 72);
  EXPECT_EQ(files.nodes["/from/c"].uid, kUid) << "the walk goes on";
  EXPECT_EQ(files.nodes["/from"].uid, kUid);
}

TEST_F(FileUtilities, NeverClearTheErrorSlotOfAWalk) {
  for (const char* path : {"/from/a", "/from/b"}) files.addFile(path, "x");
  files.failAt("/from/a", 71);
  files.failAt("/from", std::nullopt);
  EXPECT_EQ(SetItemOwner("/from", kUid, kGid, true), 71) << "the top has no error of its own";
  files.faults.erase("/from/a");
  EXPECT_EQ(SetItemOwner("/from", kUid, kGid, true), 0) << "and the slot is empty";
  files.failAt("/from", 73);
  files.failAt("/from/b", 72);
  EXPECT_EQ(SetItemOwner("/from", kUid, kGid, true), 73) << "the top's error wins";
}

TEST_F(FileUtilities, AnswerToAPlainChangeOfOwnerWhatChownAnswers) {
  files.addFile("/from/file", "x");
  EXPECT_EQ(SetItemOwner("/from", kUid, kGid, false), 0);
  EXPECT_EQ(files.nodes["/from"].uid, kUid);
  EXPECT_EQ(files.nodes["/from/file"].uid, 0U);
  EXPECT_EQ(SetItemOwner("/none", kUid, kGid, false), -1);
}

TEST_F(FileUtilities, AnswerMinus1ToACopyOfAMissingSource) {
  EXPECT_EQ(copy("/none", "/to/copy"), -1);
  EXPECT_EQ(move("/none", "/to/copy"), -1);
  EXPECT_EQ(CopyDirectory("/none", "/to/copy"), -1);
  EXPECT_EQ(MoveItemWithOwner("/none", "/to/copy"), -1);
}

TEST_F(FileUtilities, GiveTheSourceItselfToTheOwnerBeforeCopyingToAFreePlace) {
  files.addFile("/from/file", "x");
  EXPECT_EQ(copy("/from", "/to/copy"), 0);
  EXPECT_EQ(files.nodes["/from"].uid, kUid);
  EXPECT_EQ(files.nodes["/from"].gid, kGid);
  EXPECT_EQ(files.nodes["/from/file"].uid, 0U) << "not what is in it";
  EXPECT_EQ(files.contentOf("/to/copy/file"), "x");
  EXPECT_EQ(files.nodes["/to/copy"].uid, kUid) << "so that the copy has the owner too";
  files.nodes["/from"].uid = 0;
  EXPECT_EQ(move("/from", "/to/moved"), 0);
  EXPECT_EQ(files.nodes["/to/moved"].uid, kUid);
}

TEST_F(FileUtilities, AnswerTheCodeOr5WhenTheCopyToAFreePlaceFails) {
  files.failAt("/to/copy", 71);
  EXPECT_EQ(copy("/from", "/to/copy"), 71);
  EXPECT_EQ(move("/from", "/to/copy"), 71);
  files.failAt("/to/copy", std::nullopt);
  EXPECT_EQ(copy("/from", "/to/copy"), 5);
  EXPECT_EQ(move("/from", "/to/copy"), 5);
  EXPECT_EQ(copy("/from", "/to/\xff"), 5) << "a path that is not UTF-8";
}

TEST_F(FileUtilities, Answer17ToADirectoryOntoAFileAndChangeNothing) {
  files.addFile("/to/file", "old");
  EXPECT_EQ(copy("/from", "/to/file"), 17);
  EXPECT_EQ(move("/from", "/to/file"), 17);
  EXPECT_EQ(files.contentOf("/to/file"), "old");
  EXPECT_TRUE(exists("/from"));
  EXPECT_EQ(files.nodes["/from"].uid, 0U) << "not even the source's owner";
}

TEST_F(FileUtilities, TakeEveryModeWithTheDirectoryBitForADirectory) {
  files.addFile("/to/file", "old");
  files.addSpecial("/from/socket", 0140000);
  files.addSpecial("/from/block", 0060000);
  EXPECT_EQ(copy("/from/socket", "/to/file"), 17);
  EXPECT_EQ(copy("/from/block", "/to/file"), 17);
  files.addSpecial("/from/fifo", 0010000);
  EXPECT_EQ(copy("/from/fifo", "/to/file"), 0) << "the replaced file is gone, the FIFO not copied";
  EXPECT_FALSE(exists("/to/file"));
}

TEST_F(FileUtilities, ReplaceAFileByAFile) {
  files.addFile("/from/file", "new");
  files.addFile("/to/file", "old");
  EXPECT_EQ(copy("/from/file", "/to/file"), 0);
  EXPECT_EQ(files.contentOf("/to/file"), "new");
  files.addFile("/to/file", "old");
  EXPECT_EQ(move("/from/file", "/to/file"), 0);
  EXPECT_EQ(files.contentOf("/to/file"), "new");
  EXPECT_FALSE(exists("/from/file"));
}

TEST_F(FileUtilities, PlaceAFileInAnExistingDirectoryUnderItsBaseNameReplacingAFile) {
  files.addFile("/from/file", "new");
  EXPECT_EQ(copy("/from/file", "/to"), 0);
  EXPECT_EQ(files.contentOf("/to/file"), "new");
  files.addFile("/to/file", "old");
  EXPECT_EQ(copy("/from/file", "/to"), 0);
  EXPECT_EQ(files.contentOf("/to/file"), "new");
  EXPECT_EQ(files.nodes["/from/file"].uid, kUid);
}

TEST_F(FileUtilities, Answer0WhenADirectoryHasTheFilesNameInTheDestination) {
  files.addFile("/from/file", "new");
  files.addDirectory("/to/file");
  EXPECT_EQ(copy("/from/file", "/to"), 0) << "whatever the merge achieved";
  EXPECT_TRUE(files.subpaths("/to/file").empty());
}

TEST_F(FileUtilities, PlaceADirectoryInAnExistingOneAsASubdirectory) {
  files.addFile("/from/file", "x");
  EXPECT_EQ(copy("/from/", "/to/"), 0) << "a trailing slash is no name";
  EXPECT_EQ(files.contentOf("/to/from/file"), "x");
}

TEST_F(FileUtilities, RemoveAFileThatStandsWhereADirectoryGoesInsideTheDestination) {
  files.addFile("/from/file", "x");
  files.addFile("/to/from", "in the way");
  EXPECT_EQ(copy("/from", "/to"), 0);
  EXPECT_EQ(files.contentOf("/to/from/file"), "x");
}

TEST_F(FileUtilities, MergeADirectoryIntoOneOfItsName) {
  files.addFile("/from/same", "new");
  files.addFile("/from/own", "own");
  files.addDirectory("/from/sub");
  files.addFile("/from/sub/deep", "deep");
  files.addFile("/from/clash", "file onto a directory");
  files.addDirectory("/to/from");
  files.addFile("/to/from/same", "old");
  files.addFile("/to/from/kept", "kept");
  files.addDirectory("/to/from/sub");
  files.addDirectory("/to/from/clash");
  files.addDirectory("/from/held");
  files.addFile("/from/held/deep", "deep");
  files.addFile("/to/from/held", "file under a directory");
  EXPECT_EQ(copy("/from", "/to"), 0) << "even if single items failed";
  EXPECT_EQ(files.contentOf("/to/from/same"), "new");
  EXPECT_EQ(files.contentOf("/to/from/own"), "own");
  EXPECT_EQ(files.contentOf("/to/from/kept"), "kept");
  EXPECT_EQ(files.contentOf("/to/from/sub/deep"), "deep");
  EXPECT_TRUE(files.subpaths("/to/from/clash").empty());
  EXPECT_EQ(files.contentOf("/to/from/held"), "file under a directory");
  EXPECT_EQ(files.contentOf("/from/same"), "new") << "the source of a copy stays";
}

TEST_F(FileUtilities, RemoveADirectoryThatAMergeHasEmptied) {
  files.addFile("/from/same", "new");
  files.addDirectory("/to/from");
  files.addFile("/to/from/same", "old");
  EXPECT_EQ(move("/from", "/to"), 0);
  EXPECT_EQ(files.contentOf("/to/from/same"), "new");
  EXPECT_FALSE(exists("/from"));
}

TEST_F(FileUtilities, KeepTheSourceOfAMoveThatCouldNotMoveEverything) {
  files.addFile("/from/clash", "x");
  files.addFile("/from/other", "y");
  files.addDirectory("/to/from");
  files.addDirectory("/to/from/clash");
  EXPECT_EQ(move("/from", "/to"), 0);
  EXPECT_EQ(files.contentOf("/from/clash"), "x");
  EXPECT_EQ(files.contentOf("/to/from/other"), "y");
}

TEST_F(FileUtilities, RemoveAnEmptySourceDirectoryThatAMergeWasToCopy) {
  files.addDirectory("/to/from");
  EXPECT_EQ(copy("/from", "/to"), 0);
  EXPECT_FALSE(exists("/from"));
  EXPECT_TRUE(exists("/to/from"));
}

TEST_F(FileUtilities, MakeTheParentOfAnItemWhoseDirectoryCouldNotBeCopied) {
  files.addDirectory("/from/sub");
  files.addFile("/from/sub/file", "x");
  files.addDirectory("/to/from");
  // The directory itself fails to copy as a whole, and is then made for what is in it.
  FailsAtOne failing(files, "sub");
  MergeItem(failing, "/from", "/to/from", /*copy=*/true);
  EXPECT_EQ(files.contentOf("/to/from/sub/file"), "x");
  EXPECT_EQ(files.nodes["/to/from/sub"].mode, 0040755U) << "no permissions of its own";
}

TEST_F(FileUtilities, TakeABaseNameFrom1024BytesOfAPath) {
  const std::string source = "/" + std::string(1100, 's');
  files.addFile(source, "x");
  EXPECT_EQ(copy(source, "/to"), 0);
  EXPECT_EQ(files.contentOf("/to/" + std::string(1023, 's')), "x");
}

TEST_F(FileUtilities, TakeTheParentOfAnItemFrom1024BytesOfItsPath) {
  const std::string outer(500, 'a');
  const std::string inner = outer + '/' + std::string(600, 'b');
  files.addDirectory("/from/" + outer);
  files.addDirectory("/from/" + inner);
  files.addFile("/from/" + inner + "/file", "x");
  files.addDirectory("/to/from");
  FailsAtOne failing(files, outer);
  MergeItem(failing, "/from", "/to/from", /*copy=*/true);
  EXPECT_TRUE(exists("/to/from/" + outer)) << "the parent as far as the bytes go";
  EXPECT_EQ(files.contentOf("/to/from/" + inner + "/file"), "x") << "copied with its directory";
  files.nodes.erase("/to/from/" + inner + "/file");
  files.nodes.erase("/to/from/" + inner);
  FailsAtOne failingDeeper(files, inner);
  MergeItem(failingDeeper, "/from", "/to/from", /*copy=*/true);
  EXPECT_FALSE(exists("/to/from/" + inner)) << "its parent lies behind the 1024th byte";
}

TEST_F(FileUtilities, CopyADirectoryAsTheProcessesOwn) {
  files.nodes["/from"].uid = 99;
  EXPECT_EQ(CopyDirectory("/from", "/to/copy"), 0);
  EXPECT_EQ(files.nodes["/from"].uid, ::getuid());
  EXPECT_EQ(files.nodes["/from"].gid, ::getgid());
}

TEST_F(FileUtilities, CopyAFileIntoADirectoryThatIsMadeForIt) {
  files.addFile("/from/file", "x");
  EXPECT_EQ(CopyFileIntoDirectory("/from", "/to/a/b", "file"), 0);
  EXPECT_EQ(files.contentOf("/to/a/b/file"), "x");
  EXPECT_EQ(files.nodes["/to/a/b"].mode, 0040755U);
  EXPECT_EQ(CopyFileIntoDirectory("/from", "/to", "none"), -1);
}

TEST_F(FileUtilities, AnswerMinus1WhenTheDirectoryForAFileCannotBeMade) {
  files.addFile("/from/file", "x");
  files.failAt("/to/a", 71);
  EXPECT_EQ(CopyFileIntoDirectory("/from", "/to/a", "file"), -1);
  files.addFile("/to/plain", "x");
  EXPECT_EQ(CopyFileIntoDirectory("/from", "/to/plain/a", "file"), -1);
}

TEST_F(FileUtilities, MoveATreeThatHasBecomeTheProcessesOwn) {
  files.addFile("/from/file", "x");
  files.nodes["/from/file"].uid = 99;
  EXPECT_EQ(MoveItemWithOwner("/from", "/to/moved"), 0);
  EXPECT_EQ(files.nodes["/to/moved/file"].uid, ::getuid());
  EXPECT_FALSE(exists("/from"));
}

TEST_F(FileUtilities, MoveNothingOntoWhatIsThere) {
  files.addFile("/from/file", "x");
  EXPECT_EQ(MoveItemWithOwner("/from", "/to"), EEXIST);
  EXPECT_EQ(files.contentOf("/from/file"), "x");
  files.failAt("/to/moved", std::nullopt);
  EXPECT_EQ(MoveItemWithOwner("/from", "/to/moved"), 5);
  files.failAt("/to/moved", 71);
  EXPECT_EQ(MoveItemWithOwner("/from", "/to/moved"), 71);
}

TEST_F(FileUtilities, MoveATreeWhoseOwnersCannotBeChanged) {
  files.addFile("/from/file", "x");
  files.failAt("/from/file", 71);
  EXPECT_EQ(MoveItemWithOwner("/from", "/to/moved"), 0);
}

}  // namespace
