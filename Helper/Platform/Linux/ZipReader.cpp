// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/ZipReader.h"

#include <archive.h>
#include <archive_entry.h>
#include <locale.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <string_view>
#include <utility>

#include "Helper/Platform/SharedLibrary.h"

namespace platform {
namespace {

constexpr std::size_t kReadSize = 256 * 1024;

/// What is used of the library.
class Library {
 public:
  Library() : library_("libarchive.so.13") {
    library_.bind(readNew, "archive_read_new");
    library_.bind(readFree, "archive_read_free");
    library_.bind(supportZip, "archive_read_support_format_zip_seekable");
    library_.bind(supportStream, "archive_read_support_format_zip_streamable");
    library_.bind(setRead, "archive_read_set_read_callback");
    library_.bind(setSeek, "archive_read_set_seek_callback");
    library_.bind(setData, "archive_read_set_callback_data");
    library_.bind(open, "archive_read_open1");
    library_.bind(nextHeader, "archive_read_next_header");
    library_.bind(readBlock, "archive_read_data_block");
    library_.bind(pathname, "archive_entry_pathname");
    library_.bind(fileType, "archive_entry_filetype");
    library_.bind(permissions, "archive_entry_perm");
    library_.bind(symlink, "archive_entry_symlink");
    library_.bind(atimeIsSet, "archive_entry_atime_is_set");
    library_.bind(atime, "archive_entry_atime");
    library_.bind(mtimeIsSet, "archive_entry_mtime_is_set");
    library_.bind(mtime, "archive_entry_mtime");
  }
  [[nodiscard]] bool complete() const { return library_.complete(); }

  decltype(&::archive_read_new) readNew = nullptr;
  decltype(&::archive_read_free) readFree = nullptr;
  decltype(&::archive_read_support_format_zip_seekable) supportZip = nullptr;
  decltype(&::archive_read_support_format_zip_streamable) supportStream = nullptr;
  decltype(&::archive_read_set_read_callback) setRead = nullptr;
  decltype(&::archive_read_set_seek_callback) setSeek = nullptr;
  decltype(&::archive_read_set_callback_data) setData = nullptr;
  decltype(&::archive_read_open1) open = nullptr;
  decltype(&::archive_read_next_header) nextHeader = nullptr;
  decltype(&::archive_read_data_block) readBlock = nullptr;
  decltype(&::archive_entry_pathname) pathname = nullptr;
  decltype(&::archive_entry_filetype) fileType = nullptr;
  decltype(&::archive_entry_perm) permissions = nullptr;
  decltype(&::archive_entry_symlink) symlink = nullptr;
  decltype(&::archive_entry_atime_is_set) atimeIsSet = nullptr;
  decltype(&::archive_entry_atime) atime = nullptr;
  decltype(&::archive_entry_mtime_is_set) mtimeIsSet = nullptr;
  decltype(&::archive_entry_mtime) mtime = nullptr;

 private:
  SharedLibrary library_;
};

const Library& Calls() {
  static const Library library;
  return library;
}

/// The library decodes names by the calling thread's locale, and the C locale has ASCII only.
class Utf8Locale {
 public:
  Utf8Locale() : previous_(::uselocale(Locale())) {}
  ~Utf8Locale() { ::uselocale(previous_); }
  Utf8Locale(const Utf8Locale&) = delete;
  Utf8Locale& operator=(const Utf8Locale&) = delete;

 private:
  static locale_t Locale() {
    static const locale_t utf8 = ::newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr);
    return utf8;  // without one the thread's locale stays as it is
  }
  locale_t previous_;
};

/// Whether the first thing in the file is the record that ends an archive: one without items, which
/// the library's reader of central directories does not take for an archive.
bool IsEmptyArchive(const FileDescriptor& file, off_t size) {
  constexpr std::string_view kEndRecord = "PK\5\6";
  constexpr off_t kEndRecordSize = 22;
  std::array<char, kEndRecord.size()> start{};
  return size >= kEndRecordSize &&
         ::pread(file.get(), start.data(), start.size(), 0) == ssize_t{start.size()} &&
         std::string_view(start.data(), start.size()) == kEndRecord;
}

/// The library continues after a warning.
bool IsUsable(int code) { return code == ARCHIVE_OK || code == ARCHIVE_WARN; }

}  // namespace

