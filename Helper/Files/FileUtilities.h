// SPDX-License-Identifier: Apache-2.0
//
// The file utility layer: sequences over the file manager that create directories, copy or move
// items with merging into what is there, and change owners. Main thread; no state, no lock, no log
// line. Paths are zero-terminated UTF-8; one that is not counts as a path where nothing exists.
//
// Codes: 0 done, -1 the source cannot be examined, 5 failed without an error object, 17 a directory
// would replace a file, else the file manager's error code.
#pragma once

#include <cstdint>
#include <string>

#include "Helper/Platform/FileManager.h"

inline constexpr std::int32_t kFileSourceUnreadable = -1;
inline constexpr std::int32_t kFileFailedWithoutError = 5;
inline constexpr std::int32_t kFileExistsAlready = 17;
inline constexpr std::uint32_t kFileDirectoryMode = 0755;

/// Holds the memory of a stretch of file work. Temporaries own themselves; when the scope ends, the
/// memory that they left free goes back to the system, so that one large tree does not make a small
/// helper large for the rest of its life. Scopes may nest.
class ReleasePoolScope {
 public:
  ReleasePoolScope() = default;
  ~ReleasePoolScope();
  ReleasePoolScope(const ReleasePoolScope&) = delete;
  ReleasePoolScope& operator=(const ReleasePoolScope&) = delete;
};

/// Whether anything exists at `path`; a link to nothing does not.
[[nodiscard]] bool FileExists(const char* path);

/// CreateDirectoryWithAttributes() with no names.
[[nodiscard]] std::int32_t CreateDirectory(const char* path, std::uint32_t mode,
                                           bool intermediates);

/// Creates a directory with the permissions `mode` and, where a name is not empty, that owner or
/// group. 0 or the error's code. Kept: a failure without an error object answers 0.
[[nodiscard]] std::int32_t CreateDirectoryWithAttributes(const char* path, std::uint32_t mode,
                                                         const char* ownerName,
                                                         const char* groupName, bool intermediates);

/// Sets attributes on an item and, when it is a directory, on everything below it first. Goes on
/// after failures. 0, 5 when nothing exists at `path`, or the code of the last failure.
[[nodiscard]] std::int32_t SetAttributesRecursively(const char* path,
                                                    const platform::FileAttributes& attributes);

/// Gives an item to `uid` and `gid`: itself only, a link followed (0 or -1), or with everything
/// below it (the codes of SetAttributesRecursively()).
std::int32_t SetItemOwner(const char* path, std::uint32_t uid, std::uint32_t gid, bool recursive);

/// Copies or moves an item, having given the source itself to `uid` and `gid`. Into a directory
/// that is there the item goes under its own name, merged with a directory of that name; a file
/// that is there is replaced. 0, -1, 5, 17 or an error code; 0 whatever a merge achieved.
[[nodiscard]] std::int32_t CopyOrMoveItem(const char* source, const char* destination,
                                          std::uint32_t uid, std::uint32_t gid, bool copy);

/// Copies `source` with CopyOrMoveItem(), giving it to this process's user and group.
[[nodiscard]] std::int32_t CopyDirectory(const char* source, const char* destination);

/// Copies a file between directories, creating the destination directory (0755, with those above
/// it) where it is missing: -1 when that fails. The source becomes this process's own.
[[nodiscard]] std::int32_t CopyFileIntoDirectory(const char* sourceDirectory,
                                                 const char* destinationDirectory,
                                                 const char* fileName);

/// Gives a whole tree to this process's user and group, then moves it to where nothing stands.
/// 0, -1, 5 or an error code; an existing destination makes the move fail.
[[nodiscard]] std::int32_t MoveItemWithOwner(const char* source, const char* destination);

/// Copies or moves `source` to `destination`; where that fails and `source` is no file, item by
/// item, replacing files by files, skipping what fails. Kept: `source` is removed at the end if it
/// is, or has become, an empty directory, even when it was to be copied.
void MergeItem(platform::FileManager& manager, const std::string& source,
               const std::string& destination, bool copy);
