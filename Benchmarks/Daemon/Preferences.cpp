// SPDX-License-Identifier: Apache-2.0
//
// Preferences through the real helper: read from its cache, and set durably.
#include <fcntl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <optional>
#include <string>
#include <utility>

#include "Benchmarks/Daemon/Dconf.h"
#include "Benchmarks/Daemon/Helper.h"
#include "Benchmarks/Daemon/PrivateSystem.h"
#include "Benchmarks/Daemon/Tables.h"

namespace bench {
namespace {

constexpr std::int32_t kCopyPreference = 8683556;
constexpr char kDomain[] = "com.example.benchmark";
constexpr char kPreferences[] = "/root/Library/Preferences";

/// A helper with one client, started where the caller runs.
struct Session {
  FileDescriptor service;
  Child helper;
  WireClient client;
};

Session StartSession(const std::string& name) {
  const std::string path = std::string(kProgramFolder) + "/" + name;
  Session session;
  session.service = BindService(path);
  PendingConnect pending = SendConnect(path);
  session.helper = Launch(std::string(kProgramFolder) + "/HalvecMobileHelper", session.service);
  session.client = FinishConnect(std::move(pending));
  return session;
}

std::string ValueOf(int number) {
  return "<plist version=\"1.0\"><integer>" + std::to_string(number) + "</integer></plist>";
}

void Set(const Session& session, int number) {
  const std::string value = ValueOf(number);
  if (SetPreference(session.client.privatePort, kDomain, "Count",
                    std::as_bytes(std::span(value))) != 0) {
    Fail("setting a preference");
  }
}

void Synchronize(const std::string& path) {
  const FileDescriptor file(Check(::open(path.c_str(), O_RDONLY | O_CLOEXEC), path.c_str()));
  Check(::fsync(file.get()), "fsync");
}

/// The four steps without which an acknowledged value does not survive a power cut.
void WriteDurably(const std::string& content) {
  const std::string folder = kPreferences;
  const std::string temporary = folder + "/bare.tmp";
  {
    const FileDescriptor file(Check(
        ::open(temporary.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, S_IRUSR | S_IWUSR),
        "open"));
    if (::write(file.get(), content.data(), content.size()) < 0) Fail("write");
    Check(::fsync(file.get()), "fsync");
  }
  Check(::rename(temporary.c_str(), (folder + "/bare").c_str()), "rename");
  Synchronize(folder);
}

void AnswerBare(int socket, std::size_t replySize) {
  std::array<std::byte, 4096> packet{};
  while (::recv(socket, packet.data(), packet.size(), 0) > 0) {
    if (::send(socket, packet.data(), replySize, MSG_NOSIGNAL) < 0) return;
  }
}

std::string ContentOfDomain() {
  std::ifstream file(std::string(kPreferences) + "/" + kDomain + ".plist", std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

}  // namespace

Table MeasurePreferenceReads() {
  PinTo(Processors().front());
  const auto request = TextRequest(kCopyPreference, std::array<std::string, 2>{kDomain, "Count"});
  std::array<std::byte, 4096> reply{};
  std::size_t replySize = 0;
  Table table{.title = "a cached preference, one processor",
              .unit = "us",
              .figures = {},
              .notes = {"the helper writes one log line for each value that it hands out"}};
  const auto measure = [&](const FileDescriptor& port) {
    constexpr int kCalls = 200;
    return MicrosecondsOf([&] {
             for (int call = 0; call < kCalls; ++call) (void)Call(port, request, reply);
           }) /
           kCalls;
  };
  const auto compare = [&](const char* name) {
    // A helper of its own, so that it finds the log daemon, or finds none, from the start.
    const Session session = StartSession("reads");
    Set(session, 1);
    replySize = Call(session.client.privatePort, request, reply);
    constexpr std::size_t kLeastSizeWithAValue = 57;
    if (replySize < kLeastSizeWithAValue) Fail("no value");
    const SocketPair pair = MakePair(SOCK_SEQPACKET);
    const Child bare(-1, [&] { AnswerBare(pair.second.get(), replySize); });
    std::vector<double> bareRounds, rounds;
    constexpr int kRounds = 101;
    for (int round = 0; round < kRounds; ++round) {
      bareRounds.push_back(measure(pair.first));
      rounds.push_back(measure(session.client.privatePort));
    }
    constexpr double kGoal = 1.25;
    if (table.figures.empty()) {
      table.figures.push_back({"bare round trip", Median(bareRounds), 1.0, {}});
    }
    table.figures.push_back({name, Median(rounds), PairedRatio(rounds, bareRounds), kGoal});
  };
  compare("helper, no log daemon runs");
  {
    const Child log = StartLogDaemon(Processors().front());
    compare("helper, a log daemon reads on the same processor");
  }
  if (Processors().size() > 1) {
    const Child log = StartLogDaemon(Processors().back());
    compare("helper, a log daemon reads on another processor");
  }
  table.title +=
      ", " + std::to_string(request.size()) + " bytes in, " + std::to_string(replySize) + " out";
  return table;
}

Table MeasurePreferenceWrites() {
  const Session session = StartSession("writes");
  const Child log = StartLogDaemon(-1);
  Table table{.title = "set a preference, durably", .unit = "us", .figures = {}, .notes = {}};
  std::string reason;
  const std::unique_ptr<DconfStore> dconf = StartDconf(reason);
  if (!dconf) table.notes.push_back("dconf left out: " + reason);
  constexpr int kRounds = 201;
  std::vector<double> bareRounds, rounds, dconfRounds;
  Set(session, -1);
  const std::string content = ContentOfDomain();
  for (int round = 0; round < kRounds; ++round) {
    bareRounds.push_back(MicrosecondsOf([&] { WriteDurably(content); }));
    rounds.push_back(MicrosecondsOf([&] { Set(session, round); }));
    if (dconf) dconfRounds.push_back(MicrosecondsOf([&] { dconf->set(round); }));
  }
  constexpr double kGoal = 1.15;
  constexpr double kDconfGoal = 0.3;
  table.figures.push_back(
      {"temporary file, fsync, rename, fsync of the folder", Median(bareRounds), 1.0, {}});
  table.figures.push_back({"helper", Median(rounds), PairedRatio(rounds, bareRounds), kGoal});
  if (dconf) {
    table.figures.push_back(
        {"dconf", Median(dconfRounds), PairedRatio(dconfRounds, bareRounds), {}});
    table.figures.push_back(
        {"helper divided by dconf", Median(rounds), PairedRatio(rounds, dconfRounds), kDconfGoal});
  }
  return table;
}

}  // namespace bench
