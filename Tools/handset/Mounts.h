// SPDX-License-Identifier: Apache-2.0
//
// The mount calls that a handset's root is made of (mount(2), open_tree(2), move_mount(2),
// mount_setattr(2)). The caller is alone in a mount namespace of its own. Every function throws
// Failure. One thread, no lock.
#pragma once

#include <sys/types.h>

#include <string>
#include <string_view>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"

namespace handset {

enum class Access { kReadWrite, kReadOnly };

/// A copy of what is mounted at `path`, with everything mounted below, not attached anywhere yet.
[[nodiscard]] platform::FileDescriptor CloneTree(const std::string& path, Access access);

/// Attaches a copy made by CloneTree at `path`, an existing item of the same kind.
void AttachTree(const platform::FileDescriptor& tree, const std::string& path);

/// Mounts a file system of the kind `type` with `options` at `path`, an existing directory.
void MountNew(const std::string& type, const std::string& path, const std::string& options,
              unsigned long flags);

/// Creates `path` if it is missing and mounts an empty tmpfs there: no set-user-id programs, no
/// devices, its top folder with the given mode (octal digits) and owner.
void MountMemory(const std::string& path, const std::string& mode, uid_t owner = 0,
                 gid_t group = 0);

/// Keeps every later mount from reaching other namespaces, and theirs from reaching this one.
void MakeMountsPrivate();

/// The mount points strictly below `folder` named in a mountinfo text (proc(5)), topmost ones
/// only, each once; the file's octal escapes are undone.
[[nodiscard]] std::vector<std::string> MountPointsBelow(std::string_view mountinfoText,
                                                        const std::string& folder);

/// Makes `path`, a mount point, the root of the calling process and lets go of the old root.
void PivotInto(const std::string& path);

}  // namespace handset
