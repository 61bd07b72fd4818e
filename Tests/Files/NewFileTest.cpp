// SPDX-License-Identifier: Apache-2.0
//
// Files that get their name last, and the names under which other things take shape.
#include "Helper/Platform/Linux/NewFile.h"

#include <gtest/gtest.h>
#include <linux/audit.h>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <sys/file.h>
#include <sys/prctl.h>
#include <sys/syscall.h>

#include <cerrno>
#include <cstddef>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Linux/WorkName.h"
#include "Tests/Files/FolderForTest.h"

namespace {

using platform::FileDescriptor;
using platform::IfTaken;
using platform::MakeWorkItem;
using platform::WorkItem;
using platform::WorkKind;
using Names = std::set<std::string>;

class NewFile : public testing::Test {
 protected:
  void write(const platform::NewFile& file, const std::string& text) const {
    ASSERT_EQ(::write(file.descriptor(), text.data(), text.size()),
              static_cast<ssize_t>(text.size()));
  }
  files_test::FolderForTest folder;
  const FileDescriptor open{::open(folder.at("").c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC)};
};
using WorkName = NewFile;

TEST_F(NewFile, HasNoNameBeforeItIsGivenOne) {
  platform::NewFile file;
  ASSERT_EQ(file.make(open.get(), 0640), 0);
  write(file, "text");
  EXPECT_EQ(folder.names(), Names{});
  EXPECT_EQ(file.giveName("file", IfTaken::kFail), 0);
  EXPECT_EQ(folder.text("file"), "text");
  EXPECT_EQ(folder.permissions("file"), 0640U);
}

TEST_F(NewFile, LeavesNothingWhenItIsDropped) {
  { ASSERT_EQ(platform::NewFile().make(open.get(), 0640), 0); }
  EXPECT_EQ(folder.names(), Names{});
}

TEST_F(NewFile, ReplacesFilesAndLinksButNoDirectory) {
  folder.file("file", "old");
  folder.file("outside", "theirs");
  folder.link("link", "outside");
  folder.folder("folder");
  for (const char* name : {"file", "link", "folder"}) {
    platform::NewFile file;
    ASSERT_EQ(file.make(open.get(), 0640), 0);
    write(file, "new");
    EXPECT_EQ(file.giveName(name, IfTaken::kFail), EEXIST) << name;
    const bool isFolder = name == std::string("folder");
    EXPECT_EQ(file.giveName(name, IfTaken::kReplace), isFolder ? EISDIR : 0) << name;
  }
  EXPECT_EQ(folder.text("file"), "new");
  EXPECT_EQ(folder.text("link"), "new");
  EXPECT_EQ(folder.text("outside"), "theirs");
  EXPECT_EQ(folder.names(), (Names{"file", "link", "outside", "folder"}));
}

TEST_F(NewFile, CannotBeMadeWhereThereIsNoFolder) {
  EXPECT_EQ(platform::NewFile().make(-1, 0640), EBADF);
}

/// From here on this process has file systems without unnamed files only.
void ForbidUnnamedFiles() {
  constexpr std::uint32_t kFlags = offsetof(seccomp_data, args[2]);
  constexpr std::uint32_t kUnnamed = O_TMPFILE & ~O_DIRECTORY;
  sock_filter code[] = {
      BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
      BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_openat, 0, 3),
      BPF_STMT(BPF_LD | BPF_W | BPF_ABS, kFlags),
      BPF_JUMP(BPF_JMP | BPF_JSET | BPF_K, kUnnamed, 0, 1),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ERRNO | EOPNOTSUPP),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
  };
  const sock_fprog program{std::size(code), code};
  ASSERT_EQ(::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0), 0);
  ASSERT_EQ(::prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &program), 0);
}

TEST_F(NewFile, HasAWorkNameOnAFileSystemWithoutUnnamedFiles) {
  folder.file("taken", "old");
  // The restriction stays with a process to its end, so it is another process.
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(
      {
        ForbidUnnamedFiles();
        platform::NewFile file;
        EXPECT_EQ(file.make(open.get(), 0640), 0);
        write(file, "new");
        EXPECT_EQ(folder.names(), (Names{"taken", ".halvec-copy-0"}));
        EXPECT_EQ(folder.permissions(".halvec-copy-0"), 0600U) << "others can see it";
        EXPECT_EQ(file.giveName("taken", IfTaken::kFail), EEXIST);
        EXPECT_EQ(file.giveName("taken", IfTaken::kReplace), 0);
        EXPECT_EQ(folder.text("taken"), "new");
        { EXPECT_EQ(platform::NewFile().make(open.get(), 0640), 0); }
        EXPECT_EQ(folder.names(), Names{"taken"});
        ::_exit(testing::Test::HasFailure() ? 1 : 0);
      },
      testing::ExitedWithCode(0), "");
}

TEST_F(WorkName, IsTakenFromWhatAKilledProcessLeftBehind) {
  folder.folder(".halvec-copy-0");
  folder.folder(".halvec-copy-0/sub");
  folder.file(".halvec-copy-0/sub/file", "half");
  WorkItem work;
  ASSERT_EQ(MakeWorkItem(open.get(), WorkKind::kFolder, work), 0);
  EXPECT_EQ(work.name, ".halvec-copy-0");
  EXPECT_EQ(folder.names(), Names{".halvec-copy-0"});
  EXPECT_TRUE(std::filesystem::is_empty(folder.at(".halvec-copy-0")));
}

TEST_F(WorkName, IsTakenFromWhateverElseStandsThere) {
  folder.file("outside", "theirs");
  for (const bool fifo : {false, true}) {
    fifo ? folder.fifo(".halvec-copy-0") : folder.link(".halvec-copy-0", "outside");
    WorkItem work;
    ASSERT_EQ(MakeWorkItem(open.get(), WorkKind::kFile, work), 0);
    EXPECT_EQ(work.name, ".halvec-copy-0");
    EXPECT_TRUE(S_ISREG(folder.status(work.name).st_mode));
    ::unlink(folder.at(work.name).c_str());
  }
  EXPECT_EQ(folder.text("outside"), "theirs");
}

TEST_F(WorkName, IsNotTakenFromWhoeverWorksUnderIt) {
  WorkItem first, second;
  ASSERT_EQ(MakeWorkItem(open.get(), WorkKind::kFolder, first), 0);
  ASSERT_EQ(MakeWorkItem(open.get(), WorkKind::kFile, second), 0);
  EXPECT_EQ(folder.names(), (Names{".halvec-copy-0", ".halvec-copy-1"}));
  first.item.reset();
  WorkItem third;
  ASSERT_EQ(MakeWorkItem(open.get(), WorkKind::kFile, third), 0);
  EXPECT_EQ(third.name, ".halvec-copy-0") << "free again once its worker is gone";
}

TEST_F(WorkName, IsRefusedToTheSeventeenthWorker) {
  std::vector<WorkItem> works(17);
  for (int i = 0; i < 16; ++i) {
    ASSERT_EQ(MakeWorkItem(open.get(), WorkKind::kFile, works[i]), 0);
  }
  EXPECT_EQ(MakeWorkItem(open.get(), WorkKind::kFile, works[16]), EBUSY);
}

}  // namespace
