// SPDX-License-Identifier: Apache-2.0
//
// Check-in of a named service port: handed over by the launcher (sd_listen_fds(3) describes the
// three variables) or bound by ourselves; then the launcher is told. Main thread, at start-up.
#include <fcntl.h>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <charconv>
#include <cstdlib>
#include <string_view>

#include "Helper/Platform/Linux/LauncherNotice.h"
#include "Helper/Platform/PortEntry.h"
#include "Helper/Platform/ProcessIdentity.h"
#include "Helper/Platform/UnixSocketAddress.h"

namespace platform {
namespace {

constexpr int kFirstHandedOverDescriptor = 3;

std::string_view Variable(const char* name) {
  const char* value = std::getenv(name);  // NOLINT(concurrency-mt-unsafe): start-up, one thread
  return value ? std::string_view(value) : std::string_view();
}

int Number(std::string_view text) {
  int value = -1;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  return error == std::errc{} && end == text.data() + text.size() ? value : -1;
}

/// The descriptor that the launcher handed over under `serviceName`, or an empty one.
FileDescriptor HandedOver(std::string_view serviceName) {
  if (Number(Variable("LISTEN_PID")) != ::getpid()) return {};
  const int count = Number(Variable("LISTEN_FDS"));
  std::string_view names = Variable("LISTEN_FDNAMES");
  for (int index = 0; index < count; ++index) {
    const std::size_t end = names.find(':');
    if (names.substr(0, end) == serviceName) {
      FileDescriptor descriptor(kFirstHandedOverDescriptor + index);
      if (::fcntl(descriptor.get(), F_SETFD, FD_CLOEXEC) != 0) {
        (void)descriptor.release();  // nothing open stands there, so there is nothing to close
      }
      return descriptor;
    }
    if (end == std::string_view::npos) break;
    names.remove_prefix(end + 1);
  }
  return {};
}

bool IsDatagramSocket(int descriptor) {
  int domain = 0;
  int type = 0;
  socklen_t length = sizeof domain;
  return ::getsockopt(descriptor, SOL_SOCKET, SO_DOMAIN, &domain, &length) == 0 &&
         ::getsockopt(descriptor, SOL_SOCKET, SO_TYPE, &type, &length) == 0 && domain == AF_UNIX &&
         type == SOCK_DGRAM;
}

/// Asks the kernel to attest senders: their ids, and where it can their pidfd.
bool AskForSenders(int descriptor) {
  const int on = 1;
  // Older kernels know no SO_PASSPIDFD: the receiver then opens the pidfd itself.
  (void)::setsockopt(descriptor, SOL_SOCKET, kSocketPassPidfd, &on, sizeof on);
  return ::setsockopt(descriptor, SOL_SOCKET, SO_PASSCRED, &on, sizeof on) == 0;
}

KernReturn CodeOfErrno() {
  return errno == EMFILE || errno == ENFILE || errno == ENOMEM || errno == ENOBUFS
             ? KERN_RESOURCE_SHORTAGE
             : KERN_FAILURE;
}

/// Held by the one process that takes a service's name. A file of its own, in a folder that only
/// the owner writes to, so that no other user can keep it locked; it goes away with the lock.
class NameLock {
 public:
  explicit NameLock(std::string path) : path_(std::move(path)) {
    constexpr int kFlags = O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC;
    do {
      file_.reset(::open(path_.c_str(), kFlags, S_IRUSR | S_IWUSR));
      if (file_ && ::flock(file_.get(), LOCK_EX) != 0) file_.reset();
    } while (file_ && !isInPlace());  // it went away with another's lock meanwhile
  }
  ~NameLock() {
    if (file_) (void)::unlink(path_.c_str());
  }
  NameLock(const NameLock&) = delete;
  NameLock& operator=(const NameLock&) = delete;

  [[nodiscard]] explicit operator bool() const { return static_cast<bool>(file_); }

 private:
  [[nodiscard]] bool isInPlace() const {
    struct stat held {};
    struct stat found {};
    return ::fstat(file_.get(), &held) == 0 && ::lstat(path_.c_str(), &found) == 0 &&
           held.st_dev == found.st_dev && held.st_ino == found.st_ino;
  }

