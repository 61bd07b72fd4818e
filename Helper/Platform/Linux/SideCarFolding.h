// SPDX-License-Identifier: Apache-2.0
//
// Folds side-cars, once they and their items have been extracted, into extended attributes of the
// items. No state, any thread.
#pragma once

#include <string>
#include <string_view>

namespace platform {

/// What of a side-car becomes attributes. The rest is dropped.
struct SideCarWish {
  bool attributes = false;    // user.NAME each, and the finder information as user.finder-info
  bool resourceData = false;  // user.resource-data
};

/// Whether the last component of a path is "._" and a name.
[[nodiscard]] bool IsSideCarPath(std::string_view path);

/// Sets what the side-car at `path` below the folder `root` holds on its item: the one that stands
/// beside it, or, where none does, the one at the same path without its first folder. True when all
/// that is wished for has been kept, and the side-car is not needed any more. False, and attributes
/// may have been set, when there is no such file or folder, the side-car is none or has more than
/// 1 MiB, or the file system does not keep such attributes, or not as many bytes.
[[nodiscard]] bool FoldSideCar(int root, const std::string& path, SideCarWish wish);

}  // namespace platform
