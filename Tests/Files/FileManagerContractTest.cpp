// SPDX-License-Identifier: Apache-2.0
//
// What every file manager keeps to, run on the one in memory and on the one on system calls.
#include <gtest/gtest.h>

#include <algorithm>

#include "Tests/Fakes/FakeFileManager.h"
#include "Tests/Files/FolderForTest.h"

namespace {

using platform::FileError;
using platform::FileKind;
using platform::FileManager;

class MemoryFiles {
 public:
  MemoryFiles() { fake.addDirectory("/top"); }
  FileManager& manager() { return fake; }
  std::string at(const std::string& name) { return "/top/" + name; }
  void file(const std::string& name, const std::string& text) { fake.addFile(at(name), text); }
  void folder(const std::string& name) { fake.addDirectory(at(name)); }
  void link(const std::string& name, const std::string& target) { fake.addLink(at(name), target); }
  void fifo(const std::string& name) { fake.addSpecial(at(name), 0010000); }
  std::string text(const std::string& name) { return fake.contentOf(at(name)); }
  std::uint32_t permissions(const std::string& name) { return fake.nodes[at(name)].mode & 07777; }

 private:
  fakes::FakeFileManager fake;
};

class RealFiles : public files_test::FolderForTest {
 public:
  FileManager& manager() { return platform::DefaultProvider<FileManager>(); }
};

template <class Files>
class FileManagerContract : public testing::Test {
 protected:
  FileManager& manager() { return files.manager(); }
  FileKind kind(const std::string& name) { return manager().kind(files.at(name)); }
  FileError copy(const std::string& from, const std::string& to) {
    FileError error;
    const bool done = manager().copyItem(files.at(from), files.at(to), &error);
    EXPECT_EQ(done, !error.has_value());
    return error;
  }
  FileError move(const std::string& from, const std::string& to) {
    FileError error;
    const bool done = manager().moveItem(files.at(from), files.at(to), &error);
    EXPECT_EQ(done, !error.has_value());
    return error;
  }
  std::vector<std::string> below(const std::string& name) {
    std::vector<std::string> names = manager().subpaths(files.at(name));
    std::sort(names.begin(), names.end());
    return names;
  }
  Files files;
};

class FilesNames {
 public:
  template <class Files>
  static std::string GetName(int) {
    return std::is_same_v<Files, MemoryFiles> ? "Memory" : "System";
  }
};
using Implementations = testing::Types<MemoryFiles, RealFiles>;
TYPED_TEST_SUITE(FileManagerContract, Implementations, FilesNames);

TYPED_TEST(FileManagerContract, TellsDirectoriesFromFilesAndFromNothing) {
  this->files.file("file", "x");
  this->files.folder("folder");
  EXPECT_EQ(this->kind("file"), FileKind::kOther);
  EXPECT_EQ(this->kind("folder"), FileKind::kDirectory);
  EXPECT_EQ(this->kind("folder/"), FileKind::kDirectory);
  EXPECT_EQ(this->kind("file//"), FileKind::kOther) << "a slash demands no directory";
  EXPECT_EQ(this->manager().kind("/"), FileKind::kDirectory);
  EXPECT_EQ(this->kind("none"), FileKind::kAbsent);
  EXPECT_EQ(this->kind("none/none"), FileKind::kAbsent);
}

TYPED_TEST(FileManagerContract, FollowsALinkToTellWhatExists) {
  this->files.folder("folder");
  this->files.link("good", this->files.at("folder"));
  this->files.link("dangling", this->files.at("none"));
  EXPECT_EQ(this->kind("good"), FileKind::kDirectory);
  EXPECT_EQ(this->kind("dangling"), FileKind::kAbsent);
  EXPECT_EQ(this->manager().mode(this->files.at("good")).value_or(0) & 0170000U, 0040000U);
  EXPECT_FALSE(this->manager().mode(this->files.at("dangling")));
}

TYPED_TEST(FileManagerContract, FailsWithoutAnErrorObjectWhereThePathIsEmpty) {
  FileManager& manager = this->manager();
  this->files.file("file", "x");
  FileError error = 99;
  EXPECT_EQ(manager.kind(""), FileKind::kAbsent);
  EXPECT_TRUE(manager.subpaths("").empty());
  EXPECT_FALSE(manager.createDirectory("", true, {}, &error));
  EXPECT_FALSE(manager.copyItem("", this->files.at("copy"), &error));
  EXPECT_FALSE(manager.copyItem(this->files.at("file"), "", &error));
  EXPECT_FALSE(manager.moveItem(this->files.at("file"), "", &error));
  EXPECT_FALSE(manager.removeItem("", &error));
  EXPECT_FALSE(manager.setAttributes({}, "", &error));
  EXPECT_EQ(error, 99);
}

TYPED_TEST(FileManagerContract, CreatesADirectoryAndThoseAboveItWithExactlyThesePermissions) {
  platform::FileAttributes attributes;
  attributes.permissions = 0757;
  FileError error = 99;
  EXPECT_TRUE(this->manager().createDirectory(this->files.at("a/b/c"), true, attributes, &error));
  EXPECT_EQ(error, 99) << "success leaves the slot alone";
  for (const char* name : {"a", "a/b", "a/b/c"}) EXPECT_EQ(this->files.permissions(name), 0757U);
}

TYPED_TEST(FileManagerContract, ChangesNothingOfADirectoryThatIsThere) {
  this->files.folder("a");
  platform::FileAttributes attributes;
  attributes.permissions = 0700;
  FileError error;
  EXPECT_TRUE(this->manager().createDirectory(this->files.at("a"), true, attributes, &error));
  EXPECT_EQ(this->files.permissions("a"), 0755U);
  EXPECT_FALSE(this->manager().createDirectory(this->files.at("a"), false, attributes, &error));
  EXPECT_EQ(error, EEXIST);
}

TYPED_TEST(FileManagerContract, CreatesNoDirectoryWhereAFileStandsOrTheFolderAboveIsMissing) {
  this->files.file("file", "x");
  FileError error;
  EXPECT_FALSE(this->manager().createDirectory(this->files.at("file"), true, {}, &error));
  EXPECT_EQ(error, EEXIST);
  EXPECT_FALSE(this->manager().createDirectory(this->files.at("file/a/b"), true, {}, &error));
  EXPECT_FALSE(this->manager().createDirectory(this->files.at("none/a"), false, {}, &error));
  EXPECT_EQ(error, ENOENT);
}

TYPED_TEST(FileManagerContract, MakesNothingForAUserWhomNobodyKnows) {
  platform::FileAttributes attributes;
  attributes.ownerName = "no such user";
  FileError error;
  EXPECT_FALSE(this->manager().createDirectory(this->files.at("a"), true, attributes, &error));
  EXPECT_EQ(error, EINVAL);
  EXPECT_EQ(this->kind("a"), FileKind::kAbsent);
}

TYPED_TEST(FileManagerContract, CopiesATreeWithItsLinks) {
  this->files.folder("tree");
  this->files.folder("tree/sub");
  this->files.file("tree/sub/file", "text");
  this->files.link("tree/link", "sub/none");
  EXPECT_EQ(this->copy("tree", "copy"), std::nullopt);
  EXPECT_EQ(this->files.text("copy/sub/file"), "text");
  EXPECT_EQ(this->files.text("tree/sub/file"), "text");
  EXPECT_EQ(this->below("copy"), (std::vector<std::string>{"link", "sub", "sub/file"}));
}

TYPED_TEST(FileManagerContract, CopiesAndMovesOnlyToWhereNothingStands) {
  this->files.file("file", "new");
  this->files.file("taken", "old");
  this->files.folder("empty");
  this->files.link("dangling", this->files.at("none"));
  for (const char* name : {"taken", "empty", "dangling"}) {
    EXPECT_EQ(this->copy("file", name), EEXIST) << name;
    EXPECT_EQ(this->move("file", name), EEXIST) << name;
  }
  EXPECT_EQ(this->files.text("taken"), "old");
  EXPECT_EQ(this->kind("none"), FileKind::kAbsent);
}

TYPED_TEST(FileManagerContract, AnswersForAMissingSourceAndForAMissingFolder) {
  this->files.file("file", "x");
  EXPECT_EQ(this->copy("none", "copy"), ENOENT);
  EXPECT_EQ(this->move("none", "copy"), ENOENT);
  EXPECT_EQ(this->copy("file", "none/copy"), ENOENT);
  EXPECT_EQ(this->move("file", "none/copy"), ENOENT);
}

TYPED_TEST(FileManagerContract, CopiesNoTreeIntoItself) {
  this->files.folder("tree");
  this->files.folder("tree/sub");
  EXPECT_EQ(this->copy("tree", "tree/copy"), EINVAL);
  EXPECT_EQ(this->copy("tree", "tree/sub/copy"), EINVAL);
  EXPECT_EQ(this->move("tree", "tree/sub/copy"), EINVAL);
  EXPECT_EQ(this->below("tree"), (std::vector<std::string>{"sub"}));
}

TYPED_TEST(FileManagerContract, SkipsAFifoWithAnErrorAndCopiesTheRest) {
  this->files.folder("tree");
  this->files.fifo("tree/fifo");
  this->files.file("tree/file", "text");
  EXPECT_EQ(this->copy("tree", "copy"), EOPNOTSUPP);
  EXPECT_EQ(this->below("copy"), (std::vector<std::string>{"file"}));
  EXPECT_EQ(this->copy("tree/fifo", "alone"), EOPNOTSUPP);
  EXPECT_EQ(this->kind("alone"), FileKind::kAbsent);
}

TYPED_TEST(FileManagerContract, MovesATreeWithEverythingInIt) {
  this->files.folder("tree");
  this->files.file("tree/file", "text");
  this->files.fifo("tree/fifo");
  EXPECT_EQ(this->move("tree", "moved"), std::nullopt);
  EXPECT_EQ(this->kind("tree"), FileKind::kAbsent);
  EXPECT_EQ(this->below("moved"), (std::vector<std::string>{"fifo", "file"}));
}

TYPED_TEST(FileManagerContract, RemovesATreeAndALinkButNotWhatItPointsTo) {
  this->files.folder("tree");
  this->files.file("tree/file", "text");
  this->files.link("link", this->files.at("tree"));
  FileError error;
  EXPECT_TRUE(this->manager().removeItem(this->files.at("link"), &error));
  EXPECT_EQ(this->files.text("tree/file"), "text");
  EXPECT_TRUE(this->manager().removeItem(this->files.at("tree"), &error));
  EXPECT_EQ(this->kind("tree"), FileKind::kAbsent);
  EXPECT_FALSE(this->manager().removeItem(this->files.at("tree"), &error));
  EXPECT_EQ(error, ENOENT);
}

TYPED_TEST(FileManagerContract, RemovesADirectoryAsEmptyOnlyWhenItIs) {
  this->files.folder("folder");
  this->files.file("folder/file", "");
  EXPECT_FALSE(this->manager().removeEmptyDirectory(this->files.at("folder")));
  EXPECT_FALSE(this->manager().removeEmptyDirectory(this->files.at("folder/file")));
  EXPECT_TRUE(this->manager().removeItem({this->files.at("folder"), "file"}, nullptr));
  EXPECT_TRUE(this->manager().removeEmptyDirectory(this->files.at("folder")));
}

TYPED_TEST(FileManagerContract, ListsADirectoryBeforeWhatItHolds) {
  this->files.folder("tree");
  this->files.folder("tree/sub");
  this->files.file("tree/sub/file", "");
  const auto names = this->manager().subpaths(this->files.at("tree"));
  EXPECT_EQ(names, (std::vector<std::string>{"sub", "sub/file"}));
  EXPECT_TRUE(this->manager().subpaths(this->files.at("tree/sub/file")).empty());
}

TYPED_TEST(FileManagerContract, SetsPermissionsOfAnItemBelowADirectory) {
  this->files.folder("tree");
  this->files.file("tree/file", "");
  platform::FileAttributes attributes;
  attributes.permissions = 0604;
  EXPECT_TRUE(this->manager().setAttributes(attributes, {this->files.at("tree"), "file"}, nullptr));
  EXPECT_EQ(this->files.permissions("tree/file"), 0604U);
  FileError error;
  EXPECT_FALSE(this->manager().setAttributes(attributes, this->files.at("none"), &error));
  EXPECT_EQ(error, ENOENT);
}

TYPED_TEST(FileManagerContract, TakesOnePlaceForOneItemOfADirectoryAfterAnother) {
  this->files.folder("tree");
  this->files.folder("tree/sub");
  for (const char* name : {"tree/a", "tree/sub/b", "tree/c"}) this->files.file(name, "");
  platform::FileAttributes attributes;
  attributes.permissions = 0604;
  platform::FilePlace place(this->files.at("tree"), "");
  std::vector<bool> done;
  FileError error;
  for (const char* name : {"a", "none", "sub/b", "none/d", "sub/none", "c"}) {
    place.subpath = name;
    done.push_back(this->manager().setAttributes(attributes, place, &error));
  }
  EXPECT_EQ(done, (std::vector<bool>{true, false, true, false, false, true}));
  EXPECT_EQ(error, ENOENT) << "a success does not clear the slot";
  for (const char* name : {"tree/a", "tree/sub/b", "tree/c"}) {
    EXPECT_EQ(this->files.permissions(name), 0604U) << name;
  }
  EXPECT_TRUE(this->manager().createDirectory({this->files.at("tree"), "none"}, true, {}, nullptr));
  place.subpath = "none/d";
  EXPECT_EQ(this->manager().kind(place), FileKind::kAbsent);
  EXPECT_TRUE(this->manager().copyItem(this->files.at("tree/a"), place, nullptr))
      << "a folder that was not there before is found once it is";
}

}  // namespace
