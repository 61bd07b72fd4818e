// SPDX-License-Identifier: Apache-2.0
//
// What the file manager on system calls does with a real file system: attributes, links that lead
// elsewhere, special files, other file systems, full ones. Runs as root where it says so.
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/sysmacros.h>
#include <sys/xattr.h>

#include <cerrno>
#include <cstring>
#include <vector>

#include "Helper/Platform/FileManager.h"
#include "Helper/Platform/UnixSocketAddress.h"
#include "Tests/Files/FolderForTest.h"
#include "Tests/Files/SmallFileSystem.h"
#include "Tests/Support/WireClient.h"

namespace {

using files_test::SmallFileSystem;
using platform::FileAttributes;
using platform::FileError;
using platform::FileKind;
using platform::FilePlace;

class FileManagerPosix : public ::testing::Test {
 protected:
  FileError copy(const FilePlace& from, const FilePlace& to) {
    FileError error;
    const bool done = manager.copyItem(from, to, &error);
    EXPECT_EQ(done, !error.has_value());
    return error;
  }
  FileError move(const FilePlace& from, const FilePlace& to) {
    FileError error;
    const bool done = manager.moveItem(from, to, &error);
    EXPECT_EQ(done, !error.has_value());
    return error;
  }
  [[nodiscard]] std::string at(const std::string& name) const { return folder.at(name); }

  files_test::FolderForTest folder;
  platform::FileManager& manager = platform::DefaultProvider<platform::FileManager>();
};

TEST_F(FileManagerPosix, CarriesPermissionsTimesAndExtendedAttributes) {
  folder.folder("tree");
  folder.file("tree/file", "text");
  ASSERT_EQ(::setxattr(at("tree/file").c_str(), "user.label", "value", 5, 0), 0);
  ASSERT_EQ(::setxattr(at("tree").c_str(), "user.folder", "x", 1, 0), 0);
  ::chmod(at("tree/file").c_str(), 0641);
  ::chmod(at("tree").c_str(), 01731);
  const timespec times[2] = {{.tv_sec = 1000, .tv_nsec = 5}, {.tv_sec = 2000, .tv_nsec = 7}};
  ::utimensat(AT_FDCWD, at("tree/file").c_str(), times, 0);
  ::utimensat(AT_FDCWD, at("tree").c_str(), times, 0);
  EXPECT_EQ(copy(at("tree"), at("copy")), std::nullopt);
  EXPECT_EQ(folder.permissions("copy/file"), 0641U);
  EXPECT_EQ(folder.permissions("copy"), 01731U);
  for (const char* name : {"copy", "copy/file"}) {
    EXPECT_EQ(folder.status(name).st_mtim.tv_sec, 2000) << name;
    EXPECT_EQ(folder.status(name).st_mtim.tv_nsec, 7) << name;
  }
  char value[8] = {};
  EXPECT_EQ(::getxattr(at("copy/file").c_str(), "user.label", value, sizeof value), 5);
  EXPECT_STREQ(value, "value");
  EXPECT_EQ(::getxattr(at("copy").c_str(), "user.folder", value, sizeof value), 1);
}

TEST_F(FileManagerPosix, CarriesOwnersWhenTheProcessIsRoot) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root may give files away";
  folder.folder("tree");
  folder.file("tree/file", "text");
  folder.link("tree/link", "file");
  for (const char* name : {"tree", "tree/file", "tree/link"}) {
    ASSERT_EQ(::lchown(at(name).c_str(), 501, 502), 0);
  }
  EXPECT_EQ(copy(at("tree"), at("copy")), std::nullopt);
  for (const char* name : {"copy", "copy/file", "copy/link"}) {
    EXPECT_EQ(folder.status(name).st_uid, 501U) << name;
    EXPECT_EQ(folder.status(name).st_gid, 502U) << name;
  }
}

TEST_F(FileManagerPosix, LeavesSetIdBitsBehind) {
  folder.folder("tree");
  folder.file("tree/file", "text");
  ::chmod(at("tree/file").c_str(), 06755);
  ::chmod(at("tree").c_str(), 02755);
  EXPECT_EQ(copy(at("tree"), at("copy")), std::nullopt);
  EXPECT_EQ(folder.permissions("copy/file"), 0755U);
  EXPECT_EQ(folder.permissions("copy") & 06000, 0U);
}

