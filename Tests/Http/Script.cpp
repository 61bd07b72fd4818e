// SPDX-License-Identifier: Apache-2.0
#include "Tests/Http/Script.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <iterator>

namespace support {
namespace {

/// Runs it with these two as standard input and output; its process id.
int Start(const std::vector<std::string>& pathAndArguments, int input, int output) {
  std::vector<std::string> words{"python3", "-B"};
  words.insert(words.end(), pathAndArguments.begin(), pathAndArguments.end());
  std::vector<char*> arguments;
  std::transform(words.begin(), words.end(), std::back_inserter(arguments),
                 [](std::string& word) { return word.data(); });
  arguments.push_back(nullptr);
  posix_spawn_file_actions_t actions;
  ::posix_spawn_file_actions_init(&actions);
  ::posix_spawn_file_actions_adddup2(&actions, input, STDIN_FILENO);
  ::posix_spawn_file_actions_adddup2(&actions, output, STDOUT_FILENO);
  int process = -1;
  EXPECT_EQ(::posix_spawnp(&process, "python3", &actions, nullptr, arguments.data(), environ), 0);
  ::posix_spawn_file_actions_destroy(&actions);
  return process;
}

/// The lines up to an empty one or the end.
std::vector<std::string> ReadLines(int output) {
  std::vector<std::string> lines{""};
  for (char c = 0; ::read(output, &c, 1) == 1;) {
    if (c != '\n') {
      lines.back() += c;
    } else if (lines.back().empty()) {
      break;
    } else {
      lines.emplace_back();
    }
  }
  lines.pop_back();
  return lines;
}

}  // namespace

Script::Script(std::vector<std::string> pathAndArguments) {
  std::array<int, 2> input{};
  std::array<int, 2> output{};
  EXPECT_EQ(::pipe2(input.data(), O_CLOEXEC), 0);
  EXPECT_EQ(::pipe2(output.data(), O_CLOEXEC), 0);
  const platform::FileDescriptor theirInput(input[0]);
  const platform::FileDescriptor ourOutput(output[0]);
  platform::FileDescriptor theirOutput(output[1]);
  input_.reset(input[1]);
  process_ = Start(pathAndArguments, theirInput.get(), theirOutput.get());
  theirOutput.reset();
  lines_ = ReadLines(ourOutput.get());
}

Script::~Script() {
  input_.reset();
  int status = 0;
  EXPECT_EQ(::waitpid(process_, &status, 0), process_);
  EXPECT_EQ(status, 0) << "the script failed";
}

}  // namespace support
