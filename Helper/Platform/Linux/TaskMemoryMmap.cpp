// SPDX-License-Identifier: Apache-2.0
//
// Large regions from mmap(2), each given back to the kernel as it was taken; small ones from the
// heap, wiped before they go back there, so that what was handed over has left either way. No
// state, any thread.
#include <sys/mman.h>

#include <cstdlib>
#include <cstring>

#include "Helper/Platform/TaskMemory.h"

namespace platform {
namespace {

/// Smaller regions come from the heap: a mapping of their own costs two calls into the kernel and,
/// when it is taken back, an interrupt of the processors on which our other threads run.
constexpr std::size_t kSmallestMapping = std::size_t{64} << 10;

class MappedTaskMemory final : public TaskMemory {
 public:
  KernReturn allocate(VmAddress& address, std::size_t size) override {
    if (size == 0) return KERN_INVALID_ARGUMENT;
    if (size < kSmallestMapping) {
      void* region = std::calloc(1, size);  // NOLINT: given back below, by size
      if (!region) return KERN_NO_SPACE;
      address = reinterpret_cast<VmAddress>(region);
      return KERN_SUCCESS;
    }
    // Populated at once: the caller fills the region right away, and one call is cheaper than a
    // fault for every page.
    void* region = ::mmap(nullptr, size, PROT_READ | PROT_WRITE,
                          MAP_PRIVATE | MAP_ANONYMOUS | MAP_POPULATE, -1, 0);
    if (region == MAP_FAILED) return KERN_NO_SPACE;
    address = reinterpret_cast<VmAddress>(region);
    return KERN_SUCCESS;
  }

  void deallocate(VmAddress address, std::size_t size) override {
    if (address == 0) return;
    auto* region = reinterpret_cast<void*>(address);  // NOLINT: a region of ours
    if (size < kSmallestMapping) {
      ::explicit_bzero(region, size);
      return std::free(region);  // NOLINT: allocated above
    }
    (void)::munmap(region, size);
  }
};

}  // namespace

template <>
TaskMemory& DefaultProvider<TaskMemory>() {
  static auto& memory = *new MappedTaskMemory;
  return memory;
}

}  // namespace platform