std::unique_ptr<ZipReader> ZipReader::Make() {
  if (!Calls().complete()) return nullptr;
  archive* handle = Calls().readNew();
  return handle ? std::unique_ptr<ZipReader>(new ZipReader(handle)) : nullptr;
}

ZipReader::~ZipReader() { (void)Calls().readFree(handle_); }

bool ZipReader::open(FileDescriptor file, off_t size, off_t directoryLimit) {
  const Library& calls = Calls();
  file_ = std::move(file);
  size_ = size;
  bytesBeforeFirstItem_ = directoryLimit;
  buffer_.resize(kReadSize);
  const Utf8Locale locale;
  const auto support = IsEmptyArchive(file_, size) ? calls.supportStream : calls.supportZip;
  return support(handle_) == ARCHIVE_OK && calls.setRead(handle_, Read) == ARCHIVE_OK &&
         calls.setSeek(handle_, Seek) == ARCHIVE_OK && calls.setData(handle_, this) == ARCHIVE_OK &&
         calls.open(handle_) == ARCHIVE_OK;
}

ssize_t ZipReader::Read(archive*, void* reader, const void** bytes) {
  auto& self = *static_cast<ZipReader*>(reader);
  // Its position is this object's own: the descriptor's may be shared.
  const ssize_t count =
      ::pread(self.file_.get(), self.buffer_.data(), self.buffer_.size(), self.position_);
  if (count < 0) return ARCHIVE_FATAL;
  self.position_ += count;
  self.bytesBeforeFirstItem_ -= self.directoryRead_ ? 0 : count;
  if (self.bytesBeforeFirstItem_ < 0) return ARCHIVE_FATAL;
  *bytes = self.buffer_.data();
  return count;
}

std::int64_t ZipReader::Seek(archive*, void* reader, std::int64_t offset, int whence) {
  auto& self = *static_cast<ZipReader*>(reader);
  const std::int64_t base = whence == SEEK_END   ? self.size_
                            : whence == SEEK_CUR ? self.position_
                                                 : 0;
  // Offsets come from the archive: such a sum may be anywhere.
  std::int64_t position = 0;
  if (__builtin_add_overflow(base, offset, &position) || position < 0) return ARCHIVE_FATAL;
  self.position_ = position;
  return position;
}

ZipResult ZipReader::next(ZipItem& item) {
  const Library& calls = Calls();
  const Utf8Locale locale;
  archive_entry* entry = nullptr;
  int code = ARCHIVE_RETRY;
  while (code == ARCHIVE_RETRY) code = calls.nextHeader(handle_, &entry);
  directoryRead_ = true;
  if (code == ARCHIVE_EOF) return ZipResult::kEnd;
  if (code != ARCHIVE_FAILED && !IsUsable(code)) return ZipResult::kArchiveDamaged;
  item = {};
  if (const char* name = calls.pathname(entry)) {
    item.name = name;
    item.hasName = true;
  }
  if (code == ARCHIVE_FAILED) return ZipResult::kItemDamaged;
  item.type = calls.fileType(entry);
  if (const char* target = calls.symlink(entry)) item.linkTarget = target;
  item.status.permissions = calls.permissions(entry);
  if (calls.atimeIsSet(entry) != 0) item.status.accessed = {calls.atime(entry), 0};
  if (calls.mtimeIsSet(entry) != 0) item.status.modified = {calls.mtime(entry), 0};
  return ZipResult::kGood;
}

ZipResult ZipReader::read(ZipBlock& block) {
  const void* bytes = nullptr;
  std::size_t size = 0;
  std::int64_t offset = 0;
  int code = ARCHIVE_RETRY;
  while (code == ARCHIVE_RETRY) code = Calls().readBlock(handle_, &bytes, &size, &offset);
  block = {.bytes = {static_cast<const std::byte*>(bytes), size}, .offset = offset};
  switch (code) {
    case ARCHIVE_OK:
      return ZipResult::kGood;
    case ARCHIVE_EOF:
      return ZipResult::kEnd;
    case ARCHIVE_WARN:  // a checksum that is wrong, among others
    case ARCHIVE_FAILED:
      return ZipResult::kItemDamaged;
    default:
      return ZipResult::kArchiveDamaged;
  }
}

}  // namespace platform
