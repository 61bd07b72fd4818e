// SPDX-License-Identifier: Apache-2.0
//
// The desktop's settings store as a peer: one integer under one key, written synchronously.
#pragma once

#include <memory>
#include <string>

namespace bench {

class DconfStore {
 public:
  virtual ~DconfStore() = default;
  virtual void set(int value) = 0;
};

/// Null, with a `reason`, where the build or the machine lacks dconf or a session bus.
[[nodiscard]] std::unique_ptr<DconfStore> StartDconf(std::string& reason);

}  // namespace bench
