// SPDX-License-Identifier: Apache-2.0
//
// The capabilities of the calling thread (capabilities(7)). Any thread, each for itself; no state
// but the kernel's.
#pragma once

#include <linux/capability.h>

#include <array>

namespace platform {

/// The three sets, 64 capabilities each, numbered as in <linux/capability.h>.
struct Capabilities {
  std::array<__user_cap_data_struct, _LINUX_CAPABILITY_U32S_3> words{};

  [[nodiscard]] bool mayHave(unsigned capability) const {
    return (words[CAP_TO_INDEX(capability)].permitted & CAP_TO_MASK(capability)) != 0;
  }
  [[nodiscard]] bool has(unsigned capability) const {
    return (words[CAP_TO_INDEX(capability)].effective & CAP_TO_MASK(capability)) != 0;
  }
};

/// The calling thread's; nobody's, should the kernel not tell.
[[nodiscard]] Capabilities CurrentCapabilities();

/// Makes `capabilities` the calling thread's. False, with errno, when one is beyond what it may
/// have, or the call is refused.
[[nodiscard]] bool SetCapabilities(const Capabilities& capabilities);

/// Puts a capability that the thread may have in effect while this object lives. Does nothing
/// without it, or where it is in effect already. Lives and dies on one thread.
class CapabilityInEffect {
 public:
  explicit CapabilityInEffect(unsigned capability);
  ~CapabilityInEffect();
  CapabilityInEffect(const CapabilityInEffect&) = delete;
  CapabilityInEffect& operator=(const CapabilityInEffect&) = delete;

 private:
  const Capabilities before_;
  bool raised_ = false;
};

}  // namespace platform
