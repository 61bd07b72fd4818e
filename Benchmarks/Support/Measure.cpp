// SPDX-License-Identifier: Apache-2.0
#include "Benchmarks/Support/Measure.h"

#include <sched.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <utility>

namespace bench {

double Median(std::vector<double> values) { return Percentile(std::move(values), 0.5); }

double Percentile(std::vector<double> values, double share) {
  if (values.empty()) return 0;
  const auto index = std::min(values.size() - 1,
                              static_cast<std::size_t>(static_cast<double>(values.size()) * share));
  const auto place = values.begin() + static_cast<std::ptrdiff_t>(index);
  std::nth_element(values.begin(), place, values.end());
  return *place;
}

double PairedRatio(const std::vector<double>& rounds, const std::vector<double>& baseRounds) {
  std::vector<double> ratios;
  for (std::size_t index = 0; index < rounds.size(); ++index) {
    ratios.push_back(rounds[index] / baseRounds[index]);
  }
  return Median(std::move(ratios));
}

bool TakePrecedence() {
  const sched_param parameters{.sched_priority = 1};
  return ::sched_setscheduler(0, SCHED_FIFO, &parameters) == 0;
}

const std::vector<int>& Processors() {
  static const std::vector<int> processors = [] {
    cpu_set_t set;
    CPU_ZERO(&set);
    Check(::sched_getaffinity(0, sizeof set, &set), "sched_getaffinity");
    std::vector<int> found;
    for (int processor = 0; processor < CPU_SETSIZE; ++processor) {
      if (CPU_ISSET(processor, &set)) found.push_back(processor);
    }
    return found;
  }();
  return processors;
}

void PinTo(int processor) {
  cpu_set_t set;
  CPU_ZERO(&set);
  CPU_SET(processor, &set);
  Check(::sched_setaffinity(0, sizeof set, &set), "sched_setaffinity");
}

void Fail(const char* what) {
  std::perror(what);
  std::_Exit(1);
}

int Check(int result, const char* what) {
  if (result < 0) Fail(what);
  return result;
}

Child::Child(int processor, const std::function<void()>& body) {
  (void)std::fflush(nullptr);  // or both processes print what is still buffered
  process_ = Check(::fork(), "fork");
  if (process_ != 0) return;
  // A benchmark that is interrupted leaves no server behind.
  Check(::prctl(PR_SET_PDEATHSIG, SIGKILL), "prctl");
  if (processor >= 0) PinTo(processor);
  body();
  std::_Exit(0);
}

Child::Child(Child&& other) noexcept : process_(std::exchange(other.process_, -1)) {}

Child& Child::operator=(Child&& other) noexcept {
  std::swap(process_, other.process_);
  return *this;
}

void Child::end() {
  if (process_ <= 0) return;
  (void)::kill(process_, SIGKILL);
  (void)::waitpid(process_, nullptr, 0);
  process_ = -1;
}

}  // namespace bench
