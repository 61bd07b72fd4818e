// SPDX-License-Identifier: Apache-2.0
//
// Copies, merges, changes of owner and extractions while somebody else works on the same files. A
// second thread does so without a pause; what is asserted holds whoever comes first.
#include <gtest/gtest.h>
#include <sys/fsuid.h>
#include <sys/stat.h>

#include <atomic>
#include <cerrno>
#include <functional>
#include <thread>

#include "Helper/Files/FileUtilities.h"
#include "Helper/Platform/Linux/ArchiveWriter.h"
#include "Tests/Files/FolderForTest.h"
#include "Tests/Support/WireClient.h"

namespace {

using platform::FileError;
using platform::FilePlace;

constexpr int kTurns = 50;

/// Calls `work` again and again, on a thread of its own, until it goes.
class Meanwhile {
 public:
  explicit Meanwhile(std::function<void()> work)
      : thread_([this, work = std::move(work)] {
          while (!over_) work();
        }) {}
  ~Meanwhile() {
    over_ = true;
    thread_.join();
  }
  Meanwhile(const Meanwhile&) = delete;
  Meanwhile& operator=(const Meanwhile&) = delete;

 private:
  std::atomic<bool> over_{false};
  std::thread thread_;
};

class FilesInMotion : public testing::Test {
 protected:
  void SetUp() override {
    folder.folder("tree");
    folder.folder("tree/sub");
    for (const char* name : {"tree/a", "tree/sub/b"}) folder.file(name, "text");
    folder.folder("outside");
  }
  [[nodiscard]] std::string at(const std::string& name) const { return folder.at(name); }
  /// Lets the folder `name` and a link to "outside" change places.
  void swapWithALink(const std::string& name) const {
    ::renameat2(AT_FDCWD, at(name).c_str(), AT_FDCWD, at("link").c_str(), RENAME_EXCHANGE);
  }
  [[nodiscard]] bool outsideIsEmpty() const {
    return std::filesystem::is_empty(folder.at("outside"));
  }

  files_test::FolderForTest folder;
  platform::FileManager& manager = platform::DefaultProvider<platform::FileManager>();
};

TEST_F(FilesInMotion, MayGrowWhileTheyAreCopied) {
  constexpr off_t kMost = 16 * 1024;
  folder.file("log", "start");
  const Meanwhile grow([&] {
    std::ofstream(at("log"), std::ios::app) << "another line\n";
    if (folder.status("log").st_size > kMost) {
      EXPECT_EQ(::truncate(at("log").c_str(), 5), 0);
    }
  });
  for (int turn = 0; turn < kTurns; ++turn) {
    ASSERT_TRUE(manager.copyItem(at("log"), at("copy"), nullptr));
    EXPECT_TRUE(folder.text("copy").starts_with("start"));
    EXPECT_LE(folder.status("copy").st_size, kMost + 13);
    ASSERT_TRUE(manager.removeItem(at("copy"), nullptr));
  }
}

TEST_F(FilesInMotion, MayBecomeShorterWhileTheyAreCopied) {
  const Meanwhile shrink([&] {
    EXPECT_EQ(::truncate(at("tree/a").c_str(), 1 << 20), 0);
    EXPECT_EQ(::truncate(at("tree/a").c_str(), 0), 0);
  });
  for (int turn = 0; turn < kTurns; ++turn) {
    EXPECT_TRUE(manager.copyItem(at("tree"), at("copy"), nullptr));
    EXPECT_EQ(folder.text("copy/sub/b"), "text");
    ASSERT_TRUE(manager.removeItem(at("copy"), nullptr));
  }
}

TEST_F(FilesInMotion, MayComeAndGoWhileTheRestOfTheirTreeIsCopied) {
  const Meanwhile comeAndGo([&] {
    folder.file("tree/here", "x");
    folder.folder("tree/new");
    folder.file("tree/new/here", "x");
    std::error_code ignored;
    std::filesystem::remove_all(at("tree/new"), ignored);
    ::unlink(at("tree/here").c_str());
  });
  for (int turn = 0; turn < kTurns; ++turn) {
    FileError error;
    const bool copied = manager.copyItem(at("tree"), at("copy"), &error);
    EXPECT_TRUE(copied || error == ENOENT) << *error;
    EXPECT_EQ(folder.text("copy/a"), "text");
    EXPECT_EQ(folder.text("copy/sub/b"), "text");
    ASSERT_TRUE(manager.removeItem(at("copy"), nullptr));
  }
}

TEST_F(FilesInMotion, AreNotMergedToWhereALinkLeadsThatIsSwappedIn) {
  folder.folder("into");
  folder.folder("into/sub");
  folder.link("link", at("outside"));
  const Meanwhile swap([&] { swapWithALink("into/sub"); });
  for (int turn = 0; turn < kTurns; ++turn) {
    MergeItem(manager, at("tree"), at("into"), /*copy=*/true);
  }
  EXPECT_TRUE(outsideIsEmpty());
}

TEST_F(FilesInMotion, AreNotCopiedFromWhereALinkLeadsThatIsSwappedIn) {
  folder.file("outside/secret", "secret");
  folder.link("link", at("outside"));
  const Meanwhile swap([&] { swapWithALink("tree/sub"); });
  for (int turn = 0; turn < kTurns; ++turn) {
    (void)manager.copyItem(at("tree"), at("copy"), nullptr);
    EXPECT_NE(folder.status("copy").st_mode, 0U);
    // Only by its own name may the secret have come, through a link that was copied as a link.
    struct stat sub = folder.status("copy/sub");
    EXPECT_TRUE(S_ISLNK(sub.st_mode) || folder.status("copy/sub/secret").st_mode == 0);
    ASSERT_TRUE(manager.removeItem(at("copy"), nullptr));
  }
  EXPECT_EQ(folder.text("outside/secret"), "secret");
}

TEST_F(FilesInMotion, KeepTheirOwnersOutsideTheTreeThatIsGivenAway) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root may give files away";
  folder.file("outside/b", "theirs");
  folder.link("link", at("outside"));
  {
    const Meanwhile swap([&] { swapWithALink("tree/sub"); });
    for (int turn = 0; turn < kTurns; ++turn)
      (void)SetItemOwner(at("tree").c_str(), 501, 501, true);
  }
  EXPECT_EQ(folder.status("outside/b").st_uid, 0U);
}

