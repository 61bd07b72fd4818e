// SPDX-License-Identifier: Apache-2.0
//
// The file manager: creates, copies, moves, removes and lists what stands in the file system. Any
// thread; no state. Paths are zero-free UTF-8 or whatever bytes the file system gave as a name.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/SharedService.h"

namespace platform {

/// The error object of a failed operation: its code, an error number of the host (errno(3)). A
/// failing operation writes the slot that it is given, unless it has no error object to give; a
/// successful one leaves the slot alone, so an old error stays in it.
using FileError = std::optional<std::int32_t>;

/// What a file manager keeps open for a place.
struct OpenFolders;

/// Where an item stands. Symbolic links in `path` are followed up to its last component, and by
/// what follows them at the end, only if they belong to root or to this process's user (EACCES):
/// nobody else leads the process anywhere. `subpath`, relative to the directory `path`, is never
/// led anywhere else by a link above its last component: such an item cannot be reached (ELOOP). An
/// empty `path` is the path that could not be decoded: nothing exists there, and every operation on
/// it fails without an error object.
///
/// A place that is used for one item of a directory after another, by giving it another `subpath`,
/// is reached faster than a new one: it remembers, shared with its copies, which folders are open.
/// One thread uses a place and its copies.
struct FilePlace {
  FilePlace(std::string whole) : path(std::move(whole)) {}  // NOLINT: a path is a place
  FilePlace(const char* whole) : path(whole) {}             // NOLINT
  FilePlace(std::string folder, std::string below)
      : path(std::move(folder)), subpath(std::move(below)) {}

  std::string path;
  std::string subpath;
  mutable std::shared_ptr<OpenFolders> opened;  // the file manager's own
};

enum class FileKind { kAbsent, kDirectory, kOther };

/// What to set on an item; what is absent, or an empty name, is left as it is. A name wins over the
/// number beside it.
struct FileAttributes {
  std::optional<std::uint32_t> permissions{};  // the lower twelve mode bits
  std::string ownerName{};
  std::string groupName{};
  std::optional<std::uint32_t> ownerId{};
  std::optional<std::uint32_t> groupId{};
};

class FileManager {
 public:
  virtual ~FileManager() = default;

  /// What exists there, a link at the end followed: a link to nothing is absent, and a link that is
  /// not followed is kOther.
  [[nodiscard]] virtual FileKind kind(const FilePlace& place) = 0;

  /// The mode as stat(2) gives it, type bits included, links followed; none when stat fails.
  [[nodiscard]] virtual std::optional<std::uint32_t> mode(const std::string& path) = 0;

  /// Everything below the directory, relative to it, a directory before what it holds. Links are
  /// listed, not entered; what cannot be read is listed without what is in it, and so are the
  /// directories 200 levels below. A listing ends after 64 MiB of paths.
  [[nodiscard]] virtual std::vector<std::string> subpaths(const std::string& path) = 0;

  /// Makes a directory with exactly these attributes, whatever the process's umask. With
  /// `intermediates` the missing directories above it are made likewise, and a directory that is
  /// there already is a success that changes nothing; without, it is an error (EEXIST). A name that
  /// the user database does not know is an error (EINVAL), and nothing is made.
  virtual bool createDirectory(const FilePlace& place, bool intermediates,
                               const FileAttributes& attributes, FileError* error) = 0;

  /// Copies a file, a link (as a link) or a whole tree to a place where nothing stands (EEXIST).
  /// Permissions, times, extended attributes and, where the process may, owners go with it; set-id
  /// bits, file capabilities and security labels do not. Two hard links become two files. A device,
  /// FIFO or socket is not copied and not opened: it fails with EOPNOTSUPP. In a tree the rest
  /// still arrives when an item fails, and the first item's error is the answer; when no more can
  /// be written at all (a full disk) nothing is left behind. A tree is not copied into itself
  /// (EINVAL), nor beyond 200 levels (ENAMETOOLONG). Nothing half-written ever stands under the
  /// final name.
  virtual bool copyItem(const FilePlace& source, const FilePlace& destination,
                        FileError* error) = 0;

  /// Moves an item to a place where nothing stands (EEXIST). To another file system it is copied as
  /// copyItem() does, all or nothing, and the source is then removed.
  virtual bool moveItem(const FilePlace& source, const FilePlace& destination,
                        FileError* error) = 0;

  /// Removes an item; a directory with everything in it; a link, not what it points to. Goes on
  /// after a failure and answers the first.
  virtual bool removeItem(const FilePlace& place, FileError* error) = 0;

  /// rmdir(2): removes a directory only if it is empty.
  virtual bool removeEmptyDirectory(const std::string& path) = 0;

  /// Sets attributes on the item itself: on a link, not on what it points to, and a link has no
  /// permissions to set.
  virtual bool setAttributes(const FileAttributes& attributes, const FilePlace& place,
                             FileError* error) = 0;

  /// chown(2): gives an item to a user and a group, a link at the end followed.
  virtual bool changeOwner(const std::string& path, std::uint32_t uid, std::uint32_t gid) = 0;
};

template <>
FileManager& DefaultProvider<FileManager>();

}  // namespace platform
