// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/Linux/LinkResolver.h"

#include <netdb.h>
#include <netinet/in.h>
#include <poll.h>
#include <stdlib.h>
#include <strings.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <memory>
#include <optional>
#include <span>
#include <string_view>

#include "Helper/Platform/FileDescriptor.h"
#include "Helper/Platform/Linux/DnsMessage.h"
#include "Helper/Platform/Linux/NetworkLinks.h"
#include "Helper/Platform/PollTimeout.h"
#include "Helper/Platform/RegularFile.h"

namespace platform {
namespace {

constexpr std::size_t kLongestFile = std::size_t{1} << 20;
constexpr std::size_t kMostServers = 3;
constexpr int kRounds = 2;
constexpr std::array kTypes{DnsType::kA, DnsType::kAaaa};

using Bytes = std::vector<std::uint8_t>;

struct SocketAddress {
  sockaddr_storage storage{};
  socklen_t length = 0;
  [[nodiscard]] const sockaddr& get() const { return reinterpret_cast<const sockaddr&>(storage); }
};

/// An address in numeric text, with the interface after '%' where it is link-local.
std::optional<SocketAddress> ParseAddress(const std::string& text, std::uint16_t port) {
  addrinfo hints{};
  hints.ai_flags = AI_NUMERICHOST | AI_NUMERICSERV;
  hints.ai_socktype = SOCK_DGRAM;
  addrinfo* list = nullptr;
  if (::getaddrinfo(text.c_str(), std::to_string(port).c_str(), &hints, &list) != 0) {
    return std::nullopt;
  }
  const std::unique_ptr<addrinfo, decltype(&::freeaddrinfo)> owner(list, &::freeaddrinfo);
  SocketAddress address;
  address.length = list->ai_addrlen;
  std::copy_n(reinterpret_cast<const char*>(list->ai_addr), list->ai_addrlen,
              reinterpret_cast<char*>(&address.storage));
  return address;
}

bool IsLoopback(const sockaddr& address) {
  if (address.sa_family == AF_INET6) {
    return IN6_IS_ADDR_LOOPBACK(&reinterpret_cast<const sockaddr_in6&>(address).sin6_addr) != 0;
  }
  const auto& four = reinterpret_cast<const sockaddr_in&>(address).sin_addr;
  return (ntohl(four.s_addr) >> 24) == IN_LOOPBACKNET;
}

/// Calls `line` with the words of each line that has at least two, comments left out.
template <class Line>
void ForEachLine(const std::string& path, const char* comment, Line line) {
  const auto bytes = ReadRegularFile(path.c_str(), kLongestFile);
  if (!bytes) return;
  std::string_view rest(reinterpret_cast<const char*>(bytes->data()), bytes->size());
  while (!rest.empty()) {
    const std::size_t end = std::min(rest.find('\n'), rest.size());
    std::string_view text = rest.substr(0, end);
    rest.remove_prefix(std::min(end + 1, rest.size()));
    text = text.substr(0, text.find_first_of(comment));
    std::vector<std::string> words;
    for (;;) {
      const std::size_t begin = text.find_first_not_of(" \t\r");
      if (begin == std::string_view::npos) break;
      text.remove_prefix(begin);
      words.emplace_back(text.substr(0, text.find_first_of(" \t\r")));
      text.remove_prefix(words.back().size());
    }
    if (words.size() >= 2) line(words);
  }
}

std::vector<std::string> AddressesInHosts(const std::string& path, const std::string& host) {
  std::vector<std::string> addresses;
  ForEachLine(path, "#", [&](const std::vector<std::string>& words) {
    const bool named = std::any_of(words.begin() + 1, words.end(), [&](const std::string& name) {
      return ::strcasecmp(name.c_str(), host.c_str()) == 0;
    });
    if (named && ParseAddress(words[0], 0)) addresses.push_back(words[0]);
  });
  return addresses;
}

std::vector<SocketAddress> Servers(const ResolverProfile& profile) {
  std::vector<SocketAddress> servers;
  for (const std::string& file : profile.serverFiles) {
    ForEachLine(file, "#;", [&](const std::vector<std::string>& words) {
      if (words[0] != "nameserver" || servers.size() == kMostServers) return;
      const auto address = ParseAddress(words[1], profile.port);
      if (address && !IsLoopback(address->get()) && EligibleInterface(address->get())) {
        servers.push_back(*address);
      }
    });
    if (!servers.empty()) break;
  }
  return servers;
}

/// Waits until `socket` is ready for `events` or in error; false when the deadline comes first.
bool WaitFor(const FileDescriptor& socket, short events, TimePoint deadline) {
  for (;;) {
    const int left = MillisecondsUntil(deadline);
    if (left <= 0) return false;
    pollfd waited{socket.get(), events, 0};
    const int ready = ::poll(&waited, 1, left);
    if (ready > 0) return true;
    if (ready < 0 && errno != EINTR) return false;
  }
}

/// Sends or receives `length` bytes piece by piece; false when the deadline or the end comes first.
template <class Operation>
bool Whole(const FileDescriptor& socket, short events, TimePoint deadline, std::size_t length,
           Operation operation) {
  for (std::size_t done = 0; done < length;) {
    if (!WaitFor(socket, events, deadline)) return false;
    const ssize_t count = operation(done);
    if (count < 0 && (errno == EAGAIN || errno == EINTR)) continue;
    if (count <= 0) return false;
    done += static_cast<std::size_t>(count);
  }
  return true;
}

bool ReceiveWhole(const FileDescriptor& socket, std::span<std::uint8_t> bytes, TimePoint deadline) {
  return Whole(socket, POLLIN, deadline, bytes.size(), [&](std::size_t done) {
    return ::recv(socket.get(), bytes.data() + done, bytes.size() - done, MSG_DONTWAIT);
  });
}

/// The reply over TCP, each message behind its 16-bit length (RFC 1035, section 4.2.2).
DnsReply AskByTcp(const SocketAddress& server, const Bytes& query, TimePoint deadline) {
  DnsReply none{DnsReply::Kind::kRefused, {}};
  const FileDescriptor socket = EligibleSocket(server.get(), SOCK_STREAM | SOCK_NONBLOCK, 0);
  if (!socket ||
      (::connect(socket.get(), &server.get(), server.length) != 0 && errno != EINPROGRESS)) {
    return none;
  }
  Bytes message{static_cast<std::uint8_t>(query.size() >> 8),
                static_cast<std::uint8_t>(query.size())};
  message.insert(message.end(), query.begin(), query.end());
  const bool sent = Whole(socket, POLLOUT, deadline, message.size(), [&](std::size_t done) {
    return ::send(socket.get(), message.data() + done, message.size() - done, MSG_NOSIGNAL);
  });
  std::array<std::uint8_t, 2> length;
  if (!sent || !ReceiveWhole(socket, length, deadline)) return none;
  Bytes reply(static_cast<std::size_t>(length[0] << 8 | length[1]));
  if (!ReceiveWhole(socket, reply, deadline)) return none;
  return DecodeDnsReply(reply, query);
}

/// Both questions to one server.
class Exchange {
 public:
  Exchange(const SocketAddress& server, const std::string& host, TimePoint deadline)
      : server_(server), deadline_(deadline) {
    const std::uint32_t random = ::arc4random();
    const auto first = static_cast<std::uint16_t>(random);
    // Never the same, so that no reply answers both.
    const std::array ids{first, static_cast<std::uint16_t>(first ^ (random >> 16 | 1))};
    for (std::size_t i = 0; i < kTypes.size(); ++i) {
      questions_[i].query = EncodeDnsQuery(ids[i], host, kTypes[i]);
    }
  }

