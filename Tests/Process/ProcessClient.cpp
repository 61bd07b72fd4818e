// SPDX-License-Identifier: Apache-2.0
//
// A client inside the handset, made of raw bytes: connects, asks, and says what came back. Its
// first argument says what to do.
#include <poll.h>
#include <time.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <random>
#include <string>
#include <string_view>

#include "Tests/Support/WireClient.h"

namespace {

using support::Bytes;
using support::Get;

constexpr const char* kServicePath = HALVEC_PORTS_DIRECTORY "/com.zarvo.halvec.mobile-helper";
constexpr std::int32_t kCopyPreferenceValue = 8683556;

/// Connects; 0, or the code of the refusal.
std::int32_t Connect(support::WireClient& client) {
  client.sendConnect();
  const Bytes reply = client.takeConnectReply(/*wait=*/true);
  if (reply.empty()) {
    std::puts("no reply");
    std::exit(1);
  }
  return client.privatePort ? 0 : Get<std::int32_t>(reply, 32);
}

Bytes Ask(const support::WireClient& client, const Bytes& request) {
  if (support::SendPacket(client.privatePort.get(), request) != 0) std::exit(1);
  return support::AwaitPacket(client.privatePort.get()).bytes;
}

/// Connects, says so, and stays until standard input ends or the helper is gone.
int Hold() {
  support::WireClient client(kServicePath);
  if (Connect(client) != 0) return 1;
  std::puts("connected");
  std::fflush(stdout);
  pollfd entries[2] = {{.fd = STDIN_FILENO, .events = POLLIN, .revents = 0},
                       {.fd = client.privatePort.get(), .events = 0, .revents = 0}};
  (void)::poll(entries, 2, -1);
  if (entries[1].revents != 0) std::puts("the helper is gone");
  return 0;
}

int SetPreference(const std::string& domain, const std::string& key, const std::string& value) {
  support::WireClient client(kServicePath);
  if (const std::int32_t code = Connect(client)) return std::printf("refused with %d\n", code) > 0;
  std::printf("%d\n", Get<std::int32_t>(
                          Ask(client, support::SetPreferenceRequest(domain, key, value)), 32));
  return 0;
}

int GetPreference(const std::string& domain, const std::string& key) {
  support::WireClient client(kServicePath);
  if (const std::int32_t code = Connect(client)) return std::printf("refused with %d\n", code) > 0;
  Bytes bytes = support::Message(kCopyPreferenceValue, 544);
  support::PutText(bytes, 32, domain);
  support::PutText(bytes, 288, key);
  const Bytes reply = Ask(client, bytes);
  std::fwrite(reply.data() + 56, 1, reply.size() < 56 ? 0 : reply.size() - 56, stdout);
  return 0;
}

/// Connects and goes away `count` times; says how many were let in.
int Rounds(int count) {
  int served = 0;
  for (int round = 0; round < count; ++round) {
    support::WireClient client(kServicePath);
    if (Connect(client) == 0) ++served;
  }
  std::printf("%d\n", served);
  return 0;
}

/// Comes back, `count` times, just when the helper's ten idle seconds are over: a little earlier,
/// or while it is leaving, at random. Says how many of the connects were served.
int Race(int count) {
  std::mt19937 random(std::random_device{}());
  std::uniform_int_distribution<long> microseconds(-1000, 9000);
  int served = 0;
  for (int round = 0; round < count; ++round) {
    support::WireClient client(kServicePath);
    if (Connect(client) == 0) ++served;
    client.ownPort.reset();
    const long late = microseconds(random);
    const timespec wait{.tv_sec = late < 0 ? 9 : 10,
                        .tv_nsec = (late < 0 ? 1'000'000 + late : late) * 1000};
    (void)::nanosleep(&wait, nullptr);
  }
  std::printf("%d\n", served);
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  const std::string_view what = argc > 1 ? argv[1] : "";
  if (what == "connect") {
    support::WireClient client(kServicePath);
    std::printf("%d\n", Connect(client));
    return 0;
  }
  if (what == "hold") return Hold();
  if (what == "set" && argc == 5) return SetPreference(argv[2], argv[3], argv[4]);
  if (what == "get" && argc == 4) return GetPreference(argv[2], argv[3]);
  if (what == "rounds" && argc == 3) return Rounds(std::atoi(argv[2]));
  if (what == "race" && argc == 3) return Race(std::atoi(argv[2]));
  std::fputs("usage: client connect|hold|set|get|rounds|race ...\n", stderr);
  return 2;
}
