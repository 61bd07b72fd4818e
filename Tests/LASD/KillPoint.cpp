// SPDX-License-Identifier: Apache-2.0
//
// Loaded into the real helper before anything else: counts what the updater's thread asks of the
// system, and kills the process just before a chosen call. /tmp/kill-at holds the number of that
// call, 0 for none; each call's name is appended to /tmp/calls. Only the updater's thread, which is
// one at a time, gets past the first line of Note().
#include <dlfcn.h>
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <unistd.h>

#include <array>
#include <cstdarg>
#include <cstdlib>
#include <cstring>
#include <string_view>

namespace {

/// The function that would have been called without this library.
template <class Function>
Function* Next(const char* name) {
  return reinterpret_cast<Function*>(::dlsym(RTLD_NEXT, name));
}

bool IsUpdatersThread() {
  std::array<char, 16> name{};
  return ::prctl(PR_GET_NAME, name.data()) == 0 && std::string_view(name.data()) == "LASDUpdater";
}

/// Straight to the system: the functions of the library are the ones being counted.
long ReadChosenCall() {
  const long file = ::syscall(SYS_openat, AT_FDCWD, "/tmp/kill-at", O_RDONLY | O_CLOEXEC);
  std::array<char, 16> text{};
  if (file < 0 || ::syscall(SYS_read, file, text.data(), text.size() - 1) < 0) std::abort();
  ::syscall(SYS_close, file);
  return std::strtol(text.data(), nullptr, 10);
}

void Append(const char* name) {
  const long file = ::syscall(SYS_openat, AT_FDCWD, "/tmp/calls",
                              O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, S_IRUSR | S_IWUSR);
  if (file < 0) std::abort();
  ::syscall(SYS_write, file, name, std::strlen(name));
  ::syscall(SYS_write, file, "\n", 1);
  ::syscall(SYS_close, file);
}

/// Whether this is the moment.
bool Note(const char* name) {
  if (!IsUpdatersThread()) return false;
  static const long chosen = ReadChosenCall();
  static long count = 0;
  Append(name);
  return ++count == chosen;
}

/// As a kill: nothing is flushed, no handler runs. The helper's own filter of system calls allows
/// it no signals, so that it cannot kill itself by one.
[[noreturn]] void Kill() {
  constexpr int kStatus = 128 + SIGKILL;
  for (;;) ::syscall(SYS_exit_group, kStatus);
}

template <class Function, class... Arguments>
auto Pass(const char* name, Arguments... arguments) {
  if (Note(name)) Kill();
  return Next<Function>(name)(arguments...);
}

}  // namespace

extern "C" {

int open(const char* path, int flags, ...) {
  va_list rest;
  va_start(rest, flags);
  const mode_t mode = va_arg(rest, mode_t);
  va_end(rest);
  return Pass<int(const char*, int, mode_t)>("open", path, flags, mode);
}

int openat(int folder, const char* path, int flags, ...) {
  va_list rest;
  va_start(rest, flags);
  const mode_t mode = va_arg(rest, mode_t);
  va_end(rest);
  return Pass<int(int, const char*, int, mode_t)>("openat", folder, path, flags, mode);
}

FILE* fopen(const char* path, const char* mode) {
  return Pass<FILE*(const char*, const char*)>("fopen", path, mode);
}

FILE* fopen64(const char* path, const char* mode) {
  return Pass<FILE*(const char*, const char*)>("fopen64", path, mode);
}

/// Half of it gets written before the process ends.
ssize_t write(int file, const void* bytes, size_t size) {
  auto* next = Next<ssize_t(int, const void*, size_t)>("write");
  if (!Note("write")) return next(file, bytes, size);
  (void)next(file, bytes, size / 2);
  Kill();
}

ssize_t writev(int file, const iovec* parts, int count) {
  return Pass<ssize_t(int, const iovec*, int)>("writev", file, parts, count);
}

int fsync(int file) { return Pass<int(int)>("fsync", file); }
int fchmod(int file, mode_t mode) { return Pass<int(int, mode_t)>("fchmod", file, mode); }
int mkdir(const char* path, mode_t mode) {
  return Pass<int(const char*, mode_t)>("mkdir", path, mode);
}
int unlink(const char* path) { return Pass<int(const char*)>("unlink", path); }
int unlinkat(int folder, const char* path, int flags) {
  return Pass<int(int, const char*, int)>("unlinkat", folder, path, flags);
}
int remove(const char* path) { return Pass<int(const char*)>("remove", path); }
int rename(const char* from, const char* to) {
  return Pass<int(const char*, const char*)>("rename", from, to);
}
int renameat(int fromFolder, const char* from, int toFolder, const char* to) {
  return Pass<int(int, const char*, int, const char*)>("renameat", fromFolder, from, toFolder, to);
}
int renameat2(int fromFolder, const char* from, int toFolder, const char* to, unsigned flags) {
  return Pass<int(int, const char*, int, const char*, unsigned)>("renameat2", fromFolder, from,
                                                                 toFolder, to, flags);
}

// Log lines and notifications.
ssize_t sendmsg(int socket, const msghdr* message, int flags) {
  return Pass<ssize_t(int, const msghdr*, int)>("sendmsg", socket, message, flags);
}
ssize_t send(int socket, const void* bytes, size_t size, int flags) {
  return Pass<ssize_t(int, const void*, size_t, int)>("send", socket, bytes, size, flags);
}

}  // extern "C"
