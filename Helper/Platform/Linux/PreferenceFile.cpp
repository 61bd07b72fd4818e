// SPDX-License-Identifier: Apache-2.0
//
// Reading and durably replacing the file of one preference domain.
#include "Helper/Platform/Linux/PreferenceFile.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <thread>

namespace platform {

namespace {

constexpr int kLargestAside = 4;
constexpr mode_t kPrivateMode = 0600;
constexpr mode_t kPermissions = 0777;

std::int64_t Nanoseconds(const timespec& time) {
  return std::int64_t{time.tv_sec} * 1'000'000'000 + time.tv_nsec;
}

PreferenceFileStamp StampOf(const struct stat& status) {
  return {status.st_dev,
          status.st_ino,
          status.st_mode,
          status.st_size,
          Nanoseconds(status.st_mtim),
          Nanoseconds(status.st_ctim)};
}

std::string Describe(const char* step, int error) {
  const char* text = ::strerrordesc_np(error);
  return std::string(step) + ": " + (text ? text : "unknown error");
}

// Reads to the end, but not beyond one byte more than `limit`. False with errno on an error.
bool ReadAll(int file, std::size_t limit, std::size_t expected, std::vector<std::byte>& bytes) {
  // One byte more than expected, so that the end is seen without another resize.
  bytes.resize(std::min(expected, limit) + 1);
  std::size_t length = 0;
  for (;;) {
    if (length == bytes.size()) {
      if (length > limit) return true;
      bytes.resize(std::min(limit + 1, length * 2));
    }
    const ssize_t count = ::read(file, bytes.data() + length, bytes.size() - length);
    if (count < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    if (count == 0) break;
    length += static_cast<std::size_t>(count);
  }
  bytes.resize(length);
  return true;
}

bool WriteAll(int file, const std::vector<std::byte>& bytes) {
  std::size_t written = 0;
  while (written < bytes.size()) {
    const ssize_t count = ::write(file, bytes.data() + written, bytes.size() - written);
    if (count < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    written += static_cast<std::size_t>(count);
  }
  return true;
}

FileDescriptor OpenFolder(const std::string& path) {
  return FileDescriptor(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
}

// Makes `path` and the folders above it that are missing, each of them durably. False with errno.
bool MakeFolders(const std::string& path, mode_t mode) {
  if (::mkdir(path.c_str(), mode) != 0) {
    if (errno == EEXIST) return true;
    const std::size_t slash = path.find_last_of('/');
    if (errno != ENOENT || slash == std::string::npos || slash == 0) return false;
    if (!MakeFolders(path.substr(0, slash), mode)) return false;
    if (::mkdir(path.c_str(), mode) != 0 && errno != EEXIST) return false;
  }
  const std::size_t slash = path.find_last_of('/');
  const FileDescriptor above = OpenFolder(slash == 0 ? "/" : path.substr(0, slash));
  return above && ::fsync(above.get()) == 0;
}

}  // namespace

PreferenceFileStamp StampOfPreferenceFile(const std::string& path) noexcept {
  struct stat status {};
  if (::stat(path.c_str(), &status) != 0) return {};
  return StampOf(status);
}

PreferenceFileContents ReadPreferenceFile(const std::string& path) {
  using State = PreferenceFileContents::State;
  PreferenceFileContents contents;
  const auto fail = [&contents](State state, std::string reason) {
    contents.state = state;
    contents.reason = std::move(reason);
    return std::move(contents);
  };

  // Looked at before it is opened: opening a device may act on it.
  struct stat status {};
  if (::stat(path.c_str(), &status) != 0) {
    if (errno == ENOENT || errno == ENOTDIR) return contents;
    // Symbolic links in a circle: no file, but something that stands in its place.
    if (errno == ELOOP) return fail(State::kCorrupt, Describe("stat", errno));
    return fail(State::kUnreadable, Describe("stat", errno));
  }
  contents.stamp = StampOf(status);
  if (!S_ISREG(status.st_mode)) return fail(State::kCorrupt, "not a regular file");
  const FileDescriptor file(::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
  if (!file) {
    if (errno == ENOENT) return {};
    return fail(State::kUnreadable, Describe("open", errno));
  }
  if (::fstat(file.get(), &status) != 0) return fail(State::kUnreadable, Describe("fstat", errno));
  contents.stamp = StampOf(status);
  if (!S_ISREG(status.st_mode)) return fail(State::kCorrupt, "not a regular file");

  constexpr PropertyListLimits kLimits = StoredPreferenceLimits();
  std::vector<std::byte> bytes;
  if (!ReadAll(file.get(), kLimits.bytes, static_cast<std::size_t>(status.st_size), bytes)) {
    return fail(State::kUnreadable, Describe("read", errno));
  }
  std::string reason;
  std::optional<PropertyList> list = ParsePropertyList(bytes, &reason, kLimits);
  if (!list) return fail(State::kCorrupt, std::move(reason));
  if (list->dictionary() == nullptr) return fail(State::kCorrupt, "no dictionary at its root");
  contents.state = State::kGood;
  contents.values = std::move(*list->dictionary());
  return contents;
}

bool PreferenceFileWriter::fail(const char* step, int error) {
  reason_ = Describe(step, error);
  return false;
}

bool PreferenceFileWriter::openFolder() {
  folder_ = OpenFolder(path_.folder);
  if (folder_) return true;
  if (errno != ENOENT) return fail("open the folder", errno);
  if (!MakeFolders(path_.folder, path_.folderMode)) return fail("make the folder", errno);
  folder_ = OpenFolder(path_.folder);
  return folder_ ? true : fail("open the folder", errno);
}

bool PreferenceFileWriter::lock(std::chrono::milliseconds patience) {
  // Never removed: a writer that waits for a removed lock file would exclude nobody.
  const std::string name = "." + path_.name + ".lock";
  lock_.reset(::openat(folder_.get(), name.c_str(),
                       O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, kPrivateMode));
  if (!lock_) return fail("open the lock file", errno);
  // There is no lock call with a time limit, so a taken lock is asked for again and again.
  const auto deadline = std::chrono::steady_clock::now() + patience;
  std::chrono::milliseconds pause{1};
  while (::flock(lock_.get(), LOCK_EX | LOCK_NB) != 0) {
    if (errno == EINTR) continue;
    if (errno != EWOULDBLOCK) return fail("lock", errno);
    if (std::chrono::steady_clock::now() >= deadline) return fail("wait for the lock", ETIMEDOUT);
    std::this_thread::sleep_for(pause);
    pause = std::min(pause * 2, std::chrono::milliseconds{16});
  }
  return true;
}

bool PreferenceFileWriter::begin(std::chrono::milliseconds patience) {
  return openFolder() && lock(patience);
}

void PreferenceFileWriter::keepAside() const {
  for (int number = 1; number <= kLargestAside; ++number) {
    const std::string aside = path_.name + ".corrupt-" + std::to_string(number);
    // A link keeps the old name in place until the new file replaces it.
    if (::linkat(folder_.get(), path_.name.c_str(), folder_.get(), aside.c_str(), 0) == 0) return;
    if (errno == EEXIST) continue;
    // No links here, or a folder under this name: move it away instead.
    if (::renameat2(folder_.get(), path_.name.c_str(), folder_.get(), aside.c_str(),
                    RENAME_NOREPLACE) == 0 ||
        errno != EEXIST) {
      return;
    }
  }
}

bool PreferenceFileWriter::keepModeAndOwner(int file) {
  mode_t mode = path_.fileMode;
  struct stat old {};
  if (::fstatat(folder_.get(), path_.name.c_str(), &old, AT_SYMLINK_NOFOLLOW) == 0 &&
      S_ISREG(old.st_mode)) {
    struct stat fresh {};
    if (::fstat(file, &fresh) != 0) return fail("fstat the temporary file", errno);
    const bool sameOwner = old.st_uid == fresh.st_uid && old.st_gid == fresh.st_gid;
    // Only the superuser can give a file away. Where that fails the file becomes ours, closed to
    // others: the old permissions were meant for another owner.
    if (!sameOwner && ::fchown(file, old.st_uid, old.st_gid) != 0) return true;
    mode = old.st_mode & kPermissions;
  }
  if (mode == kPrivateMode || ::fchmod(file, mode) == 0) return true;
  return fail("set the mode of the temporary file", errno);
}

bool PreferenceFileWriter::writeTemporary(const std::string& name,
                                          const std::vector<std::byte>& bytes,
                                          FileDescriptor& file) {
  // One name per domain: whoever holds the lock may remove what a dead writer left behind.
  if (::unlinkat(folder_.get(), name.c_str(), 0) != 0 && errno != ENOENT) {
    return fail("remove the old temporary file", errno);
  }
  file.reset(::openat(folder_.get(), name.c_str(),
                      O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kPrivateMode));
  if (!file) return fail("create the temporary file", errno);
  if (!WriteAll(file.get(), bytes)) return fail("write the temporary file", errno);
  if (!keepModeAndOwner(file.get())) return false;
  if (::fsync(file.get()) != 0) return fail("fsync the temporary file", errno);
  if (::renameat(folder_.get(), name.c_str(), folder_.get(), path_.name.c_str()) != 0) {
    return fail("rename the temporary file", errno);
  }
  return true;
}

bool PreferenceFileWriter::replace(const std::vector<std::byte>& bytes) {
  const std::string temporary = "." + path_.name + ".tmp";
  FileDescriptor file;
  if (!writeTemporary(temporary, bytes, file)) {
    if (file) static_cast<void>(::unlinkat(folder_.get(), temporary.c_str(), 0));  // best effort
    return false;
  }
  if (::fsync(folder_.get()) != 0) return fail("fsync the folder", errno);
  struct stat status {};
  if (::fstat(file.get(), &status) != 0) return fail("fstat the new file", errno);
  stamp_ = StampOf(status);
  return true;
}

bool PreferenceFileWriter::settle() {
  struct stat status {};
  // What is no regular file has nothing of its own to settle, and a device may act on being opened.
  if (::fstatat(folder_.get(), path_.name.c_str(), &status, 0) == 0 && S_ISREG(status.st_mode)) {
    const FileDescriptor file(
        ::openat(folder_.get(), path_.name.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
    if (!file && errno != ENOENT) return fail("open the file", errno);
    if (file && ::fsync(file.get()) != 0) return fail("fsync the file", errno);
  }
  return ::fsync(folder_.get()) == 0 ? true : fail("fsync the folder", errno);
}

}  // namespace platform
