// SPDX-License-Identifier: Apache-2.0
//
// SQLite opens the file by its path; that nobody can put another in its place follows from the
// folder, which is ours alone.
#include "Helper/Platform/Linux/VoicemailTokenFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

namespace platform {
namespace {

constexpr mode_t kFolderMode = 0700;
constexpr mode_t kFileMode = 0600;
constexpr mode_t kOthers = 0077;
constexpr int kMostAside = 4;
constexpr const char* kLogSuffix = "-wal";
constexpr const char* kIndexSuffix = "-shm";

bool Fail(std::string& reason, const char* step, int error) {
  const char* text = ::strerrordesc_np(error);
  reason = std::string(step) + ": " + (text ? text : "unknown error");
  return false;
}

bool IsOurs(const struct stat& status) { return status.st_uid == ::geteuid(); }

std::string FolderOf(const std::string& path) {
  const std::size_t slash = path.find_last_of('/');
  return slash == 0 ? "/" : path.substr(0, slash);
}

}  // namespace

VoicemailTokenFile::VoicemailTokenFile(std::string path)
    : path_(std::move(path)),
      folderPath_(FolderOf(path_)),
      name_(path_.substr(path_.find_last_of('/') + 1)) {}

bool VoicemailTokenFile::openFolder(std::string& reason) {
  const bool made = ::mkdir(folderPath_.c_str(), kFolderMode) == 0;
  if (!made && errno != EEXIST) return Fail(reason, "make the folder", errno);
  folder_.reset(::open(folderPath_.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  struct stat status {};
  if (!folder_ || ::fstat(folder_.get(), &status) != 0) {
    return Fail(reason, "open the folder", errno);
  }
  if (!IsOurs(status)) return Fail(reason, "open the folder", EPERM);
  if ((status.st_mode & kOthers) != 0 && ::fchmod(folder_.get(), kFolderMode) != 0) {
    return Fail(reason, "close the folder to others", errno);
  }
  if (!made) return true;
  const FileDescriptor above(
      ::open(FolderOf(folderPath_).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return above && ::fsync(above.get()) == 0 ? true : Fail(reason, "fsync above the folder", errno);
}

bool VoicemailTokenFile::createFile(std::string& reason) {
  constexpr int kFlags = O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC;
  const FileDescriptor file(::openat(folder_.get(), name_.c_str(), kFlags, kFileMode));
  if (!file) return Fail(reason, "create the file", errno);
  return ::fsync(folder_.get()) == 0 ? true : Fail(reason, "fsync the folder", errno);
}

bool VoicemailTokenFile::prepare(std::string& reason) {
  if (!openFolder(reason)) return false;
  struct stat status {};
  // Only looked at: closing the file again would take the locks away that this process has on it.
  if (::fstatat(folder_.get(), name_.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
    return errno == ENOENT ? createFile(reason) : Fail(reason, "look at the file", errno);
  }
  if (!S_ISREG(status.st_mode)) return Fail(reason, "not a regular file", EINVAL);
  if (!IsOurs(status)) return Fail(reason, "open the file", EPERM);
  if ((status.st_mode & kOthers) != 0 &&
      ::fchmodat(folder_.get(), name_.c_str(), kFileMode, 0) != 0) {
    return Fail(reason, "close the file to others", errno);
  }
  return true;
}

std::string VoicemailTokenFile::databaseName() const {
  struct statvfs system {};
  const bool readOnly = ::fstatvfs(folder_.get(), &system) == 0 && (system.f_flag & ST_RDONLY) != 0;
  const bool hasLog = ::faccessat(folder_.get(), (name_ + kLogSuffix).c_str(), F_OK, 0) == 0;
  return readOnly && !hasLog ? "file:" + path_ + "?immutable=1" : path_;
}

std::string VoicemailTokenFile::nameAside() const {
  for (int number = 1; number < kMostAside; ++number) {
    std::string name = name_ + ".corrupt-" + std::to_string(number);
    if (::faccessat(folder_.get(), name.c_str(), F_OK, AT_SYMLINK_NOFOLLOW) != 0) return name;
  }
  return name_ + ".corrupt-" + std::to_string(kMostAside);
}

std::string VoicemailTokenFile::setAside(std::string& reason) {
  const int folder = folder_.get();
  const std::string log = name_ + kLogSuffix;
  const std::string aside = nameAside();
  const std::string logAside = aside + kLogSuffix;
  (void)::unlinkat(folder, logAside.c_str(), 0);  // of a file that is replaced here
  // The log goes first: left without its database it would be taken for that of the next one.
  if (::renameat(folder, log.c_str(), folder, logAside.c_str()) != 0 && errno != ENOENT) {
    (void)Fail(reason, "set the log aside", errno);
    return {};
  }
  if (::renameat(folder, name_.c_str(), folder, aside.c_str()) != 0) {
    (void)Fail(reason, "set the file aside", errno);
    return {};
  }
  (void)::unlinkat(folder, (name_ + kIndexSuffix).c_str(), 0);  // is made anew
  (void)::fsync(folder);  // after a power cut the damaged file may just be met again
  return folderPath_ + '/' + aside;
}

}  // namespace platform
