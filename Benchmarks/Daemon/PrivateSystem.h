// SPDX-License-Identifier: Apache-2.0
//
// A mount namespace of the benchmark's own, so that the real helper runs with its real paths and
// leaves no trace: /run, /etc and /dev are private, the home is an empty folder on the real disk.
#pragma once

#include <string>

namespace bench {

/// Where the programs are put inside: owned by root all the way up, as entitlements require.
inline constexpr char kProgramFolder[] = "/run/halvec-benchmark";

/// Moves the calling process into a private system whose home folder is `home`, copies `program`
/// and `helper` and `trivial` into kProgramFolder and entitles `program`. Needs root.
void EnterPrivateSystem(const std::string& home, const std::string& program,
                        const std::string& helper, const std::string& trivial);

}  // namespace bench
