// SPDX-License-Identifier: Apache-2.0
//
// Regions from mmap(2), each given back to the kernel as it was taken. No state, any thread.
#include <sys/mman.h>

#include "Helper/Platform/TaskMemory.h"

namespace platform {
namespace {

class MappedTaskMemory final : public TaskMemory {
 public:
  KernReturn allocate(VmAddress& address, std::size_t size) override {
    if (size == 0) return KERN_INVALID_ARGUMENT;
    // Populated at once: the caller fills the region right away, and one call is cheaper than a
    // fault for every page.
    void* region = ::mmap(nullptr, size, PROT_READ | PROT_WRITE,
                          MAP_PRIVATE | MAP_ANONYMOUS | MAP_POPULATE, -1, 0);
    if (region == MAP_FAILED) return KERN_NO_SPACE;
    address = reinterpret_cast<VmAddress>(region);
    return KERN_SUCCESS;
  }

  void deallocate(VmAddress address, std::size_t size) override {
    if (address != 0) ::munmap(reinterpret_cast<void*>(address), size);  // NOLINT: a region of ours
  }
};

}  // namespace

template <>
TaskMemory& DefaultProvider<TaskMemory>() {
  static MappedTaskMemory memory;
  return memory;
}

}  // namespace platform
