// SPDX-License-Identifier: Apache-2.0
//
// Starts programs as a service launcher does, and looks at them from outside. One thread.
#pragma once

#include <string>

#include "Benchmarks/Support/Measure.h"
#include "Benchmarks/Support/WireClient.h"

namespace bench {

/// Runs `program` with `service` handed over as the helper's service port.
[[nodiscard]] Child Launch(const std::string& program, const FileDescriptor& service);

/// Reads and drops what arrives at /dev/log, like a log daemon that costs nothing to itself.
[[nodiscard]] Child StartLogDaemon(int processor);

/// Proportional set size in KiB, and how often the process's threads have gone to sleep.
[[nodiscard]] double MemoryOf(const Child& process);
[[nodiscard]] double SleepsOf(const Child& process);

}  // namespace bench
