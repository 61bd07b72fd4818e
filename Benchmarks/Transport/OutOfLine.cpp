// SPDX-License-Identifier: Apache-2.0
//
// Requests that carry data: behind the message in the same packet, or in a sealed memfd. The bare
// server takes the bytes into memory that it owns, exactly as the helper must, and checks nothing.
// The helper refuses the request after it has taken the data: its domain is no UTF-8.
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <string>
#include <utility>

#include "Benchmarks/Transport/Tables.h"

namespace bench {
namespace {

constexpr std::size_t kMessageSize = 568;
constexpr std::size_t kMostBehindTheMessage = 131072;

void ServeData(int socket) {
  std::vector<std::byte> packet(kMostBehindTheMessage + 4096);
  std::vector<std::byte> memory;
  const std::array<std::byte, kReplySize> reply{};
  for (;;) {
    FileDescriptor file;
    (void)ReceiveWithDescriptor(socket, packet, file);
    if (file) {
      struct stat status {};
      Check(::fstat(file.get(), &status), "fstat");
      const auto size = static_cast<std::size_t>(status.st_size);
      if (memory.size() < size) memory.resize(size);
      if (::pread(file.get(), memory.data(), size, 0) != status.st_size) Fail("pread");
    }
    if (::send(socket, reply.data(), reply.size(), MSG_NOSIGNAL) < 0) return;
  }
}

void CallBare(int socket, std::span<const std::byte> data) {
  const std::array<std::byte, kMessageSize> message{};
  bool sent = false;
  if (data.size() <= kMostBehindTheMessage) {
    const std::array<std::span<const std::byte>, 2> parts{message, data};
    sent = SendWithDescriptors(socket, parts, {});
  } else {
    const FileDescriptor memory = SealedMemory(data);
    const std::array<std::span<const std::byte>, 1> parts{message};
    const std::array<int, 1> rights{memory.get()};
    sent = SendWithDescriptors(socket, parts, rights);
  }
  std::array<std::byte, 64> reply;
  if (!sent || ::recv(socket, reply.data(), reply.size(), 0) != kReplySize) Fail("bare call");
}

std::string NameOf(std::size_t size) {
  return size < 1048576 ? std::to_string(size / 1024) + " KiB"
                        : std::to_string(size / 1048576) + " MiB";
}

}  // namespace

Table MeasureOutOfLine(const Placement& placement, const Effort& effort) {
  PinTo(placement.client);
  Table table{.title = std::string("data in a request, ") + placement.name +
                       " (ratio: to the bare packet or memfd of that size)",
              .unit = "us",
              .figures = {},
              .notes = {}};
  SocketPair pair = MakePair(SOCK_SEQPACKET);
  const Child bare(placement.server, [&] { ServeData(pair.second.get()); });
  const std::string path = "/tmp/halvec-benchmark-" + std::to_string(::getpid());
  const Child helper = StartHelperServer(placement.server, BindService(path));
  const WireClient client = Connect(path);
  (void)::unlink(path.c_str());

  constexpr double kGoal = 1.15;
  constexpr std::int32_t kRefused = 5;
  for (const std::size_t size : {4096U, 65536U, 131072U, 1048576U, 4194304U}) {
    const std::vector<std::byte> data(size, std::byte{'x'});
    const std::size_t calls = std::max<std::size_t>(1, effort.calls / (1 + size / 16384));
    std::vector<double> bareRounds, helperRounds;
    for (std::size_t round = 0; round < effort.rounds; ++round) {
      const double bareTime = MicrosecondsOf([&] {
        for (std::size_t call = 0; call < calls; ++call) CallBare(pair.first.get(), data);
      });
      const double helperTime = MicrosecondsOf([&] {
        for (std::size_t call = 0; call < calls; ++call) {
          if (SetPreference(client.privatePort, "\xff", "key", data) != kRefused) Fail("refusal");
        }
      });
      bareRounds.push_back(bareTime / static_cast<double>(calls));
      helperRounds.push_back(helperTime / static_cast<double>(calls));
    }
    const char* form = size <= kMostBehindTheMessage ? ", in the packet" : ", sealed memfd";
    table.figures.push_back({NameOf(size) + form + ", bare", Median(bareRounds), 1.0, {}});
    table.figures.push_back({NameOf(size) + form + ", helper", Median(helperRounds),
                             PairedRatio(helperRounds, bareRounds), kGoal});
  }
  return table;
}

}  // namespace bench
