// SPDX-License-Identifier: Apache-2.0
//
// halvecctl status and monitor: what the running helper is busy with. They read the socket that the
// helper keeps for root; no message is sent to the service, so neither starts it or keeps it alive.
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/PropertyList.h"
#include "Helper/Platform/UnixSocketAddress.h"
#include "Tools/halvecctl/Command.h"
#include "Tools/halvecctl/Input.h"
#include "Tools/halvecctl/Json.h"

namespace halvecctl {
namespace {

using platform::FileDescriptor;
using platform::PropertyList;

constexpr std::size_t kMaxPacket = std::size_t{1} << 18;
constexpr int kPatienceMilliseconds = 5000;
constexpr int kForever = -1;

FileDescriptor Observe(const std::string& path) {
  if (path.empty()) {
    throw Failure(ExitCode::kNotConnected, "this build's helper has no socket for observers");
  }
  const platform::UnixSocketAddress address(path);
  if (!address) throw UsageFailure("the socket's path is too long");
  FileDescriptor socket(::socket(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0));
  if (!socket || ::connect(socket.get(), address.get(), address.size()) != 0) {
    if (errno == ENOENT || errno == ECONNREFUSED) {
      throw Failure(ExitCode::kNotConnected, "the helper is not running");
    }
    throw Failure(ExitCode::kNotConnected,
                  "cannot connect to " + path + ": " + std::string(std::strerror(errno)));
  }
  return socket;
}

/// The next packet; none when the helper has ended or admits no observer.
std::optional<PropertyList> Receive(const FileDescriptor& socket, int milliseconds) {
  pollfd readable{.fd = socket.get(), .events = POLLIN, .revents = 0};
  if (::poll(&readable, 1, milliseconds) == 0) {
    throw Failure(ExitCode::kLost, "the helper does not answer");
  }
  std::vector<std::byte> packet(kMaxPacket);
  const ssize_t size = ::recv(socket.get(), packet.data(), packet.size(), MSG_TRUNC);
  if (size <= 0) return std::nullopt;
  if (static_cast<std::size_t>(size) > packet.size()) {
    throw Failure(ExitCode::kLost, "the helper's answer is too long");
  }
  packet.resize(static_cast<std::size_t>(size));
  std::string reason;
  auto list = platform::ParsePropertyList(packet, &reason);
  if (!list) throw Failure(ExitCode::kLost, "the helper's answer is no property list: " + reason);
  return list;
}

std::int64_t Integer(const PropertyList& from, std::string_view key) {
  const PropertyList* value = from.find(key);
  return value ? value->integer().value_or(0) : 0;
}

double Real(const PropertyList& from, std::string_view key) {
  const PropertyList* value = from.find(key);
  return value ? value->real().value_or(0) : 0;
}

std::string Text(const PropertyList& from, std::string_view key) {
  const PropertyList* value = from.find(key);
  return value && value->string() ? *value->string() : std::string();
}

const PropertyList::Array& List(const PropertyList& from, std::string_view key) {
  static const PropertyList::Array kNone;
  const PropertyList* value = from.find(key);
  return value && value->array() ? *value->array() : kNone;
}

/// The program that a process runs now; "?" when it is gone.
std::string ProgramOf(std::int64_t process) {
  std::array<char, 4096> target;
  const std::string link = "/proc/" + std::to_string(process) + "/exe";
  const ssize_t size = ::readlink(link.c_str(), target.data(), target.size());
  return size > 0 ? std::string(target.data(), static_cast<std::size_t>(size)) : "?";
}

void PrintClient(const PropertyList& client) {
  const std::int64_t process = Integer(client, "Process");
  std::printf("  process %lld  user %lld  %s  connected %.1f s  %lld requests",
              static_cast<long long>(process), static_cast<long long>(Integer(client, "User")),
              ProgramOf(process).c_str(), Real(client, "ConnectedSeconds"),
              static_cast<long long>(Integer(client, "Requests")));
  if (client.find("LastRequest")) {
    std::printf(", last %s with code %lld", Text(client, "LastRequest").c_str(),
                static_cast<long long>(Integer(client, "LastCode")));
  }
  std::printf("\n");
}

void PrintStatus(const PropertyList& status) {
  const auto& clients = List(status, "Clients");
  const auto& tokens = List(status, "WorkTokens");
  std::printf("running as process %lld\n", static_cast<long long>(Integer(status, "Process")));
  std::printf("clients: %lld\n", static_cast<long long>(Integer(status, "ClientCount")));
  for (const PropertyList& client : clients) PrintClient(client);
  std::printf("work tokens: %zu\n", tokens.size());
  for (const PropertyList& token : tokens) {
    std::printf("  0x%08llx  %s  for %.1f s\n",
                static_cast<unsigned long long>(Integer(token, "Token")),
                Text(token, "Owner").c_str(), Real(token, "AgeSeconds"));
  }
  if (status.find("IdleExitInSeconds")) {
    std::printf("idle exit in %.1f s\n", Real(status, "IdleExitInSeconds"));
  } else if (clients.empty() && tokens.empty()) {
    std::printf("no idle exit is due: no client has come yet\n");
  } else {
    std::printf("no idle exit while clients are connected or work tokens are out\n");
  }
}

/// Seconds of 2001-01-01T00:00:00Z since the Unix epoch.
constexpr double kPropertyListEpoch = 978307200;

void PrintEvent(const PropertyList& event) {
  const PropertyList* time = event.find("Time");
  const double seconds = time && time->date() ? time->date()->seconds + kPropertyListEpoch : 0;
  const auto whole = static_cast<std::time_t>(seconds);
  std::tm local{};
  std::array<char, 32> clock{};
  if (::localtime_r(&whole, &local)) {
    (void)std::strftime(clock.data(), clock.size(), "%H:%M:%S", &local);  // fits
  }
  std::printf("%s.%03d  %s  process %lld  user %lld  code %lld  %lld us\n", clock.data(),
              static_cast<int>((seconds - static_cast<double>(whole)) * 1000),
              Text(event, "Request").c_str(), static_cast<long long>(Integer(event, "Process")),
              static_cast<long long>(Integer(event, "User")),
              static_cast<long long>(Integer(event, "Code")),
              static_cast<long long>(Integer(event, "Microseconds")));
}

void Print(const GlobalOptions& options, const PropertyList& list,
           void (*print)(const PropertyList&)) {
  options.json ? void(std::printf("%s\n", JsonPropertyList(list).c_str())) : print(list);
  std::fflush(stdout);  // somebody watches, perhaps through a pipe
}

std::string TakeSocket(Words& words) {
  return words.takeOptionWithValue("--observer").value_or(HALVEC_OBSERVER_SOCKET);
}

PropertyList ReceiveStatus(const FileDescriptor& socket) {
  auto status = Receive(socket, kPatienceMilliseconds);
  if (!status) throw Failure(ExitCode::kRefused, "the helper shows this to root alone");
  return std::move(*status);
}

ExitCode RunStatus(const GlobalOptions& options, Words words) {
  const std::string path = TakeSocket(words);
  (void)words.takeAll(0, "");
  Print(options, ReceiveStatus(Observe(path)), PrintStatus);
  return ExitCode::kDone;
}

ExitCode RunMonitor(const GlobalOptions& options, Words words) {
  const std::string path = TakeSocket(words);
  const auto count = words.takeOptionWithValue("--count");
  std::uint64_t left = count ? ParseUnsigned(*count, UINT32_MAX) : 0;
  (void)words.takeAll(0, "");
  const FileDescriptor socket = Observe(path);
  (void)ReceiveStatus(socket);
  std::fprintf(stderr, "watching; the helper's end ends this\n");
  while (const auto event = Receive(socket, kForever)) {
    Print(options, *event, PrintEvent);
    if (count && --left == 0) break;
  }
  return ExitCode::kDone;
}

}  // namespace

constinit const Command kStatusCommand{
    "status", "[--observer PATH]", "why the helper is still running",
    "Prints the connected clients, the work tokens that are out with owner and age, and when the\n"
    "idle exit is due. Root only. Sends no message to the service: it does not start the helper, "
    "and\n"
    "does not keep it alive. PATH is the helper's socket for observers.\n",
    RunStatus};

constinit const Command kMonitorCommand{
    "monitor", "[--count N] [--observer PATH]", "what the helper is doing, message by message",
    "Prints a line for each message as it is served: time, request, caller, return code and the\n"
    "microseconds from arrival to reply. Ends with the helper, or after N messages. Root only; "
    "sends\n"
    "nothing to the service.\n",
    RunMonitor};

}  // namespace halvecctl
