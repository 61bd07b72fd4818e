// SPDX-License-Identifier: Apache-2.0
//
// The actions of halvecctl location that ask the helper.
#pragma once

#include "Tools/halvecctl/CommandLine.h"
#include "Tools/halvecctl/Exit.h"

namespace halvecctl {

/// resolve LATITUDE LONGITUDE [--wait]
[[nodiscard]] ExitCode RunResolve(const GlobalOptions& options, Words words);

/// country
[[nodiscard]] ExitCode RunCountry(const GlobalOptions& options, Words words);

}  // namespace halvecctl
