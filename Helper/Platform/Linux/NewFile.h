// SPDX-License-Identifier: Apache-2.0
//
// A regular file that gets its name only when it is whole. Where the file system can, it has none
// before (O_TMPFILE), so that a process which is killed leaves nothing behind; else a work name
// (WorkName.h). One thread; no lock.
#pragma once

#include <sys/types.h>

#include <string>

#include "Helper/Platform/FileDescriptor.h"

namespace platform {

enum class IfTaken {
  kFail,    // EEXIST
  kReplace  // a file, a link or a special file gives way; a directory does not (EISDIR)
};

class NewFile {
 public:
  NewFile() = default;
  NewFile(const NewFile&) = delete;
  NewFile& operator=(const NewFile&) = delete;
  /// Drops what has not been named.
  ~NewFile();

  /// Makes it, empty, in a folder that is borrowed until the end. Where nobody else can reach it
  /// before it has a name, it has these permissions already, less the process's umask; else 0600.
  /// An error number or 0.
  [[nodiscard]] int make(int folder, mode_t permissions);
  /// Open for writing.
  [[nodiscard]] int descriptor() const { return item_.get(); }
  /// Gives it its name in its folder. An error number, and then it is not there, or 0.
  [[nodiscard]] int giveName(const char* name, IfTaken rule);

 private:
  [[nodiscard]] int linkTo(const char* name) const;

  int folder_ = -1;
  FileDescriptor item_;
  std::string workName_;  // empty: it has no name yet, or has got its own
};

}  // namespace platform
