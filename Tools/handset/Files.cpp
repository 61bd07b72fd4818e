// SPDX-License-Identifier: Apache-2.0
//
// Small whole-file steps of the tool. One thread, no lock.
#include "Tools/handset/Files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <utility>

#include "Tools/handset/Failure.h"

namespace handset {
namespace {

using platform::FileDescriptor;

/// A new file beside `path`, so that a rename can put it in place.
std::pair<FileDescriptor, std::string> CreateBeside(const std::string& path, mode_t mode) {
  std::string temporary = path + ".XXXXXX";
  FileDescriptor file(mkostemp(temporary.data(), O_CLOEXEC));
  if (!file) throw Failure::FromErrno("create " + path);
  if (fchmod(file.get(), mode) != 0) throw Failure::FromErrno("chmod " + temporary);
  return {std::move(file), std::move(temporary)};
}

void RenameInto(const std::string& temporary, const std::string& path) {
  if (std::rename(temporary.c_str(), path.c_str()) != 0) {
    const int error = errno;
    unlink(temporary.c_str());
    throw Failure::FromErrno("replace " + path, error);
  }
}

}  // namespace

std::string ReadWholeFile(const std::string& path) {
  const FileDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  if (!file) throw Failure::FromErrno("open " + path);
  std::string text;
  std::array<char, 16384> buffer{};
  for (;;) {
    const ssize_t count = read(file.get(), buffer.data(), buffer.size());
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) throw Failure::FromErrno("read " + path);
    if (count == 0) return text;
    text.append(buffer.data(), static_cast<std::size_t>(count));
  }
}

bool WriteAll(int descriptor, std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t count = write(descriptor, bytes.data(), bytes.size());
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return false;
    bytes.remove_prefix(static_cast<std::size_t>(count));
  }
  return true;
}

void ReplaceFile(const std::string& path, std::string_view bytes, mode_t mode) {
  const auto [file, temporary] = CreateBeside(path, mode);
  if (!WriteAll(file.get(), bytes)) throw Failure::FromErrno("write " + temporary);
  RenameInto(temporary, path);
}

void CopyExecutable(int source, const std::string& path) {
  struct stat facts {};
  if (fstat(source, &facts) != 0) throw Failure::FromErrno("stat the source of " + path);
  auto [file, temporary] = CreateBeside(path, 0755);
  std::array<char, 65536> buffer{};
  for (off_t offset = 0;;) {
    const ssize_t count = pread(source, buffer.data(), buffer.size(), offset);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) throw Failure::FromErrno("read the source of " + path);
    if (count == 0) break;
    if (!WriteAll(file.get(), {buffer.data(), static_cast<std::size_t>(count)})) {
      throw Failure::FromErrno("write " + temporary);
    }
    offset += count;
  }
  // A file that somebody still has open for writing cannot be executed.
  file.reset();
  RenameInto(temporary, path);
}

void MakeDirectories(const std::string& path) {
  for (std::size_t end = path.find('/', 1);; end = path.find('/', end + 1)) {
    const std::string directory = path.substr(0, end);
    struct stat facts {};
    const bool there = stat(directory.c_str(), &facts) == 0;
    if (there && !S_ISDIR(facts.st_mode)) throw Failure(directory + " is not a directory");
    if (!there && (mkdir(directory.c_str(), 0755) != 0 || chmod(directory.c_str(), 0755) != 0)) {
      throw Failure::FromErrno("mkdir " + directory);
    }
    if (end == std::string::npos) return;
  }
}

FileDescriptor OpenExecutable(const std::string& path, const std::string& what) {
  FileDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (!file) throw Failure::FromErrno(what + " " + path);
  struct stat facts {};
  if (fstat(file.get(), &facts) != 0) throw Failure::FromErrno(what + " " + path);
  if (!S_ISREG(facts.st_mode) || (facts.st_mode & 0111U) == 0) {
    throw Failure(what + " " + path + ": not an executable file");
  }
  return file;
}

std::string LastComponent(const std::string& path) {
  const std::size_t slash = path.find_last_of('/');
  return slash == std::string::npos ? path : path.substr(slash + 1);
}

}  // namespace handset
