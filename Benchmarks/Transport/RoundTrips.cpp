// SPDX-License-Identifier: Apache-2.0
//
// One request and its reply, over every transport, in turns.
#include <string>
#include <utility>

#include "Benchmarks/Transport/Tables.h"

namespace bench {
namespace {

struct Contestant {
  std::string name;
  std::unique_ptr<Driver> driver;
  std::optional<double> goal;  // of the ratio to the first
  std::vector<double> rounds;
};

void Start(std::vector<Contestant>& contestants, Table& table, const Placement& placement,
           std::size_t connections, Bus bus, const char* name) {
  std::string reason;
  if (auto driver = StartBus(placement, connections, bus, reason)) {
    contestants.push_back({name, std::move(driver), {}, {}});
  } else {
    table.notes.push_back(std::string(name) + " left out: " + reason);
  }
}

/// What the helper may cost in relation to a peer on one processor.
std::optional<double> GoalAgainst(const std::string& peer, const Placement& placement,
                                  std::size_t connections) {
  if (placement.client != placement.server || connections == 8) return std::nullopt;
  if (connections == 64) return peer == "sd-bus" ? std::optional(0.25) : std::nullopt;
  if (peer == "sd-bus") return 0.45;
  if (peer == "dbus-broker") return 0.18;
  if (peer == "dbus-daemon") return 0.14;
  return std::nullopt;
}

}  // namespace

Table MeasureRoundTrips(const Placement& placement, std::size_t connections, const Effort& effort) {
  PinTo(placement.client);
  const bool one = placement.client == placement.server;
  Table table{.title = "round trip, 288 bytes in, 36 out, " + std::to_string(connections) +
                       (connections == 1 ? " client, " : " clients, ") + placement.name +
                       " (ratio: to the first line)",
              .unit = "us",
              .figures = {},
              .notes = {}};
  std::vector<Contestant> contestants;
  if (connections == 1) {
    contestants.push_back(
        {"bare packet sockets", StartRaw(placement, 1, RawServer::kBlocking), {}, {}});
  }
  contestants.push_back({connections == 1 ? "bare epoll loop" : "bare packet sockets, epoll",
                         StartRaw(placement, connections, RawServer::kEpoll),
                         {},
                         {}});
  contestants.push_back({"bare epoll loop with credentials",
                         StartRaw(placement, connections, RawServer::kEpollCredentials),
                         {},
                         {}});
  const std::size_t helper = contestants.size();
  const double goal = connections == 8 ? 2.0 : connections == 64 ? 1.2 : one ? 1.20 : 1.12;
  contestants.push_back({"helper", StartHelper(placement, connections), goal, {}});
  Start(contestants, table, placement, connections, Bus::kPeerToPeer, "sd-bus");
  if (connections == 1) {
    Start(contestants, table, placement, connections, Bus::kBroker, "dbus-broker");
    Start(contestants, table, placement, connections, Bus::kDaemon, "dbus-daemon");
  }

  for (Contestant& contestant : contestants) contestant.driver->run(effort.calls / 4);
  for (std::size_t round = 0; round < effort.rounds; ++round) {
    for (Contestant& contestant : contestants) {
      const double time = MicrosecondsOf([&] { contestant.driver->run(effort.calls); });
      contestant.rounds.push_back(time / static_cast<double>(effort.calls));
    }
  }
  const std::vector<double>& ours = contestants[helper].rounds;
  for (const Contestant& contestant : contestants) {
    table.figures.push_back({contestant.name, Median(contestant.rounds),
                             PairedRatio(contestant.rounds, contestants.front().rounds),
                             contestant.goal});
  }
  for (std::size_t index = helper + 1; index < contestants.size(); ++index) {
    const std::string& peer = contestants[index].name;
    table.figures.push_back({"helper divided by " + peer, Median(ours),
                             PairedRatio(ours, contestants[index].rounds),
                             GoalAgainst(peer, placement, connections)});
  }
  return table;
}

}  // namespace bench
