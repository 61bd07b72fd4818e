// SPDX-License-Identifier: Apache-2.0
//
// One thread, no lock: setns concerns the calling thread alone.
#include "Tools/handset/World.h"

#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <unistd.h>

#include "Tools/handset/Failure.h"

namespace handset {
namespace {

using platform::FileDescriptor;

constexpr const char* kOwnNamespace = "/proc/thread-self/ns/net";

FileDescriptor OwnNamespace() {
  FileDescriptor file(open(kOwnNamespace, O_RDONLY | O_CLOEXEC));
  if (!file) throw Failure::FromErrno(std::string("open ") + kOwnNamespace);
  return file;
}

void Enter(const FileDescriptor& space) {
  if (setns(space.get(), CLONE_NEWNET) != 0) throw Failure::FromErrno("change the network");
}

}  // namespace

World::World() : handset_(OwnNamespace()) {
  if (unshare(CLONE_NEWNET) != 0) throw Failure::FromErrno("make the world");
  world_ = OwnNamespace();
  const FileDescriptor place(open(kWorldFile, O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
  if (!place || mount(kOwnNamespace, kWorldFile, nullptr, MS_BIND, nullptr) != 0) {
    throw Failure::FromErrno(std::string("make ") + kWorldFile);
  }
  Enter(handset_);
}

void World::inside(const std::function<void()>& action) const {
  Enter(world_);
  try {
    action();
  } catch (...) {
    Enter(handset_);
    throw;
  }
  Enter(handset_);
}

void EnterWorld() {
  const FileDescriptor world(open(kWorldFile, O_RDONLY | O_CLOEXEC));
  if (!world) throw Failure::FromErrno("find the world");
  Enter(world);
}

}  // namespace handset
