// SPDX-License-Identifier: Apache-2.0
//
// A system that has no thread to give. For the whole process, while it exists; one at a time.
#pragma once

#include <gtest/gtest.h>
#include <pthread.h>

#include <cstddef>

namespace support {

/// New threads are refused (EAGAIN), because their stack finds no room: the default size of a stack
/// is that of the whole address space. Threads that run already are not touched.
class ThreadsRefused {
 public:
  ThreadsRefused() {
    EXPECT_EQ(::pthread_getattr_default_np(&before_), 0);
    pthread_attr_t attributes;
    EXPECT_EQ(::pthread_attr_init(&attributes), 0);
    EXPECT_EQ(::pthread_attr_setstacksize(&attributes, std::size_t{1} << 47), 0);
    EXPECT_EQ(::pthread_setattr_default_np(&attributes), 0);
    (void)::pthread_attr_destroy(&attributes);
  }
  ~ThreadsRefused() {
    EXPECT_EQ(::pthread_setattr_default_np(&before_), 0);
    (void)::pthread_attr_destroy(&before_);
  }
  ThreadsRefused(const ThreadsRefused&) = delete;
  ThreadsRefused& operator=(const ThreadsRefused&) = delete;

 private:
  pthread_attr_t before_{};
};

}  // namespace support
