// SPDX-License-Identifier: Apache-2.0
//
// The archive copier for PKZip archives: ZipReader for what comes in, ArchiveWriter for what goes
// out. One thread per copier; no lock.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <memory>

#include "Helper/Platform/ArchiveCopier.h"

namespace platform {

/// What one archive may come to. A small archive can hold a large one's bytes and entries many
/// times over, and the thread that extracts does nothing else meanwhile.
struct ArchiveLimits {
  std::size_t items = 100'000;   // with the folders that no item named
  off_t bytes = off_t{4} << 30;  // of content
  off_t ratio = 250;             // of content to archive, behind the first
  off_t bytesOfAnyRatio = off_t{64} << 20;
  off_t directoryBytes = off_t{32} << 20;  // of the archive, read up to its first item
};

/// A copier with these limits; none when there is no library that reads archives.
[[nodiscard]] std::unique_ptr<ArchiveCopier> MakeZipCopier(const ArchiveLimits& limits);

}  // namespace platform
