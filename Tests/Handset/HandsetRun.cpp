// SPDX-License-Identifier: Apache-2.0
//
// Runs the handset tool as a child and gathers what it says, for the tests. One thread, no lock.
#include "Tests/Handset/HandsetRun.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <system_error>
#include <utility>

#include "Tools/handset/Files.h"

namespace handset_tests {
namespace {

using platform::FileDescriptor;

struct Pipe {
  FileDescriptor reader;
  FileDescriptor writer;
};

Pipe MakePipe() {
  std::array<int, 2> ends{};
  if (pipe2(ends.data(), O_CLOEXEC) != 0) throw std::runtime_error("pipe2");
  return {FileDescriptor(ends[0]), FileDescriptor(ends[1])};
}

struct Child {
  pid_t pid = -1;
  FileDescriptor input;
  FileDescriptor output;
  FileDescriptor errors;
};

Child Start(const std::vector<std::string>& arguments) {
  Pipe input = MakePipe();
  Pipe output = MakePipe();
  Pipe errors = MakePipe();
  std::vector<char*> pointers;
  pointers.reserve(arguments.size() + 1);
  for (const std::string& text : arguments) pointers.push_back(const_cast<char*>(text.c_str()));
  pointers.push_back(nullptr);
  const pid_t pid = fork();
  if (pid < 0) throw std::runtime_error("fork");
  if (pid == 0) {
    dup2(input.reader.get(), STDIN_FILENO);
    dup2(output.writer.get(), STDOUT_FILENO);
    dup2(errors.writer.get(), STDERR_FILENO);
    execv(pointers[0], pointers.data());
    _exit(99);
  }
  return {pid, std::move(input.writer), std::move(output.reader), std::move(errors.reader)};
}

/// Reads both to their ends, whichever speaks first.
void Gather(FileDescriptor& output, FileDescriptor& errors, Outcome& outcome) {
  std::array<char, 4096> buffer{};
  while (output || errors) {
    std::array<pollfd, 2> ready{pollfd{output.get(), POLLIN, 0}, pollfd{errors.get(), POLLIN, 0}};
    if (poll(ready.data(), ready.size(), -1) < 0) continue;
    const auto take = [&](const pollfd& poll, FileDescriptor& from, std::string& into) {
      if (!from || poll.revents == 0) return;
      const ssize_t count = read(from.get(), buffer.data(), buffer.size());
      if (count <= 0) {
        from.reset();
      } else {
        into.append(buffer.data(), static_cast<std::size_t>(count));
      }
    };
    take(ready[0], output, outcome.output);
    take(ready[1], errors, outcome.errors);
  }
}

int StatusOf(pid_t pid) {
  int status = 0;
  if (waitpid(pid, &status, 0) != pid) return -1;
  return WIFSIGNALED(status) ? 128 + WTERMSIG(status) : WEXITSTATUS(status);
}

std::vector<std::string> HandsetArguments(const std::string& script,
                                          const std::vector<std::string>& options) {
  std::vector<std::string> arguments{HANDSET,     "run",       "--helper",
                                     FAKE_HELPER, "--install", std::string(CALLER) + ":caller"};
  arguments.insert(arguments.end(), options.begin(), options.end());
  arguments.insert(arguments.end(), {"--", "sh", "-c", script});
  return arguments;
}

}  // namespace

RunningHandset::RunningHandset(const std::string& script, const std::vector<std::string>& options) {
  Child child = Start(HandsetArguments(script, options));
  pid_ = child.pid;
  input_ = std::move(child.input);
  output_ = std::move(child.output);
  errors_ = std::move(child.errors);
}

RunningHandset::~RunningHandset() {
  if (pid_ < 0) return;
  kill(pid_, SIGKILL);
  waitpid(pid_, nullptr, 0);
}

std::string RunningHandset::nextLine() {
  std::string line;
  char c = 0;
  while (read(output_.get(), &c, 1) == 1) {
    if (c == '\n') return line;
    line += c;
  }
  return "";
}

void RunningHandset::say(const std::string& line) {
  ASSERT_TRUE(handset::WriteAll(input_.get(), line + "\n"));
}

Outcome RunningHandset::finish() {
  Outcome outcome;
  input_.reset();
  Gather(output_, errors_, outcome);
  outcome.status = StatusOf(std::exchange(pid_, -1));
  return outcome;
}

Outcome RunHandset(const std::string& script, const std::vector<std::string>& options) {
  return RunningHandset(script, options).finish();
}

Outcome RunProgram(const std::vector<std::string>& arguments) {
  Outcome outcome;
  Child child = Start(arguments);
  child.input.reset();
  Gather(child.output, child.errors, outcome);
  outcome.status = StatusOf(child.pid);
  return outcome;
}

TemporaryFolder::TemporaryFolder() : path_("/tmp/handset-test.XXXXXX") {
  if (mkdtemp(path_.data()) == nullptr) throw std::runtime_error("mkdtemp");
}

TemporaryFolder::~TemporaryFolder() {
  std::error_code error;
  std::filesystem::remove_all(path_, error);
}

void HandsetSuite::SetUp() {
  const Outcome check = RunProgram({HANDSET, "check"});
  ASSERT_TRUE(check.status == 0 || check.status == 1) << check.errors;
  if (check.status == 1) GTEST_SKIP() << "no handset can be made here: " << check.output;
}

}  // namespace handset_tests
