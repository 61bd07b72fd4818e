// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/TreeCopy.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>
#include <utility>

#include "Helper/Platform/Linux/FileBody.h"
#include "Helper/Platform/Linux/NewFile.h"
#include "Helper/Platform/Linux/WorkName.h"

namespace platform {
namespace {

constexpr mode_t kPermissionBits = 0777;

int CopyLink(int fromFolder, const char* from, int toFolder, const char* to,
             const struct stat& status) {
  std::array<char, PATH_MAX> target;
  const ssize_t length = ::readlinkat(fromFolder, from, target.data(), target.size() - 1);
  if (length < 0) return errno;
  target[static_cast<std::size_t>(length)] = '\0';
  if (::symlinkat(target.data(), toFolder, to) != 0) return errno;
  // Nothing depends on a link's owner and times: what cannot be kept is let go.
  (void)!::fchownat(toFolder, to, status.st_uid, status.st_gid, AT_SYMLINK_NOFOLLOW);
  const timespec times[2] = {status.st_atim, status.st_mtim};
  (void)::utimensat(toFolder, to, times, AT_SYMLINK_NOFOLLOW);
  return 0;
}

int OpenSource(int folder, const char* name, FileDescriptor& source, struct stat& status) {
  // Should the name be a FIFO by now, opening it does not wait, and it is given up at once.
  source.reset(::openat(folder, name, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
  if (!source || ::fstat(source.get(), &status) != 0) return errno;
  return S_ISREG(status.st_mode) ? 0 : EOPNOTSUPP;
}

int CopyContent(int from, int to, const struct stat& status) {
  const int error = CopyFileBytes(from, to, status);
  return error != 0 ? error : CopyFileAttributes(from, to, status);
}

/// Copies a file that stands alone to a name that must be free.
int CopyLoneFile(int fromFolder, const char* from, int toFolder, const char* to) {
  FileDescriptor source;
  NewFile target;
  struct stat status {};
  int error = OpenSource(fromFolder, from, source, status);
  if (error == 0) error = target.make(toFolder, status.st_mode & kPermissionBits);
  if (error == 0) error = CopyContent(source.get(), target.descriptor(), status);
  return error != 0 ? error : target.giveName(to, IfTaken::kFail);
}

/// The copy of one tree: remembers its rule and its first failure.
class TreeCopy {
 public:
  explicit TreeCopy(CopyRule rule) : rule_(rule) {}

  /// Copies a folder's content and attributes into `top`, which is new.
  void copyTop(int fromFolder, const char* from, int top) {
    FileDescriptor source = OpenFolder(fromFolder, from);
    struct stat status {};
    if (!source || ::fstat(source.get(), &status) != 0 || ::fstat(top, &top_) != 0) {
      return fail(errno);
    }
    copyFolder(std::move(source), status, top, 0);
  }

  [[nodiscard]] int firstError() const { return first_; }
  /// Whether what has been copied is worth nothing.
  [[nodiscard]] bool isLost() const {
    return lost_ || (rule_ == CopyRule::kAllOrNothing && first_ != 0);
  }

 private:
  void fail(int error) {
    if (first_ == 0) first_ = error;
    lost_ = lost_ || EndsEveryWrite(error);
  }

  /// Copies one item to its own name in a folder that is new. `type` is the directory entry's.
  void copyItem(int fromFolder, const char* name, unsigned char type, int toFolder, int level) {
    if (type == DT_REG) return fail(copyFile(fromFolder, name, toFolder));
    struct stat status {};
    if (::fstatat(fromFolder, name, &status, AT_SYMLINK_NOFOLLOW) != 0) return fail(errno);
    if (S_ISREG(status.st_mode)) {
      fail(copyFile(fromFolder, name, toFolder));
    } else if (S_ISDIR(status.st_mode)) {
      makeFolder(fromFolder, name, toFolder, level);
    } else if (S_ISLNK(status.st_mode)) {
      fail(CopyLink(fromFolder, name, toFolder, name, status));
    } else {
      fail(EOPNOTSUPP);
    }
  }

  static int copyFile(int fromFolder, const char* name, int toFolder) {
    FileDescriptor source;
    struct stat status {};
    if (const int error = OpenSource(fromFolder, name, source, status)) return error;
    // Nobody else gets into the folders of the copy before they have their attributes.
    const FileDescriptor target(::openat(toFolder, name,
                                         O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC,
                                         status.st_mode & kPermissionBits));
    if (!target) return errno;
    const int error = CopyContent(source.get(), target.get(), status);
    if (error != 0) ::unlinkat(toFolder, name, 0);
    return error;
  }

  void makeFolder(int fromFolder, const char* name, int toFolder, int level) {
    if (level >= kDeepestLevel) return fail(ENAMETOOLONG);
    FileDescriptor source = OpenFolder(fromFolder, name);
    struct stat status {};
    if (!source || ::fstat(source.get(), &status) != 0) return fail(errno);
    // A mount can lead into the copy itself on ways that the folders above it do not show.
    if (status.st_dev == top_.st_dev && status.st_ino == top_.st_ino) return fail(EINVAL);
    if (::mkdirat(toFolder, name, 0700) != 0) return fail(errno);
    const FileDescriptor target = OpenFolder(toFolder, name);
    if (!target) return fail(errno);
    copyFolder(std::move(source), status, target.get(), level);
  }

  void copyFolder(FileDescriptor from, const struct stat& status, int to, int level) {
    FolderReader source(std::move(from));
    if (!source) return fail(errno);
    while (!isLost()) {
      const dirent* entry = source.next();
      if (!entry) break;
      copyItem(source.descriptor(), entry->d_name, entry->d_type, to, level + 1);
    }
    fail(source.error());
    if (!isLost()) fail(CopyFileAttributes(source.descriptor(), to, status));
  }

  const CopyRule rule_;
  int first_ = 0;
  bool lost_ = false;
  struct stat top_ {};
};

/// Copies a folder with everything below it to a name that must be free.
int CopyWholeTree(int fromFolder, const char* from, int toFolder, const char* to, CopyRule rule) {
  WorkItem work;
  if (const int error = MakeWorkItem(toFolder, WorkKind::kFolder, work)) return error;
  TreeCopy copy(rule);
  copy.copyTop(fromFolder, from, work.item.get());
  int error = copy.firstError();
  if (!copy.isLost()) {
    const int renaming = RenameToFreeName(toFolder, work.name.c_str(), toFolder, to);
    if (renaming == 0) return error;
    if (error == 0) error = renaming;
  }
  (void)RemoveTree(toFolder, work.name.c_str());  // the failure is the answer, not the tidying
  return error;
}

}  // namespace

int CopyTree(const FileLocation& source, const FileLocation& destination, CopyRule rule) {
  struct stat status {};
  struct stat existing {};
  const int fromFolder = source.folder();
  const int toFolder = destination.folder();
  const char* from = source.name.c_str();
  const char* to = destination.name.c_str();
  if (::fstatat(fromFolder, from, &status, AT_SYMLINK_NOFOLLOW) != 0) return errno;
  if (::fstatat(toFolder, to, &existing, AT_SYMLINK_NOFOLLOW) == 0) return EEXIST;
  if (S_ISREG(status.st_mode)) return CopyLoneFile(fromFolder, from, toFolder, to);
  if (S_ISLNK(status.st_mode)) return CopyLink(fromFolder, from, toFolder, to, status);
  if (!S_ISDIR(status.st_mode)) return EOPNOTSUPP;
  if (IsWithin(toFolder, status)) return EINVAL;
  return CopyWholeTree(fromFolder, from, toFolder, to, rule);
}

}  // namespace platform
