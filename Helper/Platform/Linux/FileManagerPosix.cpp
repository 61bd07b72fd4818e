// SPDX-License-Identifier: Apache-2.0
//
// The file manager on system calls. Every item is reached below an open folder. Any thread; no
// state.
#include <fcntl.h>
#include <grp.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <string_view>

#include "Helper/Platform/FileManager.h"
#include "Helper/Platform/Linux/FileLocation.h"
#include "Helper/Platform/Linux/PathWalk.h"
#include "Helper/Platform/Linux/TreeCopy.h"
#include "Helper/Platform/UserDatabase.h"

namespace platform {
namespace {

/// Bytes of paths in one listing: of a hundred thousand items with long ones.
constexpr std::size_t kMostListed = std::size_t{64} << 20;

/// Turns a code into the answer of an operation.
bool Answer(int code, FileError* error) {
  if (code != 0 && code != kNoErrorObject && error) *error = code;
  return code == 0;
}

/// What attributes come to when names have become numbers; -1 leaves an id as it is.
struct Ids {
  uid_t owner = static_cast<uid_t>(-1);
  gid_t group = static_cast<gid_t>(-1);
  [[nodiscard]] bool changeNothing() const { return owner + 1 == 0 && group + 1 == 0; }
};

int ResolveIds(const FileAttributes& attributes, Ids& ids) {
  if (attributes.ownerId) ids.owner = *attributes.ownerId;
  if (attributes.groupId) ids.group = *attributes.groupId;
  if (!attributes.ownerName.empty()) {
    const auto account = Shared<UserDatabase>().ids(attributes.ownerName.c_str());
    if (!account) return EINVAL;
    ids.owner = account->user;
  }
  if (!attributes.groupName.empty()) {
    std::array<char, 16 * 1024> buffer;
    group entry{};
    group* found = nullptr;
    (void)::getgrnam_r(attributes.groupName.c_str(), &entry, buffer.data(), buffer.size(), &found);
    if (!found) return EINVAL;
    ids.group = found->gr_gid;
  }
  return 0;
}

/// Owner before permissions: a change of owner takes set-id bits away.
int ApplyTo(int folder, const char* name, const Ids& ids,
            std::optional<std::uint32_t> permissions) {
  if (!ids.changeNothing() &&
      ::fchownat(folder, name, ids.owner, ids.group, AT_SYMLINK_NOFOLLOW) != 0) {
    return errno;
  }
  if (!permissions && !ids.changeNothing()) return 0;
  const FileDescriptor item(::openat(folder, name, O_PATH | O_NOFOLLOW | O_CLOEXEC));
  struct stat status {};
  if (!item || ::fstat(item.get(), &status) != 0) return errno;
  if (!permissions || S_ISLNK(status.st_mode)) return 0;
  // The only way to change the mode of what must not be opened for reading.
  const std::string path = "/proc/self/fd/" + std::to_string(item.get());
  return ::chmod(path.c_str(), *permissions & 07777) == 0 ? 0 : errno;
}

/// Makes one directory in full, or leaves nothing.
int MakeFolder(int folder, const char* name, const Ids& ids,
               std::optional<std::uint32_t> permissions) {
  // Nobody else gets in before it has its attributes.
  if (::mkdirat(folder, name, permissions ? 0700 : 0777) != 0) return errno;
  if (!permissions && ids.changeNothing()) return 0;
  const int error = ApplyTo(folder, name, ids, permissions);
  if (error != 0) ::unlinkat(folder, name, AT_REMOVEDIR);
  return error;
}

/// Opens the directory that a text of components leads to, making what is missing.
int MakeFolders(FileDescriptor& at, std::string_view components, bool followLinks, const Ids& ids,
                std::optional<std::uint32_t> permissions) {
  const auto open = [&](const std::string& name) {
    if (followLinks) return OpenDirectoryAt(at.get(), name);
    return FileDescriptor(
        ::openat(at.get(), name.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC | O_NOFOLLOW));
  };
  while (true) {
    const std::size_t start = components.find_first_not_of('/');
    if (start == std::string_view::npos) return 0;
    components.remove_prefix(start);
    const std::string name(components.substr(0, components.find('/')));
    components.remove_prefix(name.size());
    FileDescriptor next = open(name);
    if (!next && errno == ENOENT) {
      const int error = MakeFolder(at.get(), name.c_str(), ids, permissions);
      // Another process may have made it first.
      if (error != 0 && error != EEXIST) return error;
      next = open(name);
      // A link to nothing can neither be entered nor made.
      if (!next && errno == ENOENT) return EEXIST;
    }
    if (!next) return errno;
    at = std::move(next);
  }
}

/// Lists as long as there is room for so many bytes of paths.
void ListBelow(FolderReader& reader, const std::string& prefix, int level, std::size_t& room,
               std::vector<std::string>& names) {
  while (const dirent* entry = reader.next()) {
    std::string name = prefix + entry->d_name;
    if (name.size() > room) return;
    room -= name.size();
    names.push_back(std::move(name));
    if ((entry->d_type != DT_DIR && entry->d_type != DT_UNKNOWN) || level >= kDeepestLevel) {
      continue;
    }
    FolderReader below(OpenFolder(reader.descriptor(), entry->d_name));
    if (below) ListBelow(below, std::string(names.back()) + '/', level + 1, room, names);
  }
}

class FileManagerPosix final : public FileManager {
 public:
  FileKind kind(const FilePlace& place) override {
    FileLocation at;
    if (Locate(place, at) != 0) return FileKind::kAbsent;
    FileDescriptor item = OpenPathAt(at.folder(), at.name, LastLink::kFollow);
    // A link that is not followed is itself what stands there.
    if (!item && errno == EACCES) item = OpenPathAt(at.folder(), at.name, LastLink::kOpen);
    struct stat status {};
    if (!item || ::fstat(item.get(), &status) != 0) return FileKind::kAbsent;
    return S_ISDIR(status.st_mode) ? FileKind::kDirectory : FileKind::kOther;
  }

