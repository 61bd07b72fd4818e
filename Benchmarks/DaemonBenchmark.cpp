// SPDX-License-Identifier: Apache-2.0
//
// The real helper, started as a launcher starts it, with its real providers in a private system:
// start to first reply, memory and wake-ups at rest, preferences set durably and read.
//
// DaemonBenchmark [--json] [--shared]      (needs root)
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <string_view>

#include "Benchmarks/Daemon/PrivateSystem.h"
#include "Benchmarks/Daemon/Tables.h"
#include "Benchmarks/Support/Measure.h"

namespace {

constexpr char kInside[] = "--inside";

/// Runs this program again inside a private system whose home is a new folder on the real disk.
int RunInside(int count, char** arguments) {
  std::string home = "/var/tmp/halvec-benchmark-XXXXXX";
  if (!::mkdtemp(home.data())) bench::Fail("mkdtemp");
  const pid_t child = bench::Check(::fork(), "fork");
  if (child == 0) {
    bench::EnterPrivateSystem(home, "/proc/self/exe", HALVEC_HELPER_PROGRAM,
                              HALVEC_TRIVIAL_PROGRAM);
    const std::string program = std::string(bench::kProgramFolder) + "/DaemonBenchmark";
    std::vector<char*> inside(arguments, arguments + count);
    inside.push_back(const_cast<char*>(static_cast<const char*>(kInside)));
    inside.push_back(nullptr);
    ::execv(program.c_str(), inside.data());
    bench::Fail("execv");
  }
  int status = 1;
  (void)::waitpid(child, &status, 0);
  std::filesystem::remove_all(home);
  return WIFEXITED(status) ? WEXITSTATUS(status) : 1;
}

}  // namespace

int main(int count, char** arguments) {
  bool json = false;
  bool shared = false;
  bool inside = false;
  for (int index = 1; index < count; ++index) {
    const std::string_view argument = arguments[index];
    if (argument == "--json") {
      json = true;
    } else if (argument == "--shared") {
      shared = true;
    } else if (argument == kInside) {
      inside = true;
    } else {
      std::fprintf(stderr, "usage: DaemonBenchmark [--json] [--shared]\n");
      return 2;
    }
  }
  if (::geteuid() != 0) {
    std::fprintf(stderr, "DaemonBenchmark needs root: it mounts a private system\n");
    return 2;
  }
  if (!inside) return RunInside(count, arguments);

  if (!shared && !bench::TakePrecedence()) {
    std::fprintf(stderr, "no real-time priority here: other work takes part in the figures\n");
  }
  bench::Report report(json);
  report.add(bench::MeasureStart());
  report.add(bench::MeasureRest());
  report.add(bench::MeasurePreferenceReads());
  report.add(bench::MeasurePreferenceWrites());
  report.finish();
  return 0;
}
