// SPDX-License-Identifier: Apache-2.0
//
// Copies one item, with everything below it, from descriptor to descriptor. No state between calls;
// any thread.
#pragma once

#include "Helper/Platform/Linux/FileLocation.h"

namespace platform {

enum class CopyRule {
  kSkipWhatFails,  // the rest of a tree arrives, and the first failure is answered
  kAllOrNothing    // any failure leaves the destination as it was
};

/// Copies as FileManager::copyItem() promises. A file takes shape without a name where the file
/// system can do that, a tree under a work name in the destination's folder (WorkName.h); both get
/// their final name last. An error number, or 0.
[[nodiscard]] int CopyTree(const FileLocation& source, const FileLocation& destination,
                           CopyRule rule);

}  // namespace platform
