// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/TreeCopy.h"

#include <fcntl.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <utility>

#include "Helper/Platform/Linux/FileBody.h"

namespace platform {
namespace {

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

/// One copy: remembers its rule and its first failure.
class TreeCopy {
 public:
  explicit TreeCopy(CopyRule rule) : rule_(rule) {}

  /// Copies one item to a free name.
  void copyItem(int fromFolder, const char* from, int toFolder, const char* to, int level) {
    struct stat status {};
    if (::fstatat(fromFolder, from, &status, AT_SYMLINK_NOFOLLOW) != 0) return fail(errno);
    if (S_ISREG(status.st_mode)) {
      fail(copyFile(fromFolder, from, toFolder, to));
    } else if (S_ISDIR(status.st_mode)) {
      copyFolder(fromFolder, from, toFolder, to, level);
    } else if (S_ISLNK(status.st_mode)) {
      fail(CopyLink(fromFolder, from, toFolder, to, status));
    } else {
      fail(EOPNOTSUPP);
    }
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

  static int copyFile(int fromFolder, const char* from, int toFolder, const char* to) {
    // Should the name be a FIFO by now, opening it does not wait, and it is given up at once.
    const FileDescriptor source(
        ::openat(fromFolder, from, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
    struct stat status {};
    if (!source || ::fstat(source.get(), &status) != 0) return errno;
    if (!S_ISREG(status.st_mode)) return EOPNOTSUPP;
    const FileDescriptor target(
        ::openat(toFolder, to, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0600));
    if (!target) return errno;
    int error = CopyFileBytes(source.get(), target.get(), status);
    if (error == 0) error = CopyFileAttributes(source.get(), target.get(), status);
    if (error != 0) ::unlinkat(toFolder, to, 0);
    return error;
  }

  void copyFolder(int fromFolder, const char* from, int toFolder, const char* to, int level) {
    if (level >= kDeepestLevel) return fail(ENAMETOOLONG);
    FolderReader source(OpenFolder(fromFolder, from));
    struct stat status {};
    if (!source || ::fstat(source.descriptor(), &status) != 0) return fail(errno);
    // A mount can lead into the copy itself on ways that the folders above it do not show.
    if (status.st_dev == top_.st_dev && status.st_ino == top_.st_ino) return fail(EINVAL);
    if (::mkdirat(toFolder, to, 0700) != 0) return fail(errno);
    const FileDescriptor target = OpenFolder(toFolder, to);
    if (!target) return fail(errno);
    if (level == 0 && ::fstat(target.get(), &top_) != 0) return fail(errno);
    while (!isLost()) {
      const dirent* entry = source.next();
      if (!entry) break;
      copyItem(source.descriptor(), entry->d_name, target.get(), entry->d_name, level + 1);
    }
    fail(source.error());
    if (!isLost()) fail(CopyFileAttributes(source.descriptor(), target.get(), status));
  }

  const CopyRule rule_;
  int first_ = 0;
  bool lost_ = false;
  struct stat top_ {};
};

std::string FreeName() {
  std::uint64_t number = 0;
  // Should there be no randomness yet, the exclusive creation still protects what is there.
  (void)!::getrandom(&number, sizeof number, GRND_NONBLOCK);
  std::array<char, 32> name;
  std::snprintf(name.data(), name.size(), ".copy-%016llx", static_cast<unsigned long long>(number));
  return name.data();
}

}  // namespace

int CopyTree(const FileLocation& source, const FileLocation& destination, CopyRule rule) {
  struct stat status {};
  const int folder = destination.folder.get();
  const char* name = destination.name.c_str();
  if (::fstatat(source.folder.get(), source.name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
    return errno;
  }
  struct stat existing {};
  if (::fstatat(folder, name, &existing, AT_SYMLINK_NOFOLLOW) == 0) return EEXIST;
  if (S_ISDIR(status.st_mode) && IsWithin(folder, status)) return EINVAL;
  TreeCopy copy(rule);
  const std::string temporary = FreeName();
  copy.copyItem(source.folder.get(), source.name.c_str(), folder, temporary.c_str(), 0);
  // A lone item that failed is not there, and renaming it would only hide why.
  int error = copy.firstError();
  const bool publish = !copy.isLost() && (error == 0 || S_ISDIR(status.st_mode));
  if (publish) {
    const int renaming = RenameToFreeName(folder, temporary.c_str(), folder, name);
    if (renaming == 0) return error;
    if (error == 0) error = renaming;
  }
  (void)RemoveTree(folder, temporary.c_str());  // the failure is the answer, not the tidying
  return error;
}

}  // namespace platform