  const std::string path_;
  FileDescriptor file_;
};

/// Binds with mode 0660 from the first moment on.
bool BindForGroup(const FileDescriptor& socket, const UnixSocketAddress& address) {
  // Start-up has one thread, so the mask is nobody else's.
  const mode_t mask = ::umask(S_IXUSR | S_IXGRP | S_IRWXO);
  const bool bound = ::bind(socket.get(), address.get(), address.size()) == 0;
  ::umask(mask);
  return bound;
}

/// A folder for one socket until that is moved to its place, which nobody else can enter or
/// foresee.
class FolderForSocket {
 public:
  explicit FolderForSocket(std::string pattern) : folder_(std::move(pattern)) {
    if (!::mkdtemp(folder_.data())) folder_.clear();
  }
  ~FolderForSocket() {
    if (folder_.empty()) return;
    (void)::unlink(socketPath().c_str());  // still there only where it could not be moved
    (void)::rmdir(folder_.c_str());
  }
  FolderForSocket(const FolderForSocket&) = delete;
  FolderForSocket& operator=(const FolderForSocket&) = delete;

  [[nodiscard]] explicit operator bool() const { return !folder_.empty(); }
  [[nodiscard]] std::string socketPath() const { return folder_ + "/port"; }

 private:
  std::string folder_;
};

/// Whether a service of this user or of root serves, or may serve, the socket at `path`. Others can
/// put theirs there, where they may write to the folder; that makes them no service.
bool IsServed(const std::string& path, const UnixSocketAddress& address) {
  struct stat found {};
  if (::lstat(path.c_str(), &found) != 0) return errno != ENOENT;
  if (found.st_uid != ::geteuid() && found.st_uid != 0) return false;
  const FileDescriptor probe(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  return !probe || ::connect(probe.get(), address.get(), address.size()) == 0 ||
         errno != ECONNREFUSED;
}

/// Binds the service's socket, in place of one that nobody serves any more. No service's name
/// begins with a dot, so none meets what is made here for the moment.
KernReturn Bind(const std::string& directory, const std::string& service, PortEntry& entry) {
  const std::string path = directory + "/" + service;
  const UnixSocketAddress address(path);
  if (!address) return KERN_INVALID_ARGUMENT;
  FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  if (!socket || !AskForSenders(socket.get())) return CodeOfErrno();
  // From the look at what is there to its replacement no other helper may put its own there.
  const std::string parent = directory.substr(0, directory.rfind('/'));
  const NameLock lock(parent + "/." + service + ".lock");
  if (!lock) return CodeOfErrno();
  if (IsServed(path, address)) return KERN_NO_ACCESS;
  const FolderForSocket folder(directory + "/." + service + ".XXXXXX");
  if (!folder) return CodeOfErrno();
  const UnixSocketAddress ownAddress(folder.socketPath());
  if (!ownAddress) return KERN_INVALID_ARGUMENT;
  // Moved there, it takes the old one's place at once: at no time is the name free for others.
  if (!BindForGroup(socket, ownAddress) ||
      ::rename(folder.socketPath().c_str(), path.c_str()) != 0) {
    return CodeOfErrno();
  }
  entry.receive = std::make_shared<const FileDescriptor>(std::move(socket));
  return KERN_SUCCESS;
}

}  // namespace

KernReturn BootstrapCheckIn(const char* serviceName, PortName& name) {
  const std::string_view service(serviceName);
  if (service.empty() || service.front() == '.' || service.find('/') != std::string_view::npos) {
    return KERN_INVALID_ARGUMENT;
  }
  PortEntry entry;
  if (FileDescriptor handedOver = HandedOver(service)) {
    if (!IsDatagramSocket(handedOver.get()) || !AskForSenders(handedOver.get())) {
      return KERN_FAILURE;
    }
    entry.receive = std::make_shared<const FileDescriptor>(std::move(handedOver));
  } else {
    const std::string directory = HALVEC_PORTS_DIRECTORY;
    // The folder is the distribution's to make; where it did not, its default mode serves.
    for (std::size_t end = directory.find('/', 1); end != std::string::npos;
         end = directory.find('/', end + 1)) {
      (void)::mkdir(directory.substr(0, end).c_str(),
                    S_IRWXU | S_IRGRP | S_IXGRP | S_IROTH | S_IXOTH);
    }
    (void)::mkdir(directory.c_str(), S_IRWXU | S_IRGRP | S_IXGRP | S_IROTH | S_IXOTH);
    const KernReturn code = Bind(directory, serviceName, entry);
    if (code != KERN_SUCCESS) return code;
  }
  name = PortInsertEntry(std::move(entry));
  TellLauncherReady();
  return KERN_SUCCESS;
}

}  // namespace platform
