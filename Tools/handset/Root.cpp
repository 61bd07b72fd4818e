// SPDX-License-Identifier: Apache-2.0
//
// Two halves: what must be taken from the host while it is in sight, and what is built inside,
// where every path means what it says. One thread, no lock.
#include "Tools/handset/Root.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <memory>
#include <string_view>
#include <utility>
#include <vector>

#include "Tools/handset/Entitlements.h"
#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"
#include "Tools/handset/Mounts.h"
#include "Tools/handset/UserDatabase.h"
#include "Tools/handset/WebServer.h"

namespace handset {
namespace {

using platform::FileDescriptor;

/// The new root is put together on top of this folder, which every host has; nothing of the host's
/// is looked up below it afterwards.
constexpr const char* kBuildingSite = "/proc";

constexpr std::array<std::string_view, 3> kLayered{"/etc", "/usr", "/var"};
constexpr std::array<std::string_view, 9> kOwn{"proc", "sys",     "dev",     "tmp",       "run",
                                               "root", "private", "Library", "lost+found"};
constexpr std::array<const char*, 6> kDevices{"/dev/null",   "/dev/zero",    "/dev/full",
                                              "/dev/random", "/dev/urandom", "/dev/tty"};

struct PendingTree {
  FileDescriptor tree;
  std::string path;
  bool directory = true;
};

struct PendingExecutable {
  FileDescriptor source;
  std::string path;
};

/// What the second half needs from the host.
struct FromHost {
  std::vector<PendingTree> covers;   ///< Mounted on the host below a layered folder.
  std::vector<PendingTree> devices;  ///< Single device files.
  std::vector<PendingTree> binds;    ///< What the caller asked for.
  std::vector<PendingTree> state;    ///< Folders that outlive the run.
  std::vector<PendingExecutable> executables;
};

template <typename Names>
bool Contains(const Names& names, std::string_view name) {
  return std::find(names.begin(), names.end(), name) != names.end();
}

PendingTree Take(const std::string& hostPath, std::string inside, Access access) {
  struct stat facts {};
  if (stat(hostPath.c_str(), &facts) != 0) throw Failure::FromErrno(hostPath);
  return {CloneTree(hostPath, access), std::move(inside), S_ISDIR(facts.st_mode)};
}

/// A folder of the handset that holds data: in memory, or in the state folder of the host.
struct DataFolder {
  const char* name;  ///< In the state folder.
  std::string inside;
  const char* mode;
  uid_t owner;
  gid_t group;
};

/// The homes of the mobile user and of the helper, which is root here, the any-user preferences,
/// the services' own data and the voicemail tokens, whose folder the helper closes itself.
std::vector<DataFolder> DataFolders() {
  const std::string tokenStore = HALVEC_TOKEN_STORE;
  return {{"mobile", "/var/mobile", "755", kMobileUser, kMobileGroup},
          {"Library", "/Library", "755", 0, 0},
          {"lib-halvec", "/var/lib/halvec", "755", 0, 0},
          {"root", "/root", "700", 0, 0},
          {"tokens", tokenStore.substr(0, tokenStore.find_last_of('/')), "755", 0, 0}};
}

/// Takes each data folder from `directory`, so that it outlives the run; made on first use.
void TakeState(const std::string& directory, FromHost& host) {
  std::unique_ptr<char, decltype(&std::free)> resolved(realpath(directory.c_str(), nullptr),
                                                       &std::free);
  if (!resolved) throw Failure::FromErrno("--state " + directory);
  for (const DataFolder& kept : DataFolders()) {
    const std::string path = std::string(resolved.get()) + "/" + kept.name;
    const auto mode = static_cast<mode_t>(std::strtoul(kept.mode, nullptr, 8));
    if (mkdir(path.c_str(), mode) == 0) {
      if (chmod(path.c_str(), mode) != 0 || chown(path.c_str(), kept.owner, kept.group) != 0) {
        throw Failure::FromErrno("prepare " + path);
      }
    } else if (errno != EEXIST) {
      throw Failure::FromErrno("mkdir " + path);
    }
    host.state.push_back(Take(path, kept.inside, Access::kReadWrite));
  }
}

FromHost TakeFromHost(const RunOptions& options) {
  FromHost host;
  host.executables.push_back({OpenExecutable("/proc/self/exe", "this tool"), kToolInside});
  host.executables.push_back({OpenExecutable(options.helper, "--helper"), kHelperInside});
  for (const auto& [source, name] : options.installs) {
    host.executables.push_back(
        {OpenExecutable(source, "--install"), std::string(kInstallDirectory) + "/" + name});
  }
  for (const auto& [source, path] : options.binds) {
    host.binds.push_back(Take(source, path, Access::kReadWrite));
  }
  if (!options.webDirectory.empty()) {
    host.binds.push_back(Take(options.webDirectory, kWebFolder, Access::kReadWrite));
    if (!host.binds.back().directory) throw Failure("--web needs a folder");
  }
  if (!options.stateDirectory.empty()) TakeState(options.stateDirectory, host);
  for (const char* device : kDevices) {
    if (access(device, F_OK) != 0) continue;
    host.devices.push_back(Take(device, device, Access::kReadWrite));
  }
  const std::string mounts = ReadWholeFile("/proc/self/mountinfo");
  for (const std::string_view folder : kLayered) {
    // A layer shows what lies below the host's mounts there, not the mounts: put them back, so
    // that what the host covers stays covered.
    for (std::string& point : MountPointsBelow(mounts, std::string(folder))) {
      host.covers.push_back(Take(point, point, Access::kReadOnly));
    }
  }
  return host;
}

/// Folders and links of the host's root that the handset shows as they are.
struct TopLevel {
  std::vector<PendingTree> folders;
  std::vector<std::pair<std::string, std::string>> links;  ///< Path, target.
};

TopLevel TakeTopLevel() {
  const std::unique_ptr<DIR, int (*)(DIR*)> root(opendir("/"), &closedir);
  if (!root) throw Failure::FromErrno("open /");
  TopLevel top;
  // Only this thread reads this stream.
  // NOLINTNEXTLINE(concurrency-mt-unsafe)
  while (const dirent* entry = readdir(root.get())) {
    const std::string name = static_cast<const char*>(entry->d_name);
    const std::string path = "/" + name;
    if (name == "." || name == ".." || Contains(kOwn, name) || Contains(kLayered, path)) continue;
    struct stat facts {};
    if (lstat(path.c_str(), &facts) != 0) continue;
    if (S_ISDIR(facts.st_mode)) {
      top.folders.push_back(Take(path, path, Access::kReadOnly));
    } else if (S_ISLNK(facts.st_mode)) {
      std::array<char, 4096> target{};
      const ssize_t length = readlink(path.c_str(), target.data(), target.size());
      if (length < 0) throw Failure::FromErrno("readlink " + path);
      top.links.emplace_back(path, std::string(target.data(), static_cast<std::size_t>(length)));
    }
  }
  return top;
}

void BuildSkeleton(const TopLevel& top) {
  const std::string site = kBuildingSite;
  MountNew("tmpfs", site, "mode=755", 0);
  for (const auto& [name, target] : top.links) {
    if (symlink(target.c_str(), (site + name).c_str()) != 0) {
      throw Failure::FromErrno("link " + name);
    }
  }
  for (const PendingTree& folder : top.folders) {
    MakeDirectories(site + folder.path);
    AttachTree(folder.tree, site + folder.path);
  }
  // The upper layers live in a file system of their own that nobody can name once it is detached:
  // the overlays keep it.
  const std::string store = std::string(kBuildingSite) + "/layers";
  MountMemory(store, "700");
  for (const std::string_view name : kLayered) {
    const std::string folder(name);
    const std::string place = site + folder;
    const std::string upper = store + folder;
    const std::string work = upper + ".work";
    MakeDirectories(upper);
    MakeDirectories(work);
    MakeDirectories(place);
    std::string layers = "lowerdir=" + folder;
    layers.append(",upperdir=").append(upper).append(",workdir=").append(work);
    MountNew("overlay", place, layers, 0);
  }
  if (umount2(store.c_str(), MNT_DETACH) != 0 || rmdir(store.c_str()) != 0) {
    throw Failure::FromErrno("detach the layers");
  }
  for (const char* folder : {"/proc", "/sys", "/dev"}) MakeDirectories(site + folder);
  MountNew("proc", site + "/proc", "", MS_NOSUID | MS_NODEV | MS_NOEXEC);
  MountNew("sysfs", site + "/sys", "", MS_NOSUID | MS_NODEV | MS_NOEXEC | MS_RDONLY);
}

/// Attaches where the caller says, creating an empty folder or file to attach to.
void AttachCreating(const PendingTree& tree) {
  struct stat facts {};
  if (lstat(tree.path.c_str(), &facts) != 0) {
    if (tree.directory) {
      MakeDirectories(tree.path);
    } else {
      const std::size_t slash = tree.path.find_last_of('/');
      if (slash > 0) MakeDirectories(tree.path.substr(0, slash));
      const FileDescriptor file(
          open(tree.path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644));
      if (!file) throw Failure::FromErrno("create " + tree.path);
    }
  }
  AttachTree(tree.tree, tree.path);
}

void MakeLink(const char* target, const char* path) {
  if (symlink(target, path) != 0) throw Failure::FromErrno(std::string("link ") + path);
}

void BuildDevices(const FromHost& host) {
  MountNew("tmpfs", "/dev", "mode=755", MS_NOSUID);
  for (const PendingTree& device : host.devices) AttachCreating(device);
  MakeLink("/proc/self/fd", "/dev/fd");
  MakeLink("/proc/self/fd/0", "/dev/stdin");
  MakeLink("/proc/self/fd/1", "/dev/stdout");
  MakeLink("/proc/self/fd/2", "/dev/stderr");
  MakeDirectories("/dev/pts");
  MountNew("devpts", "/dev/pts", "newinstance,ptmxmode=0666,mode=620", MS_NOSUID | MS_NOEXEC);
  MakeLink("pts/ptmx", "/dev/ptmx");
  MountMemory("/dev/shm", "1777");
}

void BuildFolders(const FromHost& host) {
  MountMemory("/tmp", "1777");
  MountMemory("/run", "755");
  MakeDirectories("/run/lock");
  MakeDirectories("/private");
  // A link and not a second mount: a rename from one name of the folder to the other must work.
  MakeLink("../var", "/private/var");
  MakeDirectories("/var/empty");
  if (host.state.empty()) {
    for (const DataFolder& folder : DataFolders()) {
      MountMemory(folder.inside, folder.mode, folder.owner, folder.group);
    }
  }
  for (const PendingTree& kept : host.state) AttachCreating(kept);
  MakeDirectories("/Library/Preferences");
  MountMemory(kInstallDirectory, "755");
  for (const std::string& directory : EntitlementDirectories()) MountMemory(directory, "755");
  MakeDirectories(kControlDirectory);
}

}  // namespace

void EnterRoot(const RunOptions& options) {
  MakeMountsPrivate();
  const FromHost host = TakeFromHost(options);
  BuildSkeleton(TakeTopLevel());
  PivotInto(kBuildingSite);
  for (const PendingTree& cover : host.covers) AttachCreating(cover);
  BuildDevices(host);
  BuildFolders(host);
  InstallUserDatabase();
  for (const PendingExecutable& executable : host.executables) {
    CopyExecutable(executable.source.get(), executable.path);
  }
  for (const PendingTree& bind : host.binds) AttachCreating(bind);
}

}  // namespace handset