  std::optional<std::uint32_t> mode(const std::string& path) override {
    struct stat status {};
    if (::stat(path.c_str(), &status) != 0) return std::nullopt;
    return status.st_mode;
  }

  std::vector<std::string> subpaths(const std::string& path) override {
    std::vector<std::string> names;
    const FileDescriptor folder = OpenDirectoryAt(AT_FDCWD, path);
    if (!folder) return names;
    FolderReader reader(OpenFolder(folder.get(), "."));
    std::size_t room = kMostListed;
    if (reader) ListBelow(reader, "", 0, room, names);
    return names;
  }

  bool createDirectory(const FilePlace& place, bool intermediates, const FileAttributes& attributes,
                       FileError* error) override {
    if (place.path.empty()) return Answer(kNoErrorObject, error);
    Ids ids;
    if (const int code = ResolveIds(attributes, ids)) return Answer(code, error);
    if (!intermediates) {
      FileLocation at;
      int code = Locate(place, at);
      if (code == 0) {
        code = MakeFolder(at.folder(), at.name.c_str(), ids, attributes.permissions);
      }
      return Answer(code, error);
    }
    const char* start = place.path.starts_with('/') ? "/" : ".";
    FileDescriptor at(::open(start, O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (!at) return Answer(errno, error);
    int code = MakeFolders(at, place.path, /*followLinks=*/true, ids, attributes.permissions);
    if (code == 0) {
      code = MakeFolders(at, place.subpath, /*followLinks=*/false, ids, attributes.permissions);
    }
    // What stands in the way is there already, as another kind of thing.
    return Answer(code == ENOTDIR ? EEXIST : code, error);
  }

  bool copyItem(const FilePlace& source, const FilePlace& destination, FileError* error) override {
    FileLocation from;
    FileLocation to;
    int code = Locate(source, from);
    if (code == 0) code = Locate(destination, to);
    if (code == 0) code = CopyTree(from, to, CopyRule::kSkipWhatFails);
    return Answer(code, error);
  }

  bool moveItem(const FilePlace& source, const FilePlace& destination, FileError* error) override {
    FileLocation from;
    FileLocation to;
    int code = Locate(source, from);
    if (code == 0) code = Locate(destination, to);
    if (code == 0) code = move(from, to);
    return Answer(code, error);
  }

  bool removeItem(const FilePlace& place, FileError* error) override {
    FileLocation at;
    int code = Locate(place, at);
    if (code == 0 && (at.name == "." || at.name == "..")) code = EINVAL;
    if (code == 0) code = RemoveTree(at.folder(), at.name.c_str());
    return Answer(code, error);
  }

  bool removeEmptyDirectory(const std::string& path) override {
    FileLocation at;
    return Locate(path, at) == 0 && ::unlinkat(at.folder(), at.name.c_str(), AT_REMOVEDIR) == 0;
  }

  bool setAttributes(const FileAttributes& attributes, const FilePlace& place,
                     FileError* error) override {
    Ids ids;
    FileLocation at;
    int code = Locate(place, at);
    if (code == 0) code = ResolveIds(attributes, ids);
    if (code == 0) code = ApplyTo(at.folder(), at.name.c_str(), ids, attributes.permissions);
    return Answer(code, error);
  }

  bool changeOwner(const std::string& path, std::uint32_t uid, std::uint32_t gid) override {
    const FileDescriptor item = OpenPathAt(AT_FDCWD, path, LastLink::kFollow);
    return item && ::fchownat(item.get(), "", uid, gid, AT_EMPTY_PATH) == 0;
  }

 private:
  static int move(const FileLocation& from, const FileLocation& to) {
    const int error =
        RenameToFreeName(from.folder(), from.name.c_str(), to.folder(), to.name.c_str());
    if (error != EXDEV) return error;
    if (const int copying = CopyTree(from, to, CopyRule::kAllOrNothing)) return copying;
    return RemoveTree(from.folder(), from.name.c_str());
  }
};

}  // namespace

template <>
FileManager& DefaultProvider<FileManager>() {
  static auto& manager = *new FileManagerPosix;
  return manager;
}

}  // namespace platform
