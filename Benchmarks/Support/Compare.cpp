// SPDX-License-Identifier: Apache-2.0
#include "Benchmarks/Support/Compare.h"

#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include "Benchmarks/Support/Measure.h"

namespace bench {

void Run(std::vector<std::string> words) {
  std::vector<char*> arguments;
  arguments.reserve(words.size() + 1);
  for (std::string& word : words) arguments.push_back(word.data());
  arguments.push_back(nullptr);
  pid_t child = -1;
  int status = -1;
  if (::posix_spawnp(&child, arguments[0], nullptr, nullptr, arguments.data(), environ) != 0 ||
      ::waitpid(child, &status, 0) != child || status != 0) {
    Fail(words[0].c_str());
  }
}

std::vector<std::vector<double>> TakeTurns(int turns, const std::function<void()>& prepare,
                                           const std::vector<std::function<void()>>& contestants) {
  const std::size_t count = contestants.size();
  std::vector<std::vector<double>> times(count);
  for (int turn = 0; turn < turns; ++turn) {
    for (std::size_t step = 0; step < count; ++step) {
      const std::size_t who = (static_cast<std::size_t>(turn) + step) % count;
      prepare();
      ::sync();
      times[who].push_back(MicrosecondsOf(contestants[who]) / 1000);
    }
  }
  return times;
}

}  // namespace bench