TEST_F(FileManagerPosix, CopiesALinkAsALinkAndNeverWhatItPointsTo) {
  folder.file("secret", "secret");
  folder.link("link", at("secret"));
  EXPECT_EQ(copy(at("link"), at("copy")), std::nullopt);
  EXPECT_TRUE(S_ISLNK(folder.status("copy").st_mode));
  EXPECT_EQ(std::filesystem::read_symlink(at("copy")), at("secret"));
}

TEST_F(FileManagerPosix, KeepsTheHolesOfAFile) {
  folder.file("sparse", "");
  ASSERT_EQ(::truncate(at("sparse").c_str(), 256 << 20), 0);
  {
    const platform::FileDescriptor file(::open(at("sparse").c_str(), O_WRONLY | O_CLOEXEC));
    ASSERT_EQ(::pwrite(file.get(), "middle", 6, 100 << 20), 6);
  }
  EXPECT_EQ(copy(at("sparse"), at("copy")), std::nullopt);
  EXPECT_EQ(folder.status("copy").st_size, 256 << 20);
  EXPECT_LT(folder.status("copy").st_blocks, 1024);
  const platform::FileDescriptor file(::open(at("copy").c_str(), O_RDONLY | O_CLOEXEC));
  char text[7] = {};
  EXPECT_EQ(::pread(file.get(), text, 6, 100 << 20), 6);
  EXPECT_STREQ(text, "middle");
}

TEST_F(FileManagerPosix, CopiesAFileWhoseSizeTheKernelDoesNotTell) {
  EXPECT_EQ(copy("/proc/version", at("copy")), std::nullopt);
  EXPECT_TRUE(folder.text("copy").starts_with("Linux version"));
}

TEST_F(FileManagerPosix, OpensNoSocketAndNoDevice) {
  folder.folder("tree");
  folder.file("tree/file", "text");
  const platform::FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const platform::UnixSocketAddress address(at("tree/socket"));
  ASSERT_EQ(::bind(socket.get(), address.get(), address.size()), 0);
  // Opening a terminal that has no driver would answer ENXIO instead.
  if (::geteuid() == 0) ::mknod(at("tree/device").c_str(), S_IFCHR | 0644, makedev(250, 250));
  EXPECT_EQ(copy(at("tree"), at("copy")), EOPNOTSUPP);
  EXPECT_EQ(manager.subpaths(at("copy")), (std::vector<std::string>{"file"}));
}

TEST_F(FileManagerPosix, FollowsNoLinkBelowTheFolderOfAPlace) {
  folder.folder("tree");
  folder.folder("outside");
  folder.file("outside/file", "theirs");
  folder.file("new", "ours");
  folder.link("tree/sub", at("outside"));
  const FilePlace place{at("tree"), "sub/file"};
  const FilePlace absent{at("tree"), "sub/other"};
  EXPECT_EQ(manager.kind(place), FileKind::kAbsent);
  EXPECT_EQ(copy(at("new"), absent), ELOOP);
  EXPECT_EQ(move(at("new"), absent), ELOOP);
  FileError error;
  EXPECT_FALSE(manager.removeItem(place, &error));
  EXPECT_EQ(error, ELOOP);
  FileAttributes attributes;
  attributes.permissions = 0600;
  EXPECT_FALSE(manager.setAttributes(attributes, place, nullptr));
  EXPECT_FALSE(manager.createDirectory({at("tree"), "sub/made"}, true, attributes, nullptr));
  EXPECT_EQ(folder.text("outside/file"), "theirs");
  EXPECT_EQ(folder.permissions("outside/file"), 0644U);
  EXPECT_EQ(manager.subpaths(at("outside")).size(), 1U);
}

TEST_F(FileManagerPosix, ListsALinkButNotWhatIsBehindIt) {
  folder.folder("tree");
  folder.folder("outside");
  folder.file("outside/file", "x");
  folder.link("tree/link", at("outside"));
  EXPECT_EQ(manager.subpaths(at("tree")), (std::vector<std::string>{"link"}));
}

