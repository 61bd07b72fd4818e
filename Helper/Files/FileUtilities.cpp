// SPDX-License-Identifier: Apache-2.0
#include "Helper/Files/FileUtilities.h"

#include <libgen.h>
#include <malloc.h>
#include <unistd.h>

#include <algorithm>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

#include "Helper/Platform/Utf8.h"

using platform::FileAttributes;
using platform::FileError;
using platform::FileKind;
using platform::FileManager;
using platform::FilePlace;

namespace {

/// Base names and parent folders are taken from a path of at most this many bytes.
constexpr std::size_t kLongestPath = 1024;
/// Kept: the test for a directory is this one bit of the mode, which sockets and block devices
/// have too.
constexpr std::uint32_t kDirectoryBit = 0x4000;

FileManager& Manager() { return platform::Shared<FileManager>(); }

/// The path as the file manager takes it: empty when it cannot be decoded.
std::string PathOf(const char* path) {
  return platform::IsUtf8(path) ? std::string(path) : std::string();
}

std::string BaseNameOf(const std::string& path) {
  std::string text = path.substr(0, kLongestPath);
  // The POSIX one: "a/b/" is named "b". It works on the copy that it is given.
  return ::basename(text.data());  // NOLINT(concurrency-mt-unsafe)
}

/// The folder of what stands `below` a destination.
FilePlace ParentOf(const std::string& destination, std::string_view below) {
  const std::size_t room = kLongestPath - std::min(kLongestPath, destination.size() + 1);
  below = below.substr(0, room);
  const std::size_t slash = below.rfind('/');
  return {destination, std::string(slash == std::string_view::npos ? "" : below.substr(0, slash))};
}

bool CopyOrMove(FileManager& manager, const FilePlace& source, const FilePlace& destination,
                bool copy, FileError* error) {
  return copy ? manager.copyItem(source, destination, error)
              : manager.moveItem(source, destination, error);
}

}  // namespace

ReleasePoolScope::~ReleasePoolScope() { (void)::malloc_trim(0); }

bool FileExists(const char* path) { return Manager().kind(PathOf(path)) != FileKind::kAbsent; }

std::int32_t CreateDirectory(const char* path, std::uint32_t mode, bool intermediates) {
  return CreateDirectoryWithAttributes(path, mode, "", "", intermediates);
}

std::int32_t CreateDirectoryWithAttributes(const char* path, std::uint32_t mode,
                                           const char* ownerName, const char* groupName,
                                           bool intermediates) {
  const FileAttributes attributes{
      .permissions = mode, .ownerName = ownerName, .groupName = groupName};
  FileError error;
  const bool created = Manager().createDirectory(PathOf(path), intermediates, attributes, &error);
  return !created && error ? *error : 0;
}

std::int32_t SetAttributesRecursively(const char* path, const FileAttributes& attributes) {
  FileManager& manager = Manager();
  const std::string root = PathOf(path);
  const FileKind kind = manager.kind(root);
  if (kind == FileKind::kAbsent) return kFileFailedWithoutError;
  FileError error;
  std::int32_t last = 0;
  if (kind == FileKind::kDirectory) {
    // Kept: nothing clears the slot, so a failure without an error object of its own counts with
    // the one before it.
    FilePlace item(root, "");
    for (std::string& subpath : manager.subpaths(root)) {
      item.subpath = std::move(subpath);
      if (!manager.setAttributes(attributes, item, &error) && error) last = *error;
    }
  }
  if (!manager.setAttributes(attributes, root, &error) && error) return *error;
  return last;
}

std::int32_t SetItemOwner(const char* path, std::uint32_t uid, std::uint32_t gid, bool recursive) {
  if (!recursive) return Manager().changeOwner(path, uid, gid) ? 0 : -1;
  return SetAttributesRecursively(path, {.ownerId = uid, .groupId = gid});
}

std::int32_t CopyOrMoveItem(const char* source, const char* destination, std::uint32_t uid,
                            std::uint32_t gid, bool copy) {
  FileManager& manager = Manager();
  const std::optional<std::uint32_t> mode = manager.mode(source);
  if (!mode) return kFileSourceUnreadable;
  const std::string from = PathOf(source);
  std::string to = PathOf(destination);
  switch (manager.kind(to)) {
    case FileKind::kAbsent: {
      (void)manager.changeOwner(source, uid, gid);  // the copy is tried whoever owns the source
      FileError error;
      if (CopyOrMove(manager, from, to, copy, &error)) return 0;
      return error.value_or(kFileFailedWithoutError);
    }
    case FileKind::kDirectory:
      // A name that cannot be decoded leads nowhere, so that nothing is removed for its sake.
      to = PathOf((to + '/' + BaseNameOf(source)).c_str());
      // What cannot be removed makes the merge fail, which is not reported.
      if (manager.kind(to) == FileKind::kOther) (void)manager.removeItem(to, nullptr);
      break;
    case FileKind::kOther:
      if ((*mode & kDirectoryBit) != 0) return kFileExistsAlready;
      (void)manager.removeItem(to, nullptr);
      break;
  }
  (void)manager.changeOwner(source, uid, gid);
  MergeItem(manager, from, to, copy);
  return 0;
}

std::int32_t CopyDirectory(const char* source, const char* destination) {
  return CopyOrMoveItem(source, destination, ::getuid(), ::getgid(), /*copy=*/true);
}

std::int32_t CopyFileIntoDirectory(const char* sourceDirectory, const char* destinationDirectory,
                                   const char* fileName) {
  const ReleasePoolScope pool;
  if (!FileExists(destinationDirectory) &&
      CreateDirectory(destinationDirectory, kFileDirectoryMode, /*intermediates=*/true) != 0) {
    return -1;
  }
  const std::string source = std::string(sourceDirectory) + '/' + fileName;
  const std::string destination = std::string(destinationDirectory) + '/' + fileName;
  return CopyOrMoveItem(source.c_str(), destination.c_str(), ::getuid(), ::getgid(), /*copy=*/true);
}

std::int32_t MoveItemWithOwner(const char* source, const char* destination) {
  FileManager& manager = Manager();
  if (!manager.mode(source)) return kFileSourceUnreadable;
  (void)SetItemOwner(source, ::getuid(), ::getgid(), /*recursive=*/true);  // the move is the answer
  FileError error;
  if (manager.moveItem(PathOf(source), PathOf(destination), &error)) return 0;
  return error.value_or(kFileFailedWithoutError);
}

void MergeItem(FileManager& manager, const std::string& source, const std::string& destination,
               bool copy) {
  FileError error;
  if (CopyOrMove(manager, source, destination, copy, copy ? &error : nullptr)) return;
  if (manager.kind(source) == FileKind::kOther) return;
  std::optional<std::string> made;
  FilePlace from(source, "");
  FilePlace to(destination, "");
  for (const std::string& subpath : manager.subpaths(source)) {
    from.subpath = subpath;
    to.subpath = subpath;
    if (manager.kind(to) == FileKind::kOther && manager.kind(from) == FileKind::kOther) {
      (void)manager.removeItem(to, nullptr);
    }
    // It is there already, as a rule; and where it cannot be made the item itself fails.
    const FilePlace parent = ParentOf(destination, subpath);
    if (made != parent.subpath) {
      made.reset();
      if (manager.createDirectory(parent, /*intermediates=*/true, {}, nullptr)) {
        made = parent.subpath;
      }
    }
    (void)CopyOrMove(manager, from, to, copy, nullptr);  // an item that fails is skipped
  }
  // Kept: for a copy too, so that copying an empty directory into one of its name removes it.
  (void)manager.removeEmptyDirectory(source);
}
