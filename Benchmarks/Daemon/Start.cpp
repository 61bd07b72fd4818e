// SPDX-License-Identifier: Apache-2.0
//
// Starting, and doing nothing.
#include <sys/socket.h>

#include <array>
#include <chrono>
#include <string>
#include <thread>
#include <utility>

#include "Benchmarks/Daemon/Helper.h"
#include "Benchmarks/Daemon/PrivateSystem.h"
#include "Benchmarks/Daemon/Tables.h"

namespace bench {
namespace {

const std::string kFolder = kProgramFolder;

/// Milliseconds from the fork to the reply to a connect that is queued already.
double StartMilliseconds(const std::string& program, const FileDescriptor& service,
                         const std::string& path) {
  const PendingConnect pending = SendConnect(path);
  std::array<std::byte, 64> reply;
  Child server;
  const double time = MicrosecondsOf([&] {
    server = Launch(program, service);
    if (::recv(pending.replyPort.get(), reply.data(), reply.size(), 0) != 40) Fail("connect");
  });
  return time / 1000;
}

}  // namespace

Table MeasureStart() {
  const std::string path = kFolder + "/start";
  const FileDescriptor service = BindService(path);
  std::vector<double> trivial, helper;
  constexpr int kRounds = 101;
  for (int round = 0; round < kRounds; ++round) {
    trivial.push_back(StartMilliseconds(kFolder + "/TrivialServer", service, path));
    helper.push_back(StartMilliseconds(kFolder + "/HalvecMobileHelper", service, path));
  }
  Table table{.title = "start to first reply, warm, caller examined",
              .unit = "ms",
              .figures = {},
              .notes = {}};
  constexpr double kGoal = 1.3;
  table.figures.push_back({"trivial program, static libstdc++", Median(trivial), 1.0, {}});
  table.figures.push_back({"helper", Median(helper), PairedRatio(helper, trivial), kGoal});
  return table;
}

Table MeasureRest() {
  const std::string path = kFolder + "/rest";
  const FileDescriptor service = BindService(path);
  PendingConnect pending = SendConnect(path);
  const Child log = StartLogDaemon(-1);
  const Child helper = Launch(kFolder + "/HalvecMobileHelper", service);
  const WireClient client = FinishConnect(std::move(pending));
  Table table{.title = "at rest, one client connected", .unit = "", .figures = {}, .notes = {}};
  constexpr double kMegabyte = 1024;
  constexpr double kMemoryGoal = 1.2;
  table.figures.push_back(
      {"memory (PSS) after the first connect, MB", MemoryOf(helper) / kMegabyte, {}, kMemoryGoal});
  const std::string value = "<plist version=\"1.0\"><string>value</string></plist>";
  for (int index = 0; index < 100; ++index) {
    (void)SetPreference(client.privatePort, "com.example.rest", "key" + std::to_string(index),
                        std::as_bytes(std::span(value)));
  }
  table.figures.push_back({"memory (PSS) after 100 preferences set, MB",
                           MemoryOf(helper) / kMegabyte,
                           {},
                           kMemoryGoal});
  const double before = SleepsOf(helper);
  std::this_thread::sleep_for(std::chrono::seconds(10));
  table.figures.push_back({"wake-ups in 10 s", SleepsOf(helper) - before, {}, 0.0});
  return table;
}

}  // namespace bench
