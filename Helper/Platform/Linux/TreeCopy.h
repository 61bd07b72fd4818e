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

/// Copies as FileManager::copyItem() promises. The item takes shape under a name of its own in the
/// destination's folder, ".copy-" and sixteen hexadecimal digits, and gets its final name last; a
/// process that is killed meanwhile leaves that name behind. An error number, or 0.
[[nodiscard]] int CopyTree(const FileLocation& source, const FileLocation& destination,
                           CopyRule rule);

}  // namespace platform
