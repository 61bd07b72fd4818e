// SPDX-License-Identifier: Apache-2.0
//
// Owns one file descriptor from the line that creates it until the end of its scope. No thread of
// its own and no lock: an object belongs to one thread at a time.
#pragma once

#include <unistd.h>

#include <utility>

namespace platform {

/// A move-only owner of one descriptor; closes it exactly once. Empty when it holds -1.
class FileDescriptor {
 public:
  FileDescriptor() = default;
  explicit FileDescriptor(int descriptor) noexcept : descriptor_(descriptor) {}
  FileDescriptor(FileDescriptor&& other) noexcept : descriptor_(other.release()) {}
  FileDescriptor& operator=(FileDescriptor&& other) noexcept {
    reset(other.release());
    return *this;
  }
  ~FileDescriptor() { reset(); }

  /// The descriptor, still owned here; -1 when empty.
  [[nodiscard]] int get() const noexcept { return descriptor_; }
  [[nodiscard]] explicit operator bool() const noexcept { return descriptor_ >= 0; }

  /// Gives the descriptor away; the caller closes it.
  [[nodiscard]] int release() noexcept { return std::exchange(descriptor_, -1); }

  /// Closes what is held, then holds `descriptor`.
  void reset(int descriptor = -1) noexcept {
    const int old = std::exchange(descriptor_, descriptor);
    // A failed close is not retried: on Linux the number is free again whatever close answers.
    if (old >= 0) ::close(old);
  }

 private:
  int descriptor_ = -1;
};

}  // namespace platform