  /// The addresses, IPv4 before IPv6; none when the server did not answer.
  std::optional<std::vector<std::string>> run() {
    ask();
    std::vector<std::string> addresses;
    bool answered = false;
    for (const Question& question : questions_) {
      const DnsReply& reply = question.reply;
      addresses.insert(addresses.end(), reply.addresses.begin(), reply.addresses.end());
      answered |= reply.kind == DnsReply::Kind::kNoSuchName;
    }
    answered |= std::all_of(questions_.begin(), questions_.end(), [](const Question& question) {
      return question.reply.kind == DnsReply::Kind::kAnswered;
    });
    if (!answered && addresses.empty()) return std::nullopt;
    return addresses;
  }

 private:
  struct Question {
    Bytes query;
    DnsReply reply;
  };

  void ask() {
    // Connected, so that nobody else's datagram is taken for the server's.
    const FileDescriptor socket = EligibleSocket(server_.get(), SOCK_DGRAM, 0);
    if (!socket || ::connect(socket.get(), &server_.get(), server_.length) != 0) return;
    for (const Question& question : questions_) {
      if (::send(socket.get(), question.query.data(), question.query.size(), MSG_NOSIGNAL) < 0) {
        return;
      }
    }
    while (waiting() && WaitFor(socket, POLLIN, deadline_)) {
      std::array<std::uint8_t, 4096> packet;
      const ssize_t length = ::recv(socket.get(), packet.data(), packet.size(), MSG_DONTWAIT);
      if (length < 0 && errno != EAGAIN && errno != EINTR) return;  // nobody listens there
      if (length > 0) take(std::span(packet).first(static_cast<std::size_t>(length)));
    }
  }

  [[nodiscard]] bool waiting() const {
    return std::any_of(questions_.begin(), questions_.end(), [](const Question& question) {
      return question.reply.kind == DnsReply::Kind::kForeign;
    });
  }

  void take(std::span<const std::uint8_t> packet) {
    for (Question& question : questions_) {
      if (question.reply.kind != DnsReply::Kind::kForeign) continue;
      question.reply = DecodeDnsReply(packet, question.query);
      if (question.reply.kind == DnsReply::Kind::kTruncated) {
        question.reply = AskByTcp(server_, question.query, deadline_);
      }
    }
  }

  const SocketAddress& server_;
  const TimePoint deadline_;
  std::array<Question, kTypes.size()> questions_;
};

}  // namespace

std::optional<std::vector<std::string>> ResolveWithoutCellular(const std::string& host,
                                                               const ResolverProfile& profile,
                                                               TimePoint deadline) {
  using Addresses = std::vector<std::string>;
  if (ParseAddress(host, 0)) return Addresses{host};
  if (auto known = AddressesInHosts(profile.hostsFile, host); !known.empty()) return known;
  if (EncodeDnsQuery(0, host, DnsType::kA).empty()) return Addresses{};
  const auto servers = Servers(profile);
  if (servers.empty()) return std::nullopt;
  for (int round = 0; round < kRounds; ++round) {
    for (const SocketAddress& server : servers) {
      const TimePoint now = std::chrono::steady_clock::now();
      if (now >= deadline) return Addresses{};
      Exchange exchange(server, host, std::min(deadline, now + profile.patience));
      if (auto addresses = exchange.run()) return addresses;
    }
  }
  return Addresses{};
}

bool IsReachableWithoutCellular(const std::string& address) {
  const auto parsed = ParseAddress(address, 0);
  return parsed && EligibleInterface(parsed->get());
}

}  // namespace platform
