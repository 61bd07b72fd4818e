// SPDX-License-Identifier: Apache-2.0
//
// The handset's file system: a root in memory that shows the host's folders read-only, with
// writable layers over /etc, /usr and /var and the handset's own folders on top. It lives in a
// mount namespace of its own and is gone with the last process in there. One thread, no lock.
#pragma once

#include <string>

#include "Tools/handset/Options.h"

namespace handset {

/// Where executables that are to be entitled stand: root's, writable by nobody else, all the way
/// up.
inline constexpr const char* kInstallDirectory = "/usr/libexec/halvec";
inline constexpr const char* kControlDirectory = "/run/handset";

/// Path of the helper and of this tool inside.
inline constexpr const char* kHelperInside = "/usr/libexec/halvec/HalvecMobileHelper";
inline constexpr const char* kToolInside = "/usr/bin/handset";

/// Assembles the root and enters it. The caller is the first process of new mount, pid and network
/// namespaces. `options.helper` names an existing file. Throws Failure; the caller then ends, and
/// its namespaces with it.
void EnterRoot(const RunOptions& options);

}  // namespace handset
