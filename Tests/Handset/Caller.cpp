// SPDX-License-Identifier: Apache-2.0
//
// Runs inside the handset and sends datagrams of text to the service port, or raw ones to the
// system log. It waits for answers and for nothing else. One thread, no lock.
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

namespace {

constexpr const char* kPort = HALVEC_PORTS_DIRECTORY "/com.zarvo.halvec.mobile-helper";

[[noreturn]] void Fail(const char* what) {
  std::perror(what);
  _exit(1);
}

sockaddr_un AddressOf(std::string_view path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::memcpy(static_cast<char*>(address.sun_path), path.data(), path.size());
  return address;
}

class Socket {
 public:
  explicit Socket(std::string_view peer)
      : descriptor_(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
    const sockaddr_un anyName{AF_UNIX, {}};
    // A bind of the family alone asks for a name of the kernel's choice.
    if (bind(descriptor_, reinterpret_cast<const sockaddr*>(&anyName), sizeof(sa_family_t)) != 0) {
      Fail("bind");
    }
    const sockaddr_un address = AddressOf(peer);
    peer_ = address;
  }
  Socket(const Socket&) = delete;
  Socket& operator=(const Socket&) = delete;
  ~Socket() { close(descriptor_); }

  [[nodiscard]] bool post(std::string_view text, int flags = 0) const {
    return sendto(descriptor_, text.data(), text.size(), flags,
                  reinterpret_cast<const sockaddr*>(&peer_), sizeof peer_) >= 0;
  }

  [[nodiscard]] std::string call(std::string_view text) const {
    if (!post(text)) Fail("send");
    return answer();
  }

  [[nodiscard]] std::string answer() const {
    std::array<char, 4096> text{};
    const ssize_t count = recv(descriptor_, text.data(), text.size(), 0);
    if (count < 0) Fail("receive");
    return {text.data(), static_cast<std::size_t>(count)};
  }

 private:
  int descriptor_;
  sockaddr_un peer_{};
};

int Rounds(int count) {
  const Socket socket(kPort);
  std::set<std::string> instances;
  for (int i = 0; i < count; ++i) {
    const std::string expected = std::to_string(i) + " by ";
    const std::string answer = socket.call(std::to_string(i));
    if (!answer.starts_with(expected)) {
      std::printf("round %d answered \"%s\"\n", i, answer.c_str());
      return 1;
    }
    instances.insert(answer.substr(expected.size()));
  }
  std::printf("%d rounds, %zu instances\n", count, instances.size());
  return 0;
}

/// Puts several messages into the queue at once and reads their answers afterwards.
int Batch(int count) {
  const Socket socket(kPort);
  for (int i = 0; i < count; ++i) {
    if (!socket.post(std::to_string(i))) Fail("send");
  }
  for (int i = 0; i < count; ++i) {
    const std::string answer = socket.answer();
    std::printf("%s\n", answer.substr(0, answer.find(' ')).c_str());
  }
  return 0;
}

int Burst() {
  const Socket socket(kPort);
  int taken = 0;
  while (socket.post("x", MSG_DONTWAIT)) ++taken;
  std::printf("%d\n", taken);
  return 0;
}

/// Like "who", and logs "sent" between question and answer.
std::string AskWho() {
  const Socket socket(kPort);
  if (!socket.post("who")) Fail("send");
  if (!Socket("/dev/log").post("sent")) Fail("log");
  return socket.answer();
}

/// Log lines of a writer that does not wait; how many were taken.
int LogBurst(int count) {
  const Socket log("/dev/log");
  int taken = 0;
  for (int i = 0; i < count; ++i) taken += log.post("line", MSG_DONTWAIT) ? 1 : 0;
  std::printf("%d\n", taken);
  return 0;
}

/// A second question while the first one waits.
int AskTwice() {
  const int control = socket(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0);
  const sockaddr_un address = AddressOf("/run/handset/control");
  if (connect(control, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
    Fail("connect");
  }
  constexpr std::string_view kWait{"wait-start\0", 11};
  for (int i = 0; i < 2; ++i) {
    if (send(control, kWait.data(), kWait.size(), MSG_NOSIGNAL) < 0) Fail("ask");
  }
  char answer = 0;
  std::printf("%s\n", recv(control, &answer, 1, 0) == 0 ? "dropped" : "answered");
  close(control);
  return 0;
}

std::string BytesOf(std::string_view hexadecimal) {
  std::string bytes;
  for (std::size_t i = 0; i + 1 < hexadecimal.size(); i += 2) {
    const std::string digits(hexadecimal.substr(i, 2));
    bytes += static_cast<char>(std::strtol(digits.c_str(), nullptr, 16));
  }
  return bytes;
}

}  // namespace

int main(int argc, char** argv) {
  const std::vector<std::string> words(argv + 1, argv + argc);
  const std::string verb = words.empty() ? "" : words[0];
  if (verb == "who") {
    const std::string answer = AskWho();
    const std::string own =
        std::to_string(getpid()) + " " + std::to_string(getuid()) + " " + std::to_string(getgid());
    std::printf("%s\n", answer == own ? "own" : (answer + " instead of " + own).c_str());
    return 0;
  }
  if (verb == "rounds" && words.size() == 2) return Rounds(std::atoi(words[1].c_str()));
  if (verb == "batch" && words.size() == 2) return Batch(std::atoi(words[1].c_str()));
  if (verb == "burst") return Burst();
  if (verb == "log-burst" && words.size() == 2) return LogBurst(std::atoi(words[1].c_str()));
  if (verb == "ask-twice") return AskTwice();
  if (verb == "call" && words.size() == 2) {
    std::printf("%s\n", Socket(kPort).call(words[1]).c_str());
    return 0;
  }
  if (verb == "post" && words.size() == 2) return Socket(kPort).post(words[1]) ? 0 : 1;
  if (verb == "log" && words.size() == 2) {
    return Socket("/dev/log").post(BytesOf(words[1])) ? 0 : 1;
  }
  static_cast<void>(std::fprintf(stderr, "unknown request\n"));
  return 2;
}
