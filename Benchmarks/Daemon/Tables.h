// SPDX-License-Identifier: Apache-2.0
//
// The measurements of DaemonBenchmark, one function for each table. All run inside the private
// system.
#pragma once

#include "Benchmarks/Support/Report.h"

namespace bench {

/// From the launcher's fork to the answer of the connect that was waiting.
[[nodiscard]] Table MeasureStart();
/// Memory and wake-ups with one client connected that asks nothing.
[[nodiscard]] Table MeasureRest();
/// A preference that is in the helper's cache, beside a bare round trip of the same bytes.
[[nodiscard]] Table MeasurePreferenceReads();
/// A preference set and on the disk, beside the bare steps that durability takes, and dconf.
[[nodiscard]] Table MeasurePreferenceWrites();

}  // namespace bench
