// SPDX-License-Identifier: Apache-2.0
//
// The measurements of TransportBenchmark, one function for each table.
#pragma once

#include <cstddef>

#include "Benchmarks/Support/Report.h"
#include "Benchmarks/Transport/Peer.h"

namespace bench {

/// How long to measure: the contestants take turns, `calls` calls each, `rounds` times.
struct Effort {
  std::size_t rounds;
  std::size_t calls;
};

/// One request and its reply, over every transport.
[[nodiscard]] Table MeasureRoundTrips(const Placement& placement, std::size_t connections,
                                      const Effort& effort);
/// From nothing to the first reply.
[[nodiscard]] Table MeasureFreshConnects(const Placement& placement, const Effort& effort);
/// Requests that carry much data.
[[nodiscard]] Table MeasureOutOfLine(const Placement& placement, const Effort& effort);
/// One client's latency beside a hundred others that never read a reply.
[[nodiscard]] Table MeasureBesideSilentClients(const Placement& placement, const Effort& effort);

}  // namespace bench
