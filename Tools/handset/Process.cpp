// SPDX-License-Identifier: Apache-2.0
//
// fork and exec. The caller has one thread, so that a child may allocate before it executes.
#include "Tools/handset/Process.h"

#include <signal.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <string_view>

#include "Helper/Platform/FileDescriptor.h"
#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"
#include "Tools/handset/Root.h"

namespace handset {
namespace {

constexpr std::string_view kPath = "/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin";

std::vector<char*> Pointers(const std::vector<std::string>& texts) {
  std::vector<char*> pointers;
  pointers.reserve(texts.size() + 1);
  // execve takes pointers to non-const for historical reasons and does not write through them.
  for (const std::string& text : texts) pointers.push_back(const_cast<char*>(text.c_str()));
  pointers.push_back(nullptr);
  return pointers;
}

std::string Variable(const Environment& environment, const std::string& name) {
  const std::string prefix = name + "=";
  for (const std::string& entry : environment) {
    if (entry.starts_with(prefix)) return entry.substr(prefix.size());
  }
  return {};
}

/// The files that `name` may mean, in the order in which they are tried.
std::vector<std::string> Candidates(const std::string& name, const Environment& environment) {
  if (name.find('/') != std::string::npos) return {name};
  std::vector<std::string> files;
  std::string_view path = kPath;
  const std::string own = Variable(environment, "PATH");
  if (!own.empty()) path = own;
  while (!path.empty()) {
    const std::size_t end = std::min(path.find(':'), path.size());
    if (end > 0) files.push_back(std::string(path.substr(0, end)) + "/" + name);
    path.remove_prefix(std::min(end + 1, path.size()));
  }
  return files;
}

}  // namespace

Environment InheritedEnvironment() {
  Environment environment;
  for (char** entry = environ; entry != nullptr && *entry != nullptr; ++entry) {
    environment.emplace_back(*entry);
  }
  return environment;
}

void SetVariable(Environment& environment, const std::string& name, const std::string& value) {
  const std::string prefix = name + "=";
  std::erase_if(environment, [&](const std::string& entry) { return entry.starts_with(prefix); });
  environment.push_back(prefix + value);
}

Environment EnvironmentOf(const User& user, Environment base) {
  SetVariable(base, "HOME", user.home);
  SetVariable(base, "USER", user.name);
  SetVariable(base, "LOGNAME", user.name);
  SetVariable(base, "SHELL", user.shell);
  return base;
}

void AddInstalledToPath(Environment& environment) {
  const std::string own = Variable(environment, "PATH");
  SetVariable(environment, "PATH",
              (own.empty() ? std::string(kPath) : own) + ":" + kInstallDirectory);
}

Environment ServiceEnvironment() {
  constexpr std::array<std::string_view, 4> kRuntimeSettings{
      "ASAN_OPTIONS=", "LSAN_OPTIONS=", "TSAN_OPTIONS=", "UBSAN_OPTIONS="};
  Environment environment;
  for (const std::string& entry : InheritedEnvironment()) {
    for (const std::string_view setting : kRuntimeSettings) {
      if (entry.starts_with(setting)) environment.push_back(entry);
    }
  }
  SetVariable(environment, "PATH", std::string(kPath));
  return environment;
}

void RestoreSignals() {
  for (const int signal : {SIGINT, SIGTERM, SIGHUP, SIGPIPE, SIGCHLD}) {
    ::signal(signal, SIG_DFL);
  }
  sigset_t none;
  sigemptyset(&none);
  pthread_sigmask(SIG_SETMASK, &none, nullptr);
}

void BecomeProgram(const std::vector<std::string>& arguments, const Environment& environment) {
  const std::vector<char*> argumentPointers = Pointers(arguments);
  const std::vector<char*> environmentPointers = Pointers(environment);
  int error = ENOENT;
  for (const std::string& candidate : Candidates(arguments[0], environment)) {
    execve(candidate.c_str(), argumentPointers.data(), environmentPointers.data());
    // One that is there and does not start says more than one that is not there.
    if (errno != ENOENT && errno != ENOTDIR) error = errno;
  }
  throw Failure("cannot run " + arguments[0] + ": " + std::generic_category().message(error),
                error == ENOENT ? kStatusNotFound : kStatusNotExecutable);
}

void RunTool(const std::vector<std::string>& arguments) {
  const platform::FileDescriptor said(memfd_create("output", MFD_CLOEXEC));
  if (!said) throw Failure::FromErrno("memfd_create");
  const pid_t tool = StartProgram(arguments, [&said] {
    if (dup2(said.get(), STDOUT_FILENO) < 0 || dup2(said.get(), STDERR_FILENO) < 0) {
      throw Failure::FromErrno("dup2");
    }
    return ServiceEnvironment();
  });
  int waitStatus = 0;
  while (waitpid(tool, &waitStatus, 0) < 0) {
    if (errno != EINTR) throw Failure::FromErrno("wait for " + arguments[0]);
  }
  if (waitStatus == 0) return;
  throw Failure(arguments[0] +
                " failed: " + ReadWholeFile("/proc/self/fd/" + std::to_string(said.get())));
}

pid_t StartProgram(const std::vector<std::string>& arguments,
                   const std::function<Environment()>& prepare) {
  const pid_t child = fork();
  if (child < 0) throw Failure::FromErrno("fork");
  if (child > 0) return child;
  try {
    RestoreSignals();
    BecomeProgram(arguments, prepare());
  } catch (const Failure& failure) {
    static_cast<void>(std::fprintf(stderr, "handset: %s\n", failure.what()));
    _exit(failure.status());
  }
}

}  // namespace handset
