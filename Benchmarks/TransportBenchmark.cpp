// SPDX-License-Identifier: Apache-2.0
//
// The helper's transport beside others, in one run: bare packet sockets, sd-bus, message buses.
// Contestants take turns round by round, so that a busy machine is busy for all of them alike.
//
// TransportBenchmark [--json] [--quick] [--shared]
//   --quick   few rounds
//   --shared  at ordinary priority; otherwise, where root permits it, nothing else runs meanwhile
#include <cstdio>
#include <cstring>
#include <string_view>

#include "Benchmarks/Transport/Tables.h"

int main(int count, char** arguments) {
  bool json = false;
  bool shared = false;
  std::size_t rounds = 151;
  for (int index = 1; index < count; ++index) {
    const std::string_view argument = arguments[index];
    if (argument == "--json") {
      json = true;
    } else if (argument == "--quick") {
      rounds = 15;
    } else if (argument == "--shared") {
      shared = true;
    } else {
      std::fprintf(stderr, "usage: TransportBenchmark [--json] [--quick] [--shared]\n");
      return 2;
    }
  }
  if (!shared && !bench::TakePrecedence()) {
    std::fprintf(stderr, "no real-time priority here: other work takes part in the figures\n");
  }
  const auto& processors = bench::Processors();
  std::vector<bench::Placement> placements{{"one processor", processors[0], processors[0]}};
  if (processors.size() > 1) {
    placements.push_back({"two processors", processors[0], processors[1]});
  }
  bench::Report report(json);
  for (const auto& placement : placements) {
    report.add(bench::MeasureRoundTrips(placement, 1, {rounds, 400}));
    report.add(bench::MeasureRoundTrips(placement, 8, {rounds, 800}));
    report.add(bench::MeasureRoundTrips(placement, 64, {rounds, 1280}));
    report.add(bench::MeasureFreshConnects(placement, {rounds, 20}));
    report.add(bench::MeasureOutOfLine(placement, {rounds / 3, 200}));
    report.add(bench::MeasureBesideSilentClients(placement, {rounds * 20, 1}));
  }
  report.finish();
  return 0;
}
