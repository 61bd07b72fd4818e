// SPDX-License-Identifier: Apache-2.0
//
// One stored preference domain: a property-list file that is read whole and replaced whole, in a
// way that a kill or a power cut leaves either the old contents or the new. No state and no lock of
// its own; writers of all processes exclude one another by a lock file.
#pragma once

#include <sys/stat.h>

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/PropertyList.h"

namespace platform {

/// Where a domain is kept. No folder: nowhere, so that it reads as absent and cannot be written.
struct PreferenceFilePath {
  std::string folder;
  std::string name;          // "com.zarvo.carrier.plist"
  mode_t folderMode = 0700;  // of folders that writing has to make
  mode_t fileMode = 0600;    // of a file that was not there before

  [[nodiscard]] std::string full() const { return folder.empty() ? "" : folder + '/' + name; }
};

/// What tells one state of a file from another. All zero where there is no file.
struct PreferenceFileStamp {
  dev_t device = 0;
  ino_t inode = 0;
  mode_t mode = 0;
  off_t size = 0;
  std::int64_t modified = 0;  // nanoseconds since 1970
  std::int64_t changed = 0;

  friend bool operator==(const PreferenceFileStamp&, const PreferenceFileStamp&) = default;
};

/// One stat of the file, symbolic links followed: another program may link a domain to a file of
/// its own. An error reads as absence; reading the file then tells which.
[[nodiscard]] PreferenceFileStamp StampOfPreferenceFile(const std::string& path) noexcept;

struct PreferenceFileContents {
  enum class State {
    kAbsent,
    kGood,
    kCorrupt,    // not a regular file, or not a property list with a dictionary at its root
    kUnreadable  // an error that may pass; the file may well be good
  };
  State state = State::kAbsent;
  PropertyList::Dictionary values;  // empty unless good
  PreferenceFileStamp stamp;
  std::string reason;  // where corrupt or unreadable
};

/// What a stored domain may hold: at least one value at the limits of its own, below the root and a
/// key. The file may be twice as long as the form that such a value came in, because a text that is
/// not all ASCII takes two bytes a letter. Only a value that came in a binary form whose references
/// share long numbers may need still more, since they are written out one by one.
[[nodiscard]] constexpr PropertyListLimits StoredPreferenceLimits() {
  constexpr std::size_t kRootAndKey = 1024;  // bytes
  PropertyListLimits limits;
  limits.bytes = 2 * limits.bytes + kRootAndKey;
  ++limits.depth;
  limits.nodes += 2;
  return limits;
}

/// Reads the file, links followed. Waits for no FIFO and opens no device.
[[nodiscard]] PreferenceFileContents ReadPreferenceFile(const std::string& path);

/// The right to replace one file, held while the object lives.
class PreferenceFileWriter {
 public:
  explicit PreferenceFileWriter(PreferenceFilePath path) : path_(std::move(path)) {}

  /// Opens the folder, making it where it is missing, and takes the lock, waiting for another
  /// writer up to `patience`. False, with reason(), when that fails.
  [[nodiscard]] bool begin(std::chrono::milliseconds patience);

  /// Gives the file in place a second name that tells what it is, "NAME.corrupt-N" with N from 1 to
  /// 4, so that it outlives the next replace(). When all four are taken nothing is kept.
  void keepAside() const;

  /// Puts `bytes` in place of the file: temporary file, fsync, rename, fsync of the folder. Mode
  /// and owner stay those of a regular file that was there. A symbolic
  /// link is itself replaced and its target left alone: the target belongs to whoever made the
  /// link, and may be shared or stand where this process must not be led to write. False, with
  /// reason(), when a step fails; the old file then stands untouched, unless only the last step
  /// failed, and no temporary file is left.
  [[nodiscard]] bool replace(const std::vector<std::byte>& bytes);

  /// Makes what is in place durable, whoever wrote it: fsync of the file, where a regular one is
  /// there, and of the folder. Opens nothing else.
  [[nodiscard]] bool settle();

  /// The file's state after a successful replace().
  [[nodiscard]] const PreferenceFileStamp& stamp() const { return stamp_; }
  /// Which step failed and why.
  [[nodiscard]] const std::string& reason() const { return reason_; }

 private:
  [[nodiscard]] bool fail(const char* step, int error);
  [[nodiscard]] bool openFolder();
  [[nodiscard]] bool lock(std::chrono::milliseconds patience);
  [[nodiscard]] bool writeTemporary(const std::string& name, const std::vector<std::byte>& bytes,
                                    FileDescriptor& file);
  [[nodiscard]] bool keepModeAndOwner(int file);

  const PreferenceFilePath path_;
  FileDescriptor folder_;
  FileDescriptor lock_;
  PreferenceFileStamp stamp_;
  std::string reason_;
};

}  // namespace platform
