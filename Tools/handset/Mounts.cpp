// SPDX-License-Identifier: Apache-2.0
//
// Thin wrappers over the mount calls. One thread, no lock.
#include "Tools/handset/Mounts.h"

#include <fcntl.h>
#include <sys/mount.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <optional>

#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"

namespace handset {
namespace {

/// Undoes the \ooo escapes of blank, tab, newline and backslash.
std::string Unescape(std::string_view text) {
  const auto octal = [&](std::size_t i) -> std::optional<unsigned> {
    if (i >= text.size() || text[i] < '0' || text[i] > '7') return std::nullopt;
    return static_cast<unsigned>(text[i] - '0');
  };
  std::string plain;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const auto a = octal(i + 1);
    const auto b = octal(i + 2);
    const auto c = octal(i + 3);
    if (text[i] == '\\' && a && b && c) {
      plain += static_cast<char>(*a * 64 + *b * 8 + *c);
      i += 3;
    } else {
      plain += text[i];
    }
  }
  return plain;
}

/// The blank-separated field number `index`, counted from 0.
std::string_view Field(std::string_view line, int index) {
  for (; index > 0; --index) {
    const std::size_t blank = line.find(' ');
    if (blank == std::string_view::npos) return {};
    line.remove_prefix(blank + 1);
  }
  return line.substr(0, line.find(' '));
}

bool IsBelow(const std::string& path, const std::string& folder) {
  return path.size() > folder.size() + 1 && path.starts_with(folder) && path[folder.size()] == '/';
}

}  // namespace

platform::FileDescriptor CloneTree(const std::string& path, Access access) {
  platform::FileDescriptor tree(open_tree(
      AT_FDCWD, path.c_str(), OPEN_TREE_CLONE | OPEN_TREE_CLOEXEC | unsigned{AT_RECURSIVE}));
  if (!tree) throw Failure::FromErrno("copy the mounts at " + path);
  if (access == Access::kReadOnly) {
    mount_attr attributes{};
    attributes.attr_set = MOUNT_ATTR_RDONLY;
    if (mount_setattr(tree.get(), "", AT_EMPTY_PATH | AT_RECURSIVE, &attributes,
                      sizeof attributes) != 0) {
      throw Failure::FromErrno("make " + path + " read-only");
    }
  }
  return tree;
}

void AttachTree(const platform::FileDescriptor& tree, const std::string& path) {
  if (move_mount(tree.get(), "", AT_FDCWD, path.c_str(), MOVE_MOUNT_F_EMPTY_PATH) != 0) {
    throw Failure::FromErrno("mount at " + path);
  }
}

void MountNew(const std::string& type, const std::string& path, const std::string& options,
              unsigned long flags) {
  if (mount(type.c_str(), path.c_str(), type.c_str(), flags, options.c_str()) != 0) {
    throw Failure::FromErrno("mount " + type + " at " + path);
  }
}

void MountMemory(const std::string& path, const std::string& mode, uid_t owner, gid_t group) {
  MakeDirectories(path);
  MountNew("tmpfs", path,
           "mode=" + mode + ",uid=" + std::to_string(owner) + ",gid=" + std::to_string(group),
           MS_NOSUID | MS_NODEV);
}

void MakeMountsPrivate() {
  if (mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) {
    throw Failure::FromErrno("make the mounts private");
  }
}

std::vector<std::string> MountPointsBelow(std::string_view mountinfoText,
                                          const std::string& folder) {
  std::vector<std::string> found;
  while (!mountinfoText.empty()) {
    const std::size_t end = std::min(mountinfoText.find('\n'), mountinfoText.size() - 1);
    constexpr int kMountPointField = 4;
    std::string point = Unescape(Field(mountinfoText.substr(0, end), kMountPointField));
    mountinfoText.remove_prefix(end + 1);
    if (IsBelow(point, folder)) found.push_back(std::move(point));
  }
  std::sort(found.begin(), found.end());
  found.erase(std::unique(found.begin(), found.end()), found.end());
  const std::vector<std::string> all = found;
  std::erase_if(found, [&](const std::string& point) {
    return std::any_of(all.begin(), all.end(),
                       [&](const std::string& other) { return IsBelow(point, other); });
  });
  return found;
}

void PivotInto(const std::string& path) {
  if (chdir(path.c_str()) != 0) throw Failure::FromErrno("chdir " + path);
  // With both arguments the same folder, the old root ends up mounted on top of the new one, and
  // the unmount that follows takes it away again (pivot_root(2), "pivot_root(".", ".")").
  if (syscall(SYS_pivot_root, ".", ".") != 0) throw Failure::FromErrno("pivot_root");
  if (umount2(".", MNT_DETACH) != 0) throw Failure::FromErrno("let go of the old root");
  if (chdir("/") != 0) throw Failure::FromErrno("chdir /");
}

}  // namespace handset
