// SPDX-License-Identifier: Apache-2.0
//
// Input and output are memory files, so neither side ever waits for the other.
#include "Tests/Halvecctl/Program.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <stdexcept>

#include "Helper/Platform/FileDescriptor.h"

namespace program {
namespace {

using platform::FileDescriptor;

FileDescriptor MakeFile(const std::string& content = "") {
  FileDescriptor file(::memfd_create("stream", MFD_CLOEXEC));
  if (::pwrite(file.get(), content.data(), content.size(), 0) !=
      static_cast<ssize_t>(content.size())) {
    throw std::runtime_error("cannot prepare a stream");
  }
  return file;
}

std::string Content(const FileDescriptor& file) {
  struct stat status {};
  if (::fstat(file.get(), &status) != 0) throw std::runtime_error("cannot read a stream");
  std::string content(static_cast<std::size_t>(status.st_size), '\0');
  if (::pread(file.get(), content.data(), content.size(), 0) != status.st_size) {
    throw std::runtime_error("cannot read a stream");
  }
  return content;
}

int Spawn(const std::vector<std::string>& arguments, int input, int output, int errors) {
  std::vector<char*> pointers{const_cast<char*>("halvecctl")};
  for (const std::string& argument : arguments) {
    pointers.push_back(const_cast<char*>(argument.c_str()));
  }
  pointers.push_back(nullptr);
  posix_spawn_file_actions_t actions;
  ::posix_spawn_file_actions_init(&actions);
  ::posix_spawn_file_actions_adddup2(&actions, input, STDIN_FILENO);
  ::posix_spawn_file_actions_adddup2(&actions, output, STDOUT_FILENO);
  ::posix_spawn_file_actions_adddup2(&actions, errors, STDERR_FILENO);
  pid_t child = 0;
  const int code =
      ::posix_spawn(&child, HALVECCTL_PROGRAM, &actions, nullptr, pointers.data(), environ);
  ::posix_spawn_file_actions_destroy(&actions);
  if (code != 0) throw std::runtime_error("cannot start " HALVECCTL_PROGRAM);
  int status = 0;
  while (::waitpid(child, &status, 0) < 0) {
    if (errno != EINTR) throw std::runtime_error("cannot wait for " HALVECCTL_PROGRAM);
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

}  // namespace

Outcome RunProgram(const std::vector<std::string>& arguments, const std::string& input) {
  const FileDescriptor in = MakeFile(input);
  const FileDescriptor out = MakeFile();
  const FileDescriptor errors = MakeFile();
  const int code = Spawn(arguments, in.get(), out.get(), errors.get());
  return {code, Content(out), Content(errors)};
}

Outcome RunOnFullOutput(const std::vector<std::string>& arguments) {
  const FileDescriptor in = MakeFile();
  const FileDescriptor out(::open("/dev/full", O_WRONLY | O_CLOEXEC));
  const FileDescriptor errors = MakeFile();
  const int code = Spawn(arguments, in.get(), out.get(), errors.get());
  return {code, "", Content(errors)};
}

}  // namespace program
