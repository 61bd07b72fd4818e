// SPDX-License-Identifier: Apache-2.0
//
// From nothing to the first reply: sockets, authentication, one request, and the end of it all.
#include <unistd.h>

#include <array>
#include <string>
#include <utility>

#include "Benchmarks/Transport/Tables.h"

namespace bench {
namespace {

class HelperConnector final : public Connector {
 public:
  HelperConnector(const Placement& placement, const char* name, bool remember)
      : path_("/tmp/halvec-benchmark-" + std::string(name) + std::to_string(::getpid())),
        server_(StartHelperServer(placement.server, BindService(path_), remember)) {}
  ~HelperConnector() override { (void)::unlink(path_.c_str()); }
  HelperConnector(const HelperConnector&) = delete;
  HelperConnector& operator=(const HelperConnector&) = delete;

  void open() override {
    std::array<std::byte, 512> reply;
    client_ = Connect(path_);
    (void)Call(client_.privatePort, request_, reply);
  }
  void close() override { client_ = WireClient(); }

 private:
  const std::string path_;
  const std::vector<std::byte> request_ =
      TextRequest(kMeasuredRequest, std::array{std::string(255, 't')});
  Child server_;
  WireClient client_;
};

/// Ends the connection and gives the server the processor until it has cleared away.
void Settle(Connector& connector) {
  connector.close();
  (void)::usleep(100);
}

}  // namespace

Table MeasureFreshConnects(const Placement& placement, const Effort& effort) {
  PinTo(placement.client);
  Table table{.title = std::string("fresh connection to first reply, ") + placement.name,
              .unit = "us",
              .figures = {},
              .notes = {}};
  std::string reason;
  const std::unique_ptr<Connector> bus = StartBusConnector(placement, reason);
  HelperConnector known(placement, "known-", true);
  HelperConnector asked(placement, "asked-", false);
  std::vector<double> busRounds, knownRounds, askedRounds;
  const auto measure = [&](Connector& connector, std::vector<double>& rounds) {
    double time = 0;
    for (std::size_t call = 0; call < effort.calls; ++call) {
      time += MicrosecondsOf([&] { connector.open(); });
      Settle(connector);
    }
    rounds.push_back(time / static_cast<double>(effort.calls));
  };
  for (std::size_t round = 0; round < effort.rounds; ++round) {
    if (bus) measure(*bus, busRounds);
    measure(known, knownRounds);
    measure(asked, askedRounds);
  }
  if (!bus) {
    table.notes.push_back("sd-bus left out: " + reason);
    table.figures.push_back({"helper, caller known", Median(knownRounds), {}, {}});
    table.figures.push_back({"helper, caller examined", Median(askedRounds), {}, {}});
    return table;
  }
  constexpr double kGoal = 0.70;
  table.figures.push_back({"sd-bus, peer to peer", Median(busRounds), 1.0, {}});
  table.figures.push_back(
      {"helper, caller known", Median(knownRounds), PairedRatio(knownRounds, busRounds), kGoal});
  table.figures.push_back({"helper, caller examined, watched and forgotten", Median(askedRounds),
                           PairedRatio(askedRounds, busRounds), kGoal});
  return table;
}

}  // namespace bench
