// SPDX-License-Identifier: Apache-2.0
//
// The archive copier: unpacks an archive into a folder. A copier is made for one copy, on the
// thread that copies; its callbacks are called there, while it copies.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <string>

#include "Helper/Platform/SharedService.h"

namespace platform {

/// What is wanted of a copy, by name; what is not named is not wanted.
using ArchiveCopyOptions = std::map<std::string, bool, std::less<>>;

/// Unpack a PKZip archive. Without it there is nothing that a copier could do (EINVAL).
inline constexpr char kExtractPKZip[] = "extractPKZip";
/// Keep the extended attributes and the finder information in the archive's side-cars (SideCar.h).
inline constexpr char kCopyExtendedAttributes[] = "copyExtendedAttributes";
/// Keep the resource data in the archive's side-cars.
inline constexpr char kCopyResources[] = "copyResources";

/// The answer of a per-file error callback by which the item is left out and the copy goes on. Any
/// other answer ends the copy.
inline constexpr int kLeaveItemOut = 2;

class ArchiveCopier {
 public:
  /// Hears the name of an item that could not be extracted, as the archive gives it, and an error
  /// number of the host.
  using FileErrorCallback = std::function<int(const std::string& name, int error)>;
  using FatalErrorCallback = std::function<void()>;

  virtual ~ArchiveCopier() = default;

  /// Without a callback an item that fails is left out.
  virtual void setFileErrorCallback(FileErrorCallback callback) = 0;
  /// Called at most once in a copy, when it cannot go on: the archive is damaged or holds more than
  /// a copier extracts, or nothing more can be written. What has been extracted stays.
  virtual void setFatalErrorCallback(FatalErrorCallback callback) = 0;

  /// Extracts the regular file `source` into the folder `destination`, which is made (0755, with
  /// those above it) where it is missing. Links in both paths are followed; none below the
  /// destination is. 0 when the archive was read to its end, even if items failed; else an error
  /// number: of the source or the destination that cannot be opened, without a callback; EBADMSG
  /// for a damaged archive, EFBIG for one too large; ECANCELED where a callback ended the copy.
  [[nodiscard]] virtual int copy(const std::string& source, const std::string& destination,
                                 const ArchiveCopyOptions& options) = 0;
};

class ArchiveCopierFactory {
 public:
  virtual ~ArchiveCopierFactory() = default;
  /// A new copier; none when this system has nothing that reads archives.
  [[nodiscard]] virtual std::unique_ptr<ArchiveCopier> create() = 0;
};

template <>
ArchiveCopierFactory& DefaultProvider<ArchiveCopierFactory>();

}  // namespace platform
