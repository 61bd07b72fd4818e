// SPDX-License-Identifier: Apache-2.0
//
// Replaces the allocation functions of the whole program by counting ones. Any thread.
#include "Tests/Support/LiveAllocations.h"

#include <atomic>
#include <cstdlib>
#include <new>

namespace {

std::atomic<std::ptrdiff_t> live{0};

void Release(void* block) noexcept {
  if (block) --live;
  std::free(block);
}

}  // namespace

namespace support {

std::ptrdiff_t LiveAllocations() { return live; }

}  // namespace support

void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
  void* block = std::malloc(size == 0 ? 1 : size);
  if (block) ++live;
  return block;
}
void* operator new(std::size_t size) {
  void* block = operator new(size, std::nothrow);
  if (!block) throw std::bad_alloc();
  return block;
}
void operator delete(void* block) noexcept { Release(block); }
void operator delete(void* block, std::size_t) noexcept { Release(block); }
