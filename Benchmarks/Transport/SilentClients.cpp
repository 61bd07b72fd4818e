// SPDX-License-Identifier: Apache-2.0
//
// A hundred clients that never read a reply, each with a new request before every request of the
// one client that is measured. Their sockets are full, so the server loses every reply to them.
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <string>
#include <utility>

#include "Benchmarks/Transport/Tables.h"

namespace bench {

Table MeasureBesideSilentClients(const Placement& placement, const Effort& effort) {
  PinTo(placement.client);
  constexpr std::size_t kSilent = 100;
  constexpr std::size_t kRepliesThatFillASocket = 400;
  const std::string path = "/tmp/halvec-benchmark-" + std::to_string(::getpid());
  const Child server = StartHelperServer(placement.server, BindService(path));
  std::vector<WireClient> silent;
  for (std::size_t index = 0; index < kSilent; ++index) silent.push_back(Connect(path));
  const WireClient good = Connect(path);
  (void)::unlink(path.c_str());

  const auto request = TextRequest(kMeasuredRequest, std::array{std::string(255, 't')});
  std::array<std::byte, 512> reply;
  std::vector<double> alone, beside;
  for (std::size_t round = 0; round < effort.rounds; ++round) {
    alone.push_back(MicrosecondsOf([&] { (void)Call(good.privatePort, request, reply); }));
  }
  for (std::size_t round = 0; round < effort.rounds + kRepliesThatFillASocket; ++round) {
    for (const WireClient& client : silent) {
      // A full queue of its own is that client's affair.
      (void)!::send(client.privatePort.get(), request.data(), request.size(),
                    MSG_NOSIGNAL | MSG_DONTWAIT);
    }
    const double time = MicrosecondsOf([&] { (void)Call(good.privatePort, request, reply); });
    if (round >= kRepliesThatFillASocket) beside.push_back(time);
  }
  Table table{.title = std::string("one client beside 100 that never read, ") + placement.name,
              .unit = "us",
              .figures = {},
              .notes = {}};
  constexpr double kGoalMicroseconds = 5000;
  table.figures.push_back({"median, nobody else asks", Median(alone), {}, {}});
  table.figures.push_back({"median", Median(beside), {}, {}});
  table.figures.push_back({"99th percentile", Percentile(beside, 0.99), {}, kGoalMicroseconds});
  return table;
}

}  // namespace bench
