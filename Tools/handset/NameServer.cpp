// SPDX-License-Identifier: Apache-2.0
//
// One question, at most one record. One thread, no lock.
#include "Tools/handset/NameServer.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/epoll.h>
#include <sys/socket.h>

#include <algorithm>
#include <cctype>
#include <utility>

#include "Tools/handset/Failure.h"

namespace handset {
namespace {

using platform::FileDescriptor;
using namespace std::string_view_literals;

constexpr std::size_t kHeader = 12;

std::uint16_t NumberAt(std::string_view bytes, std::size_t offset) {
  const auto byte = [&](std::size_t i) { return static_cast<std::uint8_t>(bytes[i]); };
  return static_cast<std::uint16_t>(byte(offset) << 8U | byte(offset + 1));
}

struct NameQuery {
  std::string name;  ///< Lower case, labels joined by dots.
  std::uint16_t type = 0;
  std::size_t end = 0;  ///< Where the question ends in the query.
};

/// The one question of a query.
std::optional<NameQuery> ReadQuestion(std::string_view query) {
  constexpr std::size_t kFlags = 2;
  constexpr std::size_t kQuestions = 4;
  constexpr unsigned kResponseOrOtherOperation = 0xF800;
  constexpr std::size_t kLongestLabel = 63;
  constexpr std::uint16_t kInternet = 1;
  if (query.size() < kHeader || NumberAt(query, kQuestions) != 1 ||
      (NumberAt(query, kFlags) & kResponseOrOtherOperation) != 0) {
    return std::nullopt;
  }
  NameQuery question;
  std::size_t at = kHeader;
  for (;;) {
    if (at >= query.size()) return std::nullopt;
    const std::size_t length = static_cast<std::uint8_t>(query[at++]);
    if (length == 0) break;
    if (length > kLongestLabel || at + length > query.size()) return std::nullopt;
    if (!question.name.empty()) question.name += '.';
    question.name += query.substr(at, length);
    at += length;
  }
  constexpr std::size_t kTypeAndClass = 4;
  question.end = at + kTypeAndClass;
  if (question.end > query.size() || NumberAt(query, at + 2) != kInternet) return std::nullopt;
  question.type = NumberAt(query, at);
  std::transform(question.name.begin(), question.name.end(), question.name.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  return question;
}

}  // namespace

std::optional<std::string> AnswerNameQuery(std::string_view query,
                                           const std::vector<std::string>& hosts,
                                           const HostAddress& address) {
  constexpr std::uint16_t kAddressRecord = 1;
  const std::optional<NameQuery> question = ReadQuestion(query);
  if (!question) return std::nullopt;
  const bool isKnown = std::find(hosts.begin(), hosts.end(), question->name) != hosts.end();
  const bool hasRecord = isKnown && question->type == kAddressRecord;
  // A response with authority; recursion as it was desired, and available; the code.
  const auto wish = static_cast<char>(static_cast<std::uint8_t>(query[2]) & 1U);
  std::string answer(query.substr(0, 2));
  answer += static_cast<char>(static_cast<std::uint8_t>(wish) | 0x84U);
  answer += isKnown ? '\x80' : '\x83';
  answer += "\0\1"sv;
  answer += hasRecord ? "\0\1"sv : "\0\0"sv;
  answer += "\0\0\0\0"sv;
  answer += query.substr(kHeader, question->end - kHeader);
  if (hasRecord) {
    // The name as a pointer to the question's, type, class, no time to live, length.
    answer += "\xc0\x0c\0\1\0\1\0\0\0\0\0\4"sv;
    for (const std::uint8_t byte : address) answer += static_cast<char>(byte);
  }
  return answer;
}

NameServer::NameServer(EventLoop& loop, const World& world,
                       const std::vector<std::string>& listening, std::vector<std::string> hosts,
                       const std::string& address)
    : hosts_(std::move(hosts)) {
  if (inet_pton(AF_INET, address.c_str(), address_.data()) != 1) {
    throw Failure(address + " is no IPv4 address");
  }
  world.inside([&] {
    for (const std::string& text : listening) listen(loop, text);
  });
}

void NameServer::listen(EventLoop& loop, const std::string& address) {
  constexpr std::uint16_t kNameService = 53;
  FileDescriptor socket(::socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  sockaddr_in own{};
  own.sin_family = AF_INET;
  own.sin_port = htons(kNameService);
  const int on = 1;
  // The address goes and comes with its interface.
  if (!socket || inet_pton(AF_INET, address.c_str(), &own.sin_addr) != 1 ||
      setsockopt(socket.get(), IPPROTO_IP, IP_FREEBIND, &on, sizeof on) != 0 ||
      bind(socket.get(), reinterpret_cast<const sockaddr*>(&own), sizeof own) != 0) {
    throw Failure::FromErrno("serve names at " + address);
  }
  const int descriptor = socket.get();
  // The watch lasts as long as the loop, and so does the socket.
  static_cast<void>(
      loop.watch(descriptor, EPOLLIN, [this, descriptor](std::uint32_t) { serve(descriptor); }));
  sockets_.push_back(std::move(socket));
}

void NameServer::drain() const {
  for (const FileDescriptor& socket : sockets_) serve(socket.get());
}

void NameServer::serve(int socket) const {
  std::array<char, 1500> query{};
  for (;;) {
    sockaddr_in from{};
    socklen_t size = sizeof from;
    const ssize_t count =
        recvfrom(socket, query.data(), query.size(), 0, reinterpret_cast<sockaddr*>(&from), &size);
    if (count < 0) return;
    if (!isAnswering_) continue;
    const auto answer =
        AnswerNameQuery({query.data(), static_cast<std::size_t>(count)}, hosts_, address_);
    if (!answer) continue;
    // Who asked may be gone: it asks again, or does not care.
    static_cast<void>(sendto(socket, answer->data(), answer->size(), MSG_NOSIGNAL,
                             reinterpret_cast<const sockaddr*>(&from), size));
  }
}

}  // namespace handset
