// SPDX-License-Identifier: Apache-2.0
//
// Whose links are followed. Links of others can only be made by root.
#include "Helper/Platform/Linux/PathWalk.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "Helper/Platform/DirectoryEntries.h"
#include "Helper/Platform/FileManager.h"
#include "Tests/Files/FolderForTest.h"

namespace {

using platform::FileDescriptor;
using platform::FileError;
using platform::FileKind;
using platform::LastLink;

constexpr uid_t kStranger = 65534;

class PathWalk : public ::testing::Test {
 protected:
  [[nodiscard]] std::string at(const std::string& name) const { return folder.at(name); }

  /// The device and inode that the path leads to, or an error number.
  static std::pair<dev_t, ino_t> found(const std::string& path, LastLink last) {
    const FileDescriptor item = platform::OpenPathAt(AT_FDCWD, path, last);
    struct stat status {};
    if (!item) return {0, static_cast<ino_t>(errno)};
    EXPECT_EQ(::fstat(item.get(), &status), 0);
    return {status.st_dev, status.st_ino};
  }
  static std::pair<dev_t, ino_t> failed(int error) { return {0, static_cast<ino_t>(error)}; }
  static std::pair<dev_t, ino_t> real(const std::string& path) {
    struct stat status {};
    EXPECT_EQ(::stat(path.c_str(), &status), 0) << path;
    return {status.st_dev, status.st_ino};
  }
  void strangersLink(const std::string& name, const std::string& target) {
    folder.link(name, target);
    ASSERT_EQ(::lchown(at(name).c_str(), kStranger, kStranger), 0);
  }

  files_test::FolderForTest folder;
};

TEST_F(PathWalk, LeadsWhereTheKernelsDoes) {
  folder.folder("a");
  folder.folder("a/b");
  folder.file("a/b/file", "x");
  folder.link("absolute", at("a"));
  folder.link("relative", "a/b");
  folder.link("chain", "relative/../../absolute/b/");
  folder.link("circle", "circle");
  folder.link("dangling", "none");
  for (const char* path : {"a/b/file", "a//b/./file", "a/b/../b/file", "absolute/b/file",
                           "relative/file", "chain/file", "absolute", "chain", "a/b/"}) {
    EXPECT_EQ(found(at(path), LastLink::kFollow), real(at(path))) << path;
  }
  EXPECT_EQ(found("/", LastLink::kFollow), real("/"));
  EXPECT_EQ(found("..", LastLink::kFollow), real(".."));
  EXPECT_EQ(found("", LastLink::kFollow), failed(ENOENT));
  EXPECT_EQ(found(at("none"), LastLink::kFollow), failed(ENOENT));
  EXPECT_EQ(found(at("dangling"), LastLink::kFollow), failed(ENOENT));
  EXPECT_EQ(found(at("circle"), LastLink::kFollow), failed(ELOOP));
  EXPECT_EQ(found(at("a/b/file/none"), LastLink::kFollow), failed(ENOTDIR));
  EXPECT_NE(found(at("absolute"), LastLink::kOpen), real(at("a"))) << "the link itself";
  EXPECT_EQ(platform::OpenDirectoryAt(AT_FDCWD, at("a/b/file")).get(), -1);
  EXPECT_EQ(errno, ENOTDIR);
}

TEST_F(PathWalk, TakesWhatALinkOfProcSaysAsText) {
  const FileDescriptor nameless(::memfd_create("nameless", MFD_CLOEXEC));
  const std::string path = "/proc/self/fd/" + std::to_string(nameless.get());
  EXPECT_EQ(::access(path.c_str(), F_OK), 0);
  EXPECT_EQ(found(path, LastLink::kFollow), failed(ENOENT));
}

TEST_F(PathWalk, FollowsNoLinkOfAnotherUser) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root can give a link away";
  folder.folder("a");
  folder.file("a/file", "x");
  strangersLink("link", "a");
  folder.link("ours", "link");
  EXPECT_EQ(found(at("link/file"), LastLink::kFollow), failed(EACCES));
  EXPECT_EQ(found(at("link"), LastLink::kFollow), failed(EACCES));
  EXPECT_EQ(found(at("ours"), LastLink::kFollow), failed(EACCES));
  EXPECT_EQ(found(at("ours/file"), LastLink::kOpen), failed(EACCES));
  EXPECT_NE(found(at("link"), LastLink::kOpen), failed(EACCES));
}

TEST_F(PathWalk, GuardsEveryOperationOfTheFileManager) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root can give a link away";
  auto& manager = platform::DefaultProvider<platform::FileManager>();
  folder.folder("guarded");
  folder.folder("guarded/sub");
  folder.file("guarded/file", "kept");
  folder.file("new", "new");
  strangersLink("link", "guarded");
  FileError error;
  const auto fails = [&](bool done) {
    const FileError code = std::exchange(error, std::nullopt);
    return !done && code == EACCES;
  };
  EXPECT_EQ(manager.kind(at("link")), FileKind::kOther) << "the link itself stands there";
  EXPECT_EQ(manager.kind(at("link/file")), FileKind::kAbsent);
  EXPECT_TRUE(manager.subpaths(at("link")).empty());
  EXPECT_TRUE(fails(manager.createDirectory(at("link/made"), true, {}, &error)));
  EXPECT_TRUE(fails(manager.createDirectory(at("link/made"), false, {}, &error)));
  EXPECT_TRUE(fails(manager.copyItem(at("new"), at("link/new"), &error)));
  EXPECT_TRUE(fails(manager.moveItem(at("new"), at("link/new"), &error)));
  EXPECT_TRUE(fails(manager.removeItem(at("link/file"), &error)));
  EXPECT_TRUE(fails(manager.setAttributes({.ownerId = kStranger}, at("link/file"), &error)));
  EXPECT_FALSE(manager.removeEmptyDirectory(at("link/sub")));
  EXPECT_FALSE(manager.changeOwner(at("link"), kStranger, kStranger));
  EXPECT_FALSE(manager.changeOwner(at("link/file"), kStranger, kStranger));
  EXPECT_EQ(manager.subpaths(at("guarded")).size(), 2U);
  struct stat status {};
  ASSERT_EQ(::stat(at("guarded").c_str(), &status), 0);
  EXPECT_EQ(status.st_uid, 0U);
  EXPECT_TRUE(manager.removeItem(at("link"), &error)) << "what stands there can be taken away";
  EXPECT_EQ(folder.text("guarded/file"), "kept");
}

TEST_F(PathWalk, GuardsWhatMakesAndTakesAwayEntries) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root can give a link away";
  auto& entries = platform::DefaultProvider<platform::DirectoryEntries>();
  folder.folder("guarded");
  folder.file("guarded/file", "kept");
  strangersLink("link", "guarded");
  EXPECT_FALSE(entries.makeLink("target", at("link/made").c_str()));
  EXPECT_FALSE(entries.remove(at("link/file").c_str()));
  EXPECT_EQ(folder.text("guarded/file"), "kept");
  EXPECT_FALSE(entries.makeLink("target", at("guarded/made/").c_str())) << "a directory's name";
  EXPECT_FALSE(entries.remove(at("guarded/file/").c_str()));
  EXPECT_TRUE(entries.remove(at("link").c_str()));
}

}  // namespace
