// SPDX-License-Identifier: Apache-2.0
//
// Takes descriptors away from this process for the length of a scope: those that are open stay so.
// The limit is the whole process's; one object at a time.
#pragma once

#include <gtest/gtest.h>
#include <sys/resource.h>

namespace support {

class DescriptorLimit {
 public:
  /// No new descriptor gets the number `limit` or a higher one.
  explicit DescriptorLimit(int limit) {
    EXPECT_EQ(::getrlimit(RLIMIT_NOFILE, &before_), 0);
    set({.rlim_cur = static_cast<rlim_t>(limit), .rlim_max = before_.rlim_max});
  }
  ~DescriptorLimit() { set(before_); }
  DescriptorLimit(const DescriptorLimit&) = delete;
  DescriptorLimit& operator=(const DescriptorLimit&) = delete;

 private:
  static void set(const rlimit& limit) { EXPECT_EQ(::setrlimit(RLIMIT_NOFILE, &limit), 0); }

  rlimit before_{};
};

}  // namespace support
