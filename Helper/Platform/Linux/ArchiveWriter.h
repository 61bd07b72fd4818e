// SPDX-License-Identifier: Apache-2.0
//
// Puts the items of an archive below one open folder. No name and no link, whether it was there
// before, comes from the archive or is swapped in meanwhile, leads an item out of that folder. One
// thread; no lock.
#pragma once

#include <sys/stat.h>

#include <cstddef>
#include <map>
#include <span>
#include <string>
#include <string_view>
#include <utility>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Linux/NewFile.h"

namespace platform {

/// The path of an item below the destination: components without "." and empty ones; empty for the
/// destination itself. An error number for a name that must not be extracted: absolute, or with
/// ".." (EINVAL).
[[nodiscard]] int ArchiveItemPath(std::string_view name, std::string& path);

/// What an item carries beside its content. A time of UTIME_OMIT is not set.
struct ArchiveItemStatus {
  mode_t permissions = 0;  // of which the lower nine bits are set; none of them: 0644, 0755
  timespec accessed{0, UTIME_OMIT};
  timespec modified{0, UTIME_OMIT};
};

/// Items take the place of files, links and special files of their name. A directory never gives
/// way (EISDIR); it is merged into, and keeps its own permissions and times if it was there before.
/// Missing folders are made with mode 0755. Every call answers an error number or 0.
class ArchiveWriter {
 public:
  /// Takes the destination, a folder.
  explicit ArchiveWriter(FileDescriptor destination) : root_(std::move(destination)) {}

  /// Makes a folder, to which nobody else has access before finishFolders().
  [[nodiscard]] int makeFolder(const std::string& path, const ArchiveItemStatus& status);
  /// Makes a symbolic link with any target.
  [[nodiscard]] int makeLink(const std::string& path, const std::string& target,
                             const ArchiveItemStatus& status);

  /// Begins a file in the folder of `path`, to be finished before anything else is made; what is
  /// not finished leaves nothing behind.
  [[nodiscard]] int beginFile(const std::string& path, const ArchiveItemStatus& status,
                              NewFile& file);
  [[nodiscard]] static int write(const NewFile& file, std::span<const std::byte> bytes,
                                 off_t offset);
  /// Gives the file its status and, at last, its name.
  [[nodiscard]] int finishFile(NewFile& file, const std::string& path,
                               const ArchiveItemStatus& status);

  /// Removes a file, and then the folders made here that have become empty by that.
  void removeFile(const std::string& path);

  /// Gives the folders made here their permissions and times: deepest first, and last of all,
  /// because everything put into a folder changes its times.
  void finishFolders();

  [[nodiscard]] int root() const { return root_.get(); }
  /// How many folders were made, those that no item named included.
  [[nodiscard]] std::size_t foldersMade() const { return folders_.size(); }

 private:
  [[nodiscard]] int openFolderOf(const std::string& path);
  [[nodiscard]] int openOrMakeFolder(std::string_view path);

  FileDescriptor root_;
  // The folder of the last item: items of one folder stand together as a rule.
  FileDescriptor folder_;
  std::string folderPath_;
  std::map<std::string, ArchiveItemStatus> folders_;
};

}  // namespace platform
