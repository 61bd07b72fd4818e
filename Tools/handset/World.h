// SPDX-License-Identifier: Apache-2.0
//
// The world: a second network namespace, in which the far sides of the handset's links stand. Only
// the network differs there; files, users and processes are the handset's. One thread, no lock.
#pragma once

#include <functional>

#include "Helper/Platform/FileDescriptor.h"

namespace handset {

/// A file that stands for the world's network namespace, for setns(2).
inline constexpr const char* kWorldFile = "/run/handset/world";

class World {
 public:
  /// Makes the namespace and the file that stands for it. The caller is in the handset's own
  /// network and mount namespace. Throws Failure.
  World();

  /// Runs `action` with the world as the thread's network namespace. Sockets made there stay there.
  /// Throws what `action` throws.
  void inside(const std::function<void()>& action) const;

  /// Descriptor of the namespace; stays owned here.
  [[nodiscard]] int descriptor() const { return world_.get(); }

 private:
  platform::FileDescriptor handset_;
  platform::FileDescriptor world_;
};

/// For a process about to execute something: makes the world of the handset around it its network.
/// Throws Failure where there is none.
void EnterWorld();

}  // namespace handset