TEST_F(FileManagerPosix, SetsTheOwnerOfALinkAndNotOfItsTarget) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root may give files away";
  folder.file("file", "x");
  folder.link("link", "file");
  FileAttributes attributes;
  attributes.ownerId = 501;
  attributes.groupId = 502;
  EXPECT_TRUE(manager.setAttributes(attributes, at("link"), nullptr));
  EXPECT_EQ(folder.status("link").st_uid, 501U);
  EXPECT_EQ(folder.status("file").st_uid, 0U);
  attributes = {};
  attributes.permissions = 0600;
  EXPECT_TRUE(manager.setAttributes(attributes, at("link"), nullptr));
  EXPECT_EQ(folder.permissions("file"), 0644U);
  attributes = {};
  attributes.ownerName = "daemon";
  attributes.groupName = "daemon";
  EXPECT_TRUE(manager.setAttributes(attributes, at("file"), nullptr));
  EXPECT_EQ(folder.status("file").st_uid, 1U);
  EXPECT_EQ(folder.status("file").st_gid, 1U);
}

TEST_F(FileManagerPosix, LeavesNothingOfATreeThatDoesNotFitOnAFullDisk) {
  folder.folder("small");
  const SmallFileSystem small(at("small"));
  if (!small) GTEST_SKIP() << "no file system can be mounted here: " << std::strerror(errno);
  folder.folder("tree");
  folder.file("tree/a", "fits");
  folder.file("tree/b", std::string(1 << 20, 'x'));
  EXPECT_EQ(copy(at("tree"), at("small/copy")), ENOSPC);
  EXPECT_EQ(copy(at("tree/b"), at("small/file")), ENOSPC);
  EXPECT_EQ(move(at("tree"), at("small/moved")), ENOSPC);
  EXPECT_TRUE(manager.subpaths(at("small")).empty()) << "and no temporary name either";
  EXPECT_EQ(folder.text("tree/a"), "fits");
}

TEST_F(FileManagerPosix, LeavesOutAFileAloneWhoseAttributesHaveNoRoomThere) {
  folder.folder("tree");
  folder.folder("small");
  const SmallFileSystem source(at("tree"));
  // Attributes take their room from that for items, of which there is little: content fits.
  const SmallFileSystem small(at("small"), "size=256k,nr_inodes=8");
  if (!source || !small) {
    GTEST_SKIP() << "no file system can be mounted here: " << std::strerror(errno);
  }
  folder.file("tree/a", "large");
  folder.file("tree/b", "ordinary");
  const std::string value(9000, 'x');
  if (::setxattr(at("tree/a").c_str(), "user.large", value.data(), value.size(), 0) != 0) {
    GTEST_SKIP() << "this kernel keeps no attributes in memory: " << std::strerror(errno);
  }
  EXPECT_EQ(copy(at("tree"), at("small/copy")), E2BIG);
  EXPECT_EQ(manager.subpaths(at("small/copy")), (std::vector<std::string>{"b"}));
  EXPECT_EQ(copy(at("tree/a"), at("small/a")), E2BIG);
  EXPECT_EQ(manager.kind(at("small/a")), FileKind::kAbsent);
}

