// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/ZipCopier.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <optional>
#include <utility>
#include <vector>

#include "Helper/Platform/FileManager.h"
#include "Helper/Platform/Linux/ArchiveWriter.h"
#include "Helper/Platform/Linux/FileBody.h"
#include "Helper/Platform/Linux/OpenRegularFile.h"
#include "Helper/Platform/Linux/PathWalk.h"
#include "Helper/Platform/Linux/SideCarFolding.h"
#include "Helper/Platform/Linux/ZipReader.h"

namespace platform {
namespace {

bool IsWanted(const ArchiveCopyOptions& options, const char* name) {
  const auto found = options.find(name);
  return found != options.end() && found->second;
}

/// Opens the destination, making it where it is missing.
int OpenDestination(const std::string& path, FileDescriptor& folder) {
  if (path.empty()) return ENOENT;
  FileError error;
  FileAttributes attributes;
  attributes.permissions = 0755;
  if (!Shared<FileManager>().createDirectory(path, /*intermediates=*/true, attributes, &error)) {
    return error.value_or(EIO);
  }
  folder = OpenDirectoryAt(AT_FDCWD, path);
  return folder ? 0 : errno;
}

/// One copy, from the first item to the last.
class Extraction {
 public:
  Extraction(ZipReader& reader, FileDescriptor destination, off_t archiveSize,
             const ArchiveLimits& limits)
      : reader_(reader),
        writer_(std::move(destination)),
        archiveSize_(archiveSize),
        limits_(limits) {}

  /// Extracts the next item into `item`. None at the end; else 0, or why it failed.
  std::optional<int> extractNext(ZipItem& item) {
    switch (reader_.next(item)) {
      case ZipResult::kEnd:
        return std::nullopt;
      case ZipResult::kArchiveDamaged:
        return stop(EBADMSG);
      case ZipResult::kItemDamaged:
        ++items_;
        return EBADMSG;
      case ZipResult::kGood:
        break;
    }
    if (++items_ + writer_.foldersMade() > limits_.items) return stop(EFBIG);
    const int error = extract(item);
    if (EndsEveryWrite(error)) stopped_ = true;
    return error;
  }

  /// Whether the last failure is not the item's alone.
  [[nodiscard]] bool isStopped() const { return stopped_; }

  /// Completes what could not be completed item by item.
  void finish(SideCarWish wish) {
    if (wish.attributes || wish.resourceData) {
      for (const std::string& path : sideCars_) {
        if (FoldSideCar(writer_.root(), path, wish)) writer_.removeFile(path);
      }
    }
    writer_.finishFolders();
  }

 private:
  int stop(int error) {
    stopped_ = true;
    return error;
  }

  int extract(const ZipItem& item) {
    std::string path;
    if (!item.hasName) return EILSEQ;
    if (const int error = ArchiveItemPath(item.name, path)) return error;
    if (S_ISDIR(item.type)) return writer_.makeFolder(path, item.status);
    if (S_ISREG(item.type)) return extractFile(path, item.status);
    if (!S_ISLNK(item.type)) return EOPNOTSUPP;
    return item.linkTarget.empty() ? EBADMSG : writer_.makeLink(path, item.linkTarget, item.status);
  }

  int extractFile(const std::string& path, const ArchiveItemStatus& status) {
    NewFile file;
    if (const int error = writer_.beginFile(path, status, file)) return error;
    ZipBlock block;
    ZipResult result = reader_.read(block);
    for (; result == ZipResult::kGood; result = reader_.read(block)) {
      bytes_ += static_cast<off_t>(block.bytes.size());
      if (isTooMuch()) return stop(EFBIG);
      const int error = ArchiveWriter::write(file, block.bytes, block.offset);
      if (error != 0) return error;
    }
    if (result == ZipResult::kArchiveDamaged) return stop(EBADMSG);
    if (result == ZipResult::kItemDamaged) return EBADMSG;
    const int error = writer_.finishFile(file, path, status);
    if (error == 0 && IsSideCarPath(path)) sideCars_.push_back(path);
    return error;
  }

  [[nodiscard]] bool isTooMuch() const {
    return bytes_ > limits_.bytes ||
           (bytes_ > limits_.bytesOfAnyRatio && bytes_ / limits_.ratio > archiveSize_);
  }

  ZipReader& reader_;
  ArchiveWriter writer_;
  const off_t archiveSize_;
  const ArchiveLimits& limits_;
  std::size_t items_ = 0;
  off_t bytes_ = 0;
  bool stopped_ = false;
  std::vector<std::string> sideCars_;
};

class ZipCopier final : public ArchiveCopier {
 public:
  ZipCopier(std::unique_ptr<ZipReader> reader, const ArchiveLimits& limits)
      : reader_(std::move(reader)), limits_(limits) {}

  void setFileErrorCallback(FileErrorCallback callback) override {
    fileError_ = std::move(callback);
  }
  void setFatalErrorCallback(FatalErrorCallback callback) override {
    fatalError_ = std::move(callback);
  }

  int copy(const std::string& source, const std::string& destination,
           const ArchiveCopyOptions& options) override {
    if (!IsWanted(options, kExtractPKZip)) return EINVAL;
    FileDescriptor file;
    FileDescriptor folder;
    struct stat status {};
    if (const int error = OpenRegularFile(source.c_str(), file, status)) return error;
    if (!reader_->open(std::move(file), status.st_size, limits_.directoryBytes)) {
      return fatal(EBADMSG);
    }
    if (const int error = OpenDestination(destination, folder)) return error;
    Extraction extraction(*reader_, std::move(folder), status.st_size, limits_);
    const int error = extractAll(extraction);
    extraction.finish({.attributes = IsWanted(options, kCopyExtendedAttributes),
                       .resourceData = IsWanted(options, kCopyResources)});
    return error;
  }

 private:
  int extractAll(Extraction& extraction) {
    ZipItem item;
    while (const std::optional<int> error = extraction.extractNext(item)) {
      if (extraction.isStopped()) return fatal(*error);
      if (*error == 0 || !fileError_) continue;
      if (fileError_(item.name, *error) != kLeaveItemOut) return ECANCELED;
    }
    return 0;
  }

  int fatal(int error) {
    if (fatalError_) fatalError_();
    return error;
  }

  const std::unique_ptr<ZipReader> reader_;
  const ArchiveLimits limits_;
  FileErrorCallback fileError_;
  FatalErrorCallback fatalError_;
};

class ZipCopierFactory final : public ArchiveCopierFactory {
 public:
  std::unique_ptr<ArchiveCopier> create() override { return MakeZipCopier({}); }
};

}  // namespace

std::unique_ptr<ArchiveCopier> MakeZipCopier(const ArchiveLimits& limits) {
  std::unique_ptr<ZipReader> reader = ZipReader::Make();
  return reader ? std::make_unique<ZipCopier>(std::move(reader), limits) : nullptr;
}

template <>
ArchiveCopierFactory& DefaultProvider<ArchiveCopierFactory>() {
  static auto& factory = *new ZipCopierFactory;
  return factory;
}

}  // namespace platform
