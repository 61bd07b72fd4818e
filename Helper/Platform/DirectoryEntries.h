// SPDX-License-Identifier: Apache-2.0
//
// Single directory entries by path: what stands there, making a link, taking an entry away. Paths
// are C strings in the kernel's terms: relative to nothing in particular, links in all but the last
// component followed, but where entries are made or taken away only those of root and of this
// process's user. Any thread; no lock.
#pragma once

#include <sys/types.h>

#include <optional>

#include "Helper/Platform/SharedService.h"

namespace platform {

class DirectoryEntries {
 public:
  virtual ~DirectoryEntries() = default;
  /// The mode, type and permissions, of the entry itself: a link is not followed. None when there
  /// is no entry, or it cannot be examined.
  [[nodiscard]] virtual std::optional<mode_t> mode(const char* path) = 0;
  /// Makes a symbolic link at `path` whose text is `target`; false when something stands there
  /// already, and whatever else prevents it. Creates no folder and does not look at `target`.
  [[nodiscard]] virtual bool makeLink(const char* target, const char* path) = 0;
  /// Takes away a file, a link itself, or an empty directory; false for anything else. Never a
  /// tree.
  virtual bool remove(const char* path) = 0;
};

template <>
DirectoryEntries& DefaultProvider<DirectoryEntries>();

}  // namespace platform
