// SPDX-License-Identifier: Apache-2.0
//
// Reads a PKZip archive item by item, over libarchive, which is opened when the first archive is.
// Only archives with a central directory are read: by it, not by what stands between the items.
// One thread per reader; no lock.
#pragma once

#include <sys/stat.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Linux/ArchiveWriter.h"

struct archive;

namespace platform {

enum class ZipResult {
  kGood,
  kEnd,            // no more items, or no more bytes of the item
  kItemDamaged,    // checksum, encryption, unknown compression: the next item may be good
  kArchiveDamaged  // nothing more can be read
};

struct ZipItem {
  std::string name;        // as in the archive; UTF-8 where the archive says so, else its bytes
  bool hasName = false;    // false: it could not be decoded
  mode_t type = 0;         // S_IFREG, S_IFDIR, S_IFLNK or another type that somebody archived
  std::string linkTarget;  // of a link
  ArchiveItemStatus status;
};

/// Bytes of an item, valid until the next call, and where in it they stand.
struct ZipBlock {
  std::span<const std::byte> bytes;
  off_t offset = 0;
};

class ZipReader {
 public:
  /// None when libarchive cannot be opened or there is no memory.
  [[nodiscard]] static std::unique_ptr<ZipReader> Make();
  ~ZipReader();
  ZipReader(const ZipReader&) = delete;
  ZipReader& operator=(const ZipReader&) = delete;

  /// Begins with an archive, a regular file of `size` bytes. False when it is no PKZip archive. At
  /// most `directoryLimit` bytes are read up to the first item, so that no central directory takes
  /// all memory; an archive whose directory is longer is damaged.
  [[nodiscard]] bool open(FileDescriptor file, off_t size, off_t directoryLimit);
  /// Finds the next item. Of a damaged one, at most the name is known.
  [[nodiscard]] ZipResult next(ZipItem& item);
  /// Reads on in the item that next() found.
  [[nodiscard]] ZipResult read(ZipBlock& block);

 private:
  explicit ZipReader(archive* handle) : handle_(handle) {}

  static ssize_t Read(archive* handle, void* reader, const void** bytes);
  static std::int64_t Seek(archive* handle, void* reader, std::int64_t offset, int whence);

  archive* const handle_;
  FileDescriptor file_;
  off_t size_ = 0;
  off_t position_ = 0;
  off_t bytesBeforeFirstItem_ = 0;
  bool directoryRead_ = false;
  std::vector<std::byte> buffer_;
};

}  // namespace platform
