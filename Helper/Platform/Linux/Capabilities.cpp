// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/Capabilities.h"

#include <sys/syscall.h>
#include <unistd.h>

namespace platform {

Capabilities CurrentCapabilities() {
  Capabilities current;
  __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
  if (::syscall(SYS_capget, &header, current.words.data()) != 0) return {};
  return current;
}

bool SetCapabilities(const Capabilities& capabilities) {
  __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
  return ::syscall(SYS_capset, &header, capabilities.words.data()) == 0;
}

CapabilityInEffect::CapabilityInEffect(unsigned capability) : before_(CurrentCapabilities()) {
  if (before_.has(capability) || !before_.mayHave(capability)) return;
  Capabilities with = before_;
  with.words[CAP_TO_INDEX(capability)].effective |= CAP_TO_MASK(capability);
  raised_ = SetCapabilities(with);
}

CapabilityInEffect::~CapabilityInEffect() {
  if (raised_) (void)SetCapabilities(before_);  // what was in effect a moment ago is not refused
}

}  // namespace platform
