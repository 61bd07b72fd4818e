// SPDX-License-Identifier: Apache-2.0
//
// Stands in for the D-Bus peers where the machine that built the benchmark has no libsystemd.
#include "Benchmarks/Transport/Peer.h"

namespace bench {

std::unique_ptr<Driver> StartBus(const Placement& /*placement*/, std::size_t /*connections*/,
                                 Bus /*bus*/, std::string& reason) {
  reason = "built without libsystemd (package libsystemd-dev)";
  return nullptr;
}

std::unique_ptr<Connector> StartBusConnector(const Placement& /*placement*/, std::string& reason) {
  reason = "built without libsystemd (package libsystemd-dev)";
  return nullptr;
}

}  // namespace bench
