// SPDX-License-Identifier: Apache-2.0
//
// The walls, from the outermost: mounts, capabilities, no new privileges, system calls. Each needs
// what the next takes away. Landlock is not among them: a process in a Landlock domain may not look
// at the executable of a process outside it, whatever its capabilities, and so could admit nobody.
#include "Helper/Platform/Confinement.h"

#include <fcntl.h>
#include <linux/capability.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdint>
#include <cstring>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Linux/Capabilities.h"
#include "Helper/Platform/Linux/SystemCallFilter.h"
#include "Helper/Platform/SystemLog.h"

namespace platform {
namespace {

/// Each with the request that needs it.
constexpr auto kNeeded = std::to_array<unsigned>({
    CAP_SYS_PTRACE,    // every connect: which executable the caller runs
    CAP_DAC_OVERRIDE,  // files: the mobile user's home; messages to the telephony daemon's ports
    CAP_CHOWN,         // CopyFile, CopyCrashLogs, MoveCarrierBundles: whose a placed item is
    CAP_FOWNER,        // the same and ExtractArchive: permissions and times of what others own
    CAP_NET_RAW,       // TriggerHeartbeat: echo requests
});

/// Keeps the needed ones. CAP_SYS_PTRACE is not in effect but while OpenProcessFile() runs: it lets
/// a path lead through /proc/PID/root, around everything that is covered here.
bool KeepNeeded(const Capabilities& current) {
  Capabilities kept;
  for (const unsigned capability : kNeeded) {
    auto& word = kept.words[CAP_TO_INDEX(capability)];
    word.permitted |= CAP_TO_MASK(capability) & current.words[CAP_TO_INDEX(capability)].permitted;
    word.effective = word.permitted;
  }
  kept.words[CAP_TO_INDEX(CAP_SYS_PTRACE)].effective &= ~CAP_TO_MASK(CAP_SYS_PTRACE);
  return SetCapabilities(kept);
}

/// A copy of what is mounted at `path` and, if it is a folder, below it; empty when there is none.
FileDescriptor MountsAt(const char* path) {
  return FileDescriptor(
      ::open_tree(AT_FDCWD, path, OPEN_TREE_CLONE | OPEN_TREE_CLOEXEC | unsigned{AT_RECURSIVE}));
}

bool Attach(const FileDescriptor& mounts, const char* path) {
  return ::move_mount(mounts.get(), "", AT_FDCWD, path, MOVE_MOUNT_F_EMPTY_PATH) == 0;
}

bool Change(int folder, const char* path, std::uint64_t attributes) {
  mount_attr change{};
  change.attr_set = attributes;
  return ::mount_setattr(folder, path, AT_EMPTY_PATH | AT_RECURSIVE, &change, sizeof change) == 0;
}

/// Gives the mounts at and below a folder other attributes, where need be after covering the folder
/// with itself. A folder that is not there needs nothing.
bool Cover(const char* path, std::uint64_t attributes) {
  if (Change(AT_FDCWD, path, attributes) || errno == ENOENT) return true;
  const FileDescriptor mounts = MountsAt(path);
  return mounts && Change(mounts.get(), "", attributes) && Attach(mounts, path);
}

/// A view of the file system in which the system itself cannot be changed. What others mount later
/// shows in it. Folders that clients may name stay as they are.
bool CoverTheSystem() {
  if (::unshare(CLONE_NEWNS) != 0) return false;
  if (::mount(nullptr, "/", nullptr, MS_REC | MS_SLAVE, nullptr) != 0) return false;
  // The only devices that libraries ask for.
  constexpr std::array kDevices{"/dev/null", "/dev/zero", "/dev/random", "/dev/urandom"};
  std::array<FileDescriptor, kDevices.size()> devices;
  for (std::size_t i = 0; i < kDevices.size(); ++i) devices[i] = MountsAt(kDevices[i]);
  bool covered = Cover("/dev", MOUNT_ATTR_RDONLY | MOUNT_ATTR_NODEV);
  for (std::size_t i = 0; i < kDevices.size(); ++i) {
    if (devices[i] && !Attach(devices[i], kDevices[i])) covered = false;
  }
  for (const char* folder : {"/usr", "/etc", "/boot", "/efi", "/sys", "/proc"}) {
    if (!Cover(folder, MOUNT_ATTR_RDONLY)) covered = false;
  }
  return covered;
}

void Require(bool done, const char* what) {
  if (done) return;
  const char* const reason =
      std::strerror(errno);  // NOLINT(concurrency-mt-unsafe): no other thread
  Log(LogPriority::kError, "Cannot confine: %s: %s", what, reason);
}

}  // namespace

void Confine() {
  const Capabilities current = CurrentCapabilities();
  if (current.has(CAP_SYS_ADMIN)) Require(CoverTheSystem(), "mounts");
  Require(KeepNeeded(current), "capabilities");
  Require(::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0, "privileges");
  // A launcher's own filter is the deployment's choice, and one is enough.
  if (::prctl(PR_GET_SECCOMP, 0, 0, 0, 0) == 0) Require(FilterSystemCalls(), "system calls");
}

}  // namespace platform