TEST_F(FileManagerPosix, KeepsAFolderWhoseAttributesHaveNoRoomThere) {
  folder.folder("tree");
  folder.folder("small");
  const SmallFileSystem source(at("tree"));
  const SmallFileSystem small(at("small"), "size=256k,nr_inodes=8");
  if (!source || !small) {
    GTEST_SKIP() << "no file system can be mounted here: " << std::strerror(errno);
  }
  folder.folder("tree/sub");
  folder.file("tree/sub/file", "text");
  const timespec times[2] = {{.tv_sec = 1000, .tv_nsec = 0}, {.tv_sec = 2000, .tv_nsec = 0}};
  ASSERT_EQ(::utimensat(AT_FDCWD, at("tree/sub").c_str(), times, 0), 0);
  const std::string value(9000, 'x');
  if (::setxattr(at("tree/sub").c_str(), "user.large", value.data(), value.size(), 0) != 0) {
    GTEST_SKIP() << "this kernel keeps no attributes in memory: " << std::strerror(errno);
  }
  EXPECT_EQ(copy(at("tree"), at("small/copy")), E2BIG);
  EXPECT_EQ(folder.text("small/copy/sub/file"), "text");
  struct stat status {};
  ASSERT_EQ(::stat(at("small/copy/sub").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777U, 0755U);
  EXPECT_EQ(status.st_mtim.tv_sec, 2000);
}

TEST_F(FileManagerPosix, MovesToAnotherFileSystemAllOrNothing) {
  folder.folder("other");
  const SmallFileSystem other(at("other"));
  if (!other) GTEST_SKIP() << "no file system can be mounted here: " << std::strerror(errno);
  folder.folder("tree");
  folder.folder("tree/sub");
  folder.file("tree/sub/file", "text");
  folder.fifo("tree/fifo");
  EXPECT_EQ(move(at("tree"), at("other/tree")), EOPNOTSUPP);
  EXPECT_TRUE(manager.subpaths(at("other")).empty());
  EXPECT_EQ(folder.text("tree/sub/file"), "text");
  ::unlink(at("tree/fifo").c_str());
  EXPECT_EQ(move(at("tree"), at("other/tree")), std::nullopt);
  EXPECT_EQ(folder.text("other/tree/sub/file"), "text");
  EXPECT_EQ(manager.kind(at("tree")), FileKind::kAbsent);
  folder.file("file", "text");
  EXPECT_EQ(move(at("file"), at("other/tree")), EEXIST);
}

TEST_F(FileManagerPosix, StopsWhereAMountLeadsIntoTheCopyItself) {
  folder.folder("tree");
  folder.folder("tree/a-mount");
  folder.folder("outside");
  if (::mount(at("outside").c_str(), at("tree/a-mount").c_str(), nullptr, MS_BIND, nullptr) != 0) {
    GTEST_SKIP() << "no folder can be bound here: " << std::strerror(errno);
  }
  EXPECT_EQ(copy(at("tree"), at("outside/copy")), EINVAL);
  EXPECT_EQ(manager.subpaths(at("outside")), (std::vector<std::string>{"copy", "copy/a-mount"}));
  ::umount2(at("tree/a-mount").c_str(), MNT_DETACH);
}

TEST_F(FileManagerPosix, GivesUpBelowTwoHundredLevelsAndKeepsNoDescriptor) {
  std::string path = "deep";
  for (int level = 0; level < 220; ++level) {
    folder.folder(path);
    path += "/d";
  }
  folder.folder("tree");
  folder.file("tree/file", "x");
  const std::size_t before = support::OpenDescriptors();
  EXPECT_EQ(copy(at("deep"), at("copy")), ENAMETOOLONG);
  EXPECT_EQ(copy(at("tree"), at("tree-copy")), std::nullopt);
  EXPECT_EQ(copy(at("tree"), at("tree-copy")), EEXIST);
  EXPECT_TRUE(manager.removeItem(at("copy"), nullptr));
  EXPECT_EQ(support::OpenDescriptors(), before);
}

TEST_F(FileManagerPosix, CarriesNamesThatAreNotUtf8) {
  folder.folder("tree");
  folder.file("tree/\xff", "text");
  EXPECT_EQ(copy(at("tree"), at("copy")), std::nullopt);
  EXPECT_EQ(folder.text("copy/\xff"), "text");
}

TEST_F(FileManagerPosix, LeavesNoTemporaryNameBehind) {
  folder.file("file", "x");
  EXPECT_EQ(copy(at("file"), at("copy")), std::nullopt);
  EXPECT_EQ(copy(at("none"), at("other")), ENOENT);
  EXPECT_EQ(folder.names(), (std::set<std::string>{"file", "copy"}));
}

TEST_F(FileManagerPosix, RemovesNeitherTheFolderItselfNorTheOneAboveByThoseNames) {
  folder.folder("tree");
  FileError error;
  EXPECT_FALSE(manager.removeItem(at("tree/."), &error));
  EXPECT_FALSE(manager.removeItem(at("tree/.."), &error));
  EXPECT_FALSE(manager.removeItem("/", &error));
  EXPECT_EQ(error, EINVAL);
  EXPECT_EQ(manager.kind(at("tree")), FileKind::kDirectory);
}

}  // namespace
