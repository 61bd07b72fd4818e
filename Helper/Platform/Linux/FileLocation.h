// SPDX-License-Identifier: Apache-2.0
//
// Turns a place into an open folder and a name in it, so that what follows acts below a descriptor
// and cannot be led elsewhere by a link that is swapped in meanwhile. No state, any thread.
#pragma once

#include <dirent.h>
#include <sys/stat.h>

#include <memory>
#include <string>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/FileManager.h"

namespace platform {

/// A code for failures that have no error object; else codes are error numbers, and 0 is success.
inline constexpr int kNoErrorObject = -1;

/// Each level of a tree that is walked holds up to two descriptors; deeper ones fail with
/// ENAMETOOLONG before the process runs out of them.
inline constexpr int kDeepestLevel = 200;

using SharedFolder = std::shared_ptr<const FileDescriptor>;

/// What a place remembers from one item below its path to the next.
struct OpenFolders {
  SharedFolder root;
  std::string path;     // of `folder` below the root
  SharedFolder folder;  // of the last item; null when it could not be opened
};

/// An item: the folder that holds it, open, and its name there ("." for the root directory).
struct FileLocation {
  SharedFolder holder;
  std::string name;

  [[nodiscard]] int folder() const { return holder->get(); }
};

/// Finds the folder of a place. 0, kNoErrorObject for the empty path, or why it cannot be opened.
[[nodiscard]] int Locate(const FilePlace& place, FileLocation& location);

/// Opens what stands at `subpath` below the folder `root` if no link leads to it or away from it;
/// it may not be a link itself either (ELOOP).
[[nodiscard]] FileDescriptor OpenBeneath(int root, const std::string& subpath, int flags);

/// Renames within or between folders, to a name that must be free (EEXIST). An error number or 0.
[[nodiscard]] int RenameToFreeName(int fromFolder, const char* from, int toFolder, const char* to);

/// Whether the directory `inner`, or one above it, is `outer`.
[[nodiscard]] bool IsWithin(int inner, const struct stat& outer);

/// Removes an item with everything below it. The first failure's error number, or 0.
[[nodiscard]] int RemoveTree(int folder, const char* name, int level = 0);

/// Reads a directory's names, "." and ".." left out.
class FolderReader {
 public:
  /// Takes the descriptor, which must be open for reading.
  explicit FolderReader(FileDescriptor folder);
  [[nodiscard]] explicit operator bool() const { return stream_ != nullptr; }
  [[nodiscard]] int descriptor() const { return ::dirfd(stream_.get()); }
  /// The next entry, valid until the next call; null at the end and on an error.
  [[nodiscard]] const dirent* next();
  void rewind() { ::rewinddir(stream_.get()); }
  /// Why the last next() answered null: an error number, or 0 at the end.
  [[nodiscard]] int error() const { return error_; }

 private:
  struct Closer {
    void operator()(DIR* stream) const { ::closedir(stream); }
  };
  std::unique_ptr<DIR, Closer> stream_;
  int error_ = 0;
};

/// Opens a directory in `folder` for reading, a link not followed.
[[nodiscard]] FileDescriptor OpenFolder(int folder, const char* name);

}  // namespace platform
