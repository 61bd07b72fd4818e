// SPDX-License-Identifier: Apache-2.0
#include "Benchmarks/Daemon/Dconf.h"

namespace bench {

std::unique_ptr<DconfStore> StartDconf(std::string& reason) {
  reason = "built without libdconf and libsystemd";
  return nullptr;
}

}  // namespace bench