TEST_F(FilesInMotion, AreNotRemovedOutsideTheTreeThatIsRemoved) {
  folder.file("outside/kept", "theirs");
  folder.link("link", at("outside"));
  const Meanwhile swap([&] { swapWithALink("tree/sub"); });
  for (int turn = 0; turn < kTurns; ++turn) {
    (void)manager.removeItem(at("tree"), nullptr);
    EXPECT_EQ(folder.text("outside/kept"), "theirs");
    folder.folder("tree");
    folder.folder("tree/sub");
    folder.file("tree/sub/b", "text");
  }
}

TEST_F(FilesInMotion, AreNotExtractedToWhereALinkLeadsThatIsSwappedIn) {
  folder.folder("into");
  folder.folder("into/sub");
  folder.link("link", at("outside"));
  const Meanwhile swap([&] { swapWithALink("into/sub"); });
  for (int turn = 0; turn < kTurns; ++turn) {
    platform::ArchiveWriter writer(
        platform::FileDescriptor(::open(at("into").c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC)));
    for (const char* path : {"sub/a", "b", "sub/new/c"}) {
      platform::NewFile file;
      if (writer.beginFile(path, {}, file) != 0) continue;
      (void)writer.finishFile(file, path, {});
    }
    writer.finishFolders();
  }
  EXPECT_TRUE(outsideIsEmpty());
}

TEST_F(FilesInMotion, StayInTheFolderThatAPlaceHasOpened) {
  folder.file("outside/b", "theirs");
  FilePlace place(at("tree"), "sub/b");
  EXPECT_EQ(manager.kind(place), platform::FileKind::kOther);
  std::filesystem::rename(at("tree/sub"), at("moved"));
  folder.link("tree/sub", at("outside"));
  EXPECT_TRUE(manager.removeItem(place, nullptr));
  EXPECT_EQ(folder.text("moved/b"), "(absent)");
  EXPECT_EQ(folder.text("outside/b"), "theirs");
}

TEST_F(FilesInMotion, AreCopiedAroundWhatCannotBeRead) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root may become another user for the files";
  ::chmod(at("").c_str(), 0777);
  folder.file("tree/secret", "secret");
  ::chmod(at("tree/secret").c_str(), 0600);
  ::chmod(at("tree/sub").c_str(), 0700);
  ::setfsuid(501);
  FileError error;
  const bool copied = manager.copyItem(at("tree"), at("copy"), &error);
  ::setfsuid(0);
  EXPECT_FALSE(copied);
  EXPECT_EQ(error, EACCES);
  EXPECT_EQ(manager.subpaths(at("copy")), std::vector<std::string>{"a"});
}

}  // namespace
