// SPDX-License-Identifier: Apache-2.0
//
// Who the handset's interactive user is: home directory, user and group id, looked up together on
// the first question and never again. Any thread; the look-up runs once.
#pragma once

#include <sys/types.h>

#include <mutex>

#include "Helper/Platform/String.h"

namespace platform {

class MobileUserRecord {
 public:
  MobileUserRecord() = default;
  MobileUserRecord(const MobileUserRecord&) = delete;
  MobileUserRecord& operator=(const MobileUserRecord&) = delete;
  ~MobileUserRecord() { DefaultAllocator().deallocate(directory_); }

  /// The home directory, valid while the record lives; null when there is none.
  [[nodiscard]] const char* directory() {
    fillOnce();
    return directory_;
  }
  /// Kept: 0, the ids of root, when the user database has no such user.
  [[nodiscard]] uid_t uid() {
    fillOnce();
    return uid_;
  }
  [[nodiscard]] gid_t gid() {
    fillOnce();
    return gid_;
  }

 private:
  void fillOnce() {
    std::call_once(once_, [this] { fill(); });
  }
  void fill();

  std::once_flag once_;  // guards what follows
  String userName_{"mobile"};
  char* directory_ = nullptr;  // from the default allocator
  uid_t uid_ = 0;
  gid_t gid_ = 0;
};

/// The record of this process, which lives as long as the process.
[[nodiscard]] MobileUserRecord& MobileUser();

}  // namespace platform
