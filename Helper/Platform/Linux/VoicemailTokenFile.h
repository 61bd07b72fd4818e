// SPDX-License-Identifier: Apache-2.0
//
// The file that the voicemail tokens are kept in: closed to everybody else, never reached over a
// link, and set aside when it turns out to be damaged. Only the store that owns it calls, under its
// lock.
#pragma once

#include <string>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {

class VoicemailTokenFile {
 public:
  /// `path` is absolute. Its folder is made with the file; the folder above it must be there.
  explicit VoicemailTokenFile(std::string path);

  /// Makes folder (0700) and file (0600) where they are missing, durably, and closes both to others
  /// where they are not closed. False, with the reason, when that fails, or where either is a
  /// symbolic link, of another kind, or somebody else's.
  [[nodiscard]] bool prepare(std::string& reason);

  /// What SQLite is to open: the path, or, on a file system that nobody can write to and without
  /// changes that wait in a log, a name that does without one.
  [[nodiscard]] std::string databaseName() const;

  /// Gives the file and its log other names, so that a new one can be made in its place: the path
  /// with `.corrupt-1` to `.corrupt-4` behind it, the first that is free, or the last. The new
  /// path; empty, with the reason, when that fails.
  [[nodiscard]] std::string setAside(std::string& reason);

  [[nodiscard]] const std::string& path() const { return path_; }

 private:
  [[nodiscard]] bool openFolder(std::string& reason);
  [[nodiscard]] bool createFile(std::string& reason);
  [[nodiscard]] std::string nameAside() const;

  const std::string path_;
  const std::string folderPath_;
  const std::string name_;
  FileDescriptor folder_;
};

}  // namespace platform
