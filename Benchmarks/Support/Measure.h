// SPDX-License-Identifier: Apache-2.0
//
// What every benchmark needs: a clock, medians, child processes on a chosen processor. One thread.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <functional>
#include <vector>

namespace bench {

/// Microseconds that `work` takes.
template <class Work>
double MicrosecondsOf(Work&& work) {
  const auto start = std::chrono::steady_clock::now();
  work();
  return std::chrono::duration<double, std::micro>(std::chrono::steady_clock::now() - start)
      .count();
}

/// The middle value, and the value below which `share` (0 to 1) of all values lie. 0 without any.
[[nodiscard]] double Median(std::vector<double> values);
[[nodiscard]] double Percentile(std::vector<double> values, double share);

/// The median of the ratios of two contestants' rounds, round by round: what disturbed a round
/// disturbed both.
[[nodiscard]] double PairedRatio(const std::vector<double>& rounds,
                                 const std::vector<double>& baseRounds);

/// Takes precedence over everything else on the machine, children included (SCHED_FIFO), so that
/// other work does not take part in the figures. False where that is not permitted.
bool TakePrecedence();

/// The processors that this process may use.
[[nodiscard]] const std::vector<int>& Processors();
/// Keeps the calling thread, and what it starts from here on, on one processor.
void PinTo(int processor);

/// Says what went wrong and ends the program: a benchmark without its set-up measures nothing.
[[noreturn]] void Fail(const char* what);
/// Passes a system call's result through; a negative one is a failure.
int Check(int result, const char* what);

/// A child process; killed and reaped at the latest with this object.
class Child {
 public:
  Child() = default;
  /// Runs `body` in a child on `processor` (-1: where the caller runs). The child ends with it.
  Child(int processor, const std::function<void()>& body);
  Child(Child&& other) noexcept;
  Child& operator=(Child&& other) noexcept;
  ~Child() { end(); }

  [[nodiscard]] pid_t process() const { return process_; }
  void end();

 private:
  pid_t process_ = -1;
};

}  // namespace bench
