// SPDX-License-Identifier: Apache-2.0
//
// Names of archive items as paths, and the writer that puts items below a folder.
#include <gtest/gtest.h>
#include <sys/xattr.h>

#include <cerrno>

#include "Helper/Platform/Linux/ArchiveWriter.h"
#include "Helper/Platform/Linux/SideCarFolding.h"
#include "Tests/Files/FolderForTest.h"

namespace {

using platform::ArchiveItemPath;
using platform::ArchiveItemStatus;
using platform::IsSideCarPath;

TEST(ArchiveItemPath, IsTheNameWithoutWhatChangesNothing) {
  for (const auto& [name, expected] :
       std::vector<std::pair<const char*, const char*>>{{"a", "a"},
                                                        {"a/b", "a/b"},
                                                        {"a/", "a"},
                                                        {"./a//b/./c/", "a/b/c"},
                                                        {"...", "..."},
                                                        {"..a/b..", "..a/b.."},
                                                        {"a\\..\\b", "a\\..\\b"},
                                                        {"\xff", "\xff"},
                                                        {"./", ""},
                                                        {"", ""}}) {
    std::string path = "before";
    EXPECT_EQ(ArchiveItemPath(name, path), 0) << name;
    EXPECT_EQ(path, expected) << name;
  }
}

TEST(ArchiveItemPath, IsRefusedWhereItWouldLeadOut) {
  for (const char* name :
       {"/", "/etc/passwd", "//a", "..", "../a", "a/..", "a/../b", "a/../../b"}) {
    std::string path;
    EXPECT_EQ(ArchiveItemPath(name, path), EINVAL) << name;
  }
}

TEST(SideCarPath, IsANameBehindADotAndALine) {
  EXPECT_TRUE(IsSideCarPath("._a"));
  EXPECT_TRUE(IsSideCarPath("b/._a"));
  EXPECT_TRUE(IsSideCarPath("._..."));
  for (const char* path : {"", "a", "._", "._.", "._..", "b/._.", "._a/b", "a._b"}) {
    EXPECT_FALSE(IsSideCarPath(path)) << path;
  }
}

class ArchiveWriter : public testing::Test {
 protected:
  int file(const std::string& path, const std::string& text, const ArchiveItemStatus& status = {}) {
    platform::NewFile file;
    if (const int error = writer.beginFile(path, status, file)) return error;
    EXPECT_EQ(platform::ArchiveWriter::write(file, std::as_bytes(std::span(text)), 0), 0);
    return writer.finishFile(file, path, status);
  }
  files_test::FolderForTest folder;
  platform::ArchiveWriter writer{
      platform::FileDescriptor(::open(folder.at("").c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC))};
};

TEST_F(ArchiveWriter, LetsNobodyElseIntoAFolderBeforeItIsFinished) {
  EXPECT_EQ(writer.makeFolder("named", {.permissions = 0750}), 0);
  EXPECT_EQ(file("implied/file", "text"), 0);
  for (const char* name : {"named", "implied"}) EXPECT_EQ(folder.permissions(name), 0700U);
  writer.finishFolders();
  EXPECT_EQ(folder.permissions("named"), 0750U);
  EXPECT_EQ(folder.permissions("implied"), 0755U);
}

TEST_F(ArchiveWriter, GivesAFolderItsStatusAlsoWhenItIsNamedAfterWhatIsInIt) {
  EXPECT_EQ(file("sub/file", "text"), 0);
  EXPECT_EQ(writer.makeFolder("sub", {.permissions = 0710, .modified = {1000, 0}}), 0);
  EXPECT_EQ(file("sub/later", "text"), 0);
  writer.finishFolders();
  EXPECT_EQ(folder.permissions("sub"), 0710U);
  EXPECT_EQ(folder.status("sub").st_mtim.tv_sec, 1000);
  EXPECT_EQ(writer.foldersMade(), 0U);
}

TEST_F(ArchiveWriter, ChangesNothingOfAFolderThatWasThere) {
  folder.folder("there");
  EXPECT_EQ(writer.makeFolder("there", {.permissions = 0700}), 0);
  EXPECT_EQ(writer.makeFolder("", {.permissions = 0777}), 0);
  EXPECT_EQ(writer.foldersMade(), 0U);
  writer.finishFolders();
  EXPECT_EQ(folder.permissions("there"), 0755U);
}

TEST_F(ArchiveWriter, CountsEveryFolderThatItMakes) {
  EXPECT_EQ(file("a/b/c/file", "text"), 0);
  EXPECT_EQ(writer.makeFolder("a/b", {}), 0);
  EXPECT_EQ(writer.foldersMade(), 3U);
}

TEST_F(ArchiveWriter, PutsItemsInThePlaceOfFilesAndLinksButNotOfDirectories) {
  folder.file("outside", "theirs");
  folder.folder("folder");
  for (const char* name : {"a", "b", "c"}) folder.link(name, "outside");
  EXPECT_EQ(file("a", "text"), 0);
  EXPECT_EQ(writer.makeLink("b", "elsewhere", {}), 0);
  EXPECT_EQ(writer.makeFolder("c", {}), 0);
  EXPECT_EQ(file("folder", "text"), EISDIR);
  EXPECT_EQ(writer.makeLink("folder", "elsewhere", {}), EISDIR);
  EXPECT_EQ(file("", "text"), EISDIR);
  EXPECT_EQ(writer.makeLink("", "elsewhere", {}), EISDIR);
  EXPECT_EQ(folder.text("a"), "text");
  EXPECT_EQ(std::filesystem::read_symlink(folder.at("b")), "elsewhere");
  EXPECT_TRUE(S_ISDIR(folder.status("c").st_mode));
  EXPECT_EQ(folder.text("outside"), "theirs");
}

TEST_F(ArchiveWriter, FollowsNoLinkAboveAnItem) {
  folder.folder("outside");
  folder.link("link", "outside");
  folder.file("file", "text");
  EXPECT_EQ(file("link/a", "text"), ELOOP);
  EXPECT_EQ(file("link/sub/a", "text"), ELOOP);
  EXPECT_EQ(writer.makeFolder("link/sub", {}), ELOOP);
  EXPECT_EQ(file("file/a", "text"), ENOTDIR);
  EXPECT_TRUE(std::filesystem::is_empty(folder.at("outside")));
}

TEST_F(ArchiveWriter, DoesNotGoBackIntoAFolderThatBecameALink) {
  EXPECT_EQ(file("sub/a", "text"), 0);
  EXPECT_EQ(file("b", "text"), 0);
  folder.folder("outside");
  std::filesystem::remove_all(folder.at("sub"));
  folder.link("sub", "outside");
  EXPECT_EQ(file("sub/c", "text"), ELOOP);
  ::chmod(folder.at("outside").c_str(), 0700);
  writer.finishFolders();
  EXPECT_EQ(folder.permissions("outside"), 0700U);
}

TEST_F(ArchiveWriter, GivesWhatHasNoPermissionsTheUsualOnes) {
  EXPECT_EQ(file("file", "text"), 0);
  EXPECT_EQ(file("all", "text", {.permissions = 07777}), 0);
  EXPECT_EQ(folder.permissions("file"), 0644U);
  EXPECT_EQ(folder.permissions("all"), 0777U);
}

TEST_F(ArchiveWriter, RemovesAFileWithTheFoldersThatItMadeForIt) {
  folder.folder("there");
  EXPECT_EQ(file("there/a/b/file", "text"), 0);
  EXPECT_EQ(file("there/c/file", "text"), 0);
  EXPECT_EQ(file("there/c/other", "text"), 0);
  writer.removeFile("there/a/b/file");
  writer.removeFile("there/c/file");
  writer.removeFile("there/none");
  EXPECT_EQ(folder.status("there/a").st_mode, 0U);
  EXPECT_EQ(folder.text("there/c/other"), "text");
  EXPECT_EQ(file("there/a/again", "text"), 0) << "a removed folder is made again";
}

}  // namespace
