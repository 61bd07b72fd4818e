// SPDX-License-Identifier: Apache-2.0
//
// Real regions that are counted, and that can be made to run out. One thread at a time.
#pragma once

#include "Helper/Platform/TaskMemory.h"

namespace fakes {

class FakeTaskMemory final : public platform::TaskMemory {
 public:
  KernReturn allocate(platform::VmAddress& address, std::size_t size) override {
    if (fails_) return KERN_NO_SPACE;
    ++regions_;
    return real_.allocate(address, size);
  }
  void deallocate(platform::VmAddress address, std::size_t size) override {
    --regions_;
    real_.deallocate(address, size);
  }

  /// Makes every allocation fail from now on.
  void runOut() { fails_ = true; }
  /// Regions that have been allocated and not given back.
  [[nodiscard]] int regions() const { return regions_; }

 private:
  platform::TaskMemory& real_ = platform::DefaultProvider<platform::TaskMemory>();
  bool fails_ = false;
  int regions_ = 0;
};

}  // namespace fakes
