// SPDX-License-Identifier: Apache-2.0
//
// Questions and answers. A client that does not read keeps its own answer waiting and nobody
// else's. One thread, no lock.
#include "Tools/handset/Control.h"

#include <sys/epoll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <string_view>
#include <utility>

#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"
#include "Tools/handset/Options.h"
#include "Tools/handset/UnixAddress.h"

namespace handset {
namespace {

std::vector<std::string> SplitWords(std::string_view question) {
  std::vector<std::string> words;
  while (!question.empty()) {
    const std::size_t end = std::min(question.find('\0'), question.size() - 1);
    words.emplace_back(question.substr(0, question[end] == '\0' ? end : end + 1));
    question.remove_prefix(end + 1);
  }
  return words;
}

}  // namespace

void Control::open() {
  listener_.reset(socket(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!listener_) throw Failure::FromErrno("socket");
  BindAt(listener_.get(), kControlSocket);
  if (chmod(kControlSocket, 0600) != 0) throw Failure::FromErrno("chmod the control socket");
  if (listen(listener_.get(), SOMAXCONN) != 0) throw Failure::FromErrno("listen");
  // The watch lasts as long as the loop, and so does the socket.
  static_cast<void>(loop_.watch(listener_.get(), EPOLLIN, [this](std::uint32_t) { accept(); }));
}

void Control::accept() {
  platform::FileDescriptor socket(
      accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
  if (!socket) return;
  const ClientId id = nextClient_++;
  Client& client = clients_[id];
  client.socket = std::move(socket);
  client.watch = loop_.watch(client.socket.get(), EPOLLIN,
                             [this, id](std::uint32_t events) { serve(id, events); });
}

void Control::serve(ClientId id, std::uint32_t events) {
  if ((events & (EPOLLHUP | EPOLLERR)) != 0) {
    drop(id);
  } else if ((events & EPOLLIN) != 0) {
    receive(id);
  } else {
    flush(id);
  }
}

void Control::receive(ClientId id) {
  Client& client = clients_.at(id);
  std::string question(kLongestPacket, '\0');
  const ssize_t count = recv(client.socket.get(), question.data(), question.size(), MSG_DONTWAIT);
  if (count < 0 && (errno == EAGAIN || errno == EINTR)) return;
  if (count <= 0 || client.isAsked) {
    drop(id);
    return;
  }
  client.isAsked = true;
  question.resize(static_cast<std::size_t>(count));
  catchUp_();
  answer(id, SplitWords(question));
  flush(id);
}

void Control::flush(ClientId id) {
  Client& client = clients_.at(id);
  std::deque<std::string>& packets = client.question.packets();
  while (!packets.empty()) {
    const std::string& packet = packets.front();
    if (send(client.socket.get(), packet.data(), packet.size(), MSG_DONTWAIT | MSG_NOSIGNAL) < 0) {
      if (errno != EAGAIN) {
        drop(id);
        return;
      }
      loop_.change(client.watch, EPOLLIN | EPOLLOUT);
      return;
    }
    const bool isLast = packet.front() == kExitPacket;
    packets.pop_front();
    if (isLast) {
      drop(id);
      return;
    }
  }
  loop_.change(client.watch, EPOLLIN);
}

void Control::drop(ClientId id) {
  const Client& client = clients_.at(id);
  loop_.forget(client.watch);
  loop_.cancel(client.deadline);
  clients_.erase(id);
}

void Control::lookAtWaits() {
  std::vector<ClientId> clients;
  for (auto& [id, client] : clients_) {
    client.question.lookAgain();
    if (!client.question.packets().empty()) clients.push_back(id);
  }
  for (const ClientId id : clients) flush(id);
}

void Control::on(const std::string& verb, Answer answer) {
  answers_.insert_or_assign(verb, std::move(answer));
}

void Control::answer(ClientId id, const Words& words) {
  Client& client = clients_.at(id);
  Question& question = client.question;
  const std::string verb = words.empty() ? "" : words.front();
  const auto found = answers_.find(verb);
  try {
    if (found == answers_.end()) RefuseUsage("unknown command " + verb);
    found->second(question, Words(words.begin() + 1, words.end()));
  } catch (const Failure& failure) {
    question.complain(failure.what());
    question.finish(failure.status());
  }
  if (question.isFinished() || !question.limit()) return;
  const auto deadline = EventLoop::Clock::now() + std::chrono::milliseconds(*question.limit());
  client.deadline = loop_.at(deadline, [this, id] {
    Question& late = clients_.at(id).question;
    if (late.isFinished()) return;
    late.complain("timed out");
    late.finish(kStatusTimedOut);
    flush(id);
  });
}

int AskHandset(const std::vector<std::string>& words) {
  if (access(kControlSocket, F_OK) != 0 && errno == ENOENT) {
    throw Failure("this command works inside a handset only (handset run -- ...)");
  }
  const platform::FileDescriptor socket(::socket(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0));
  if (!socket) throw Failure::FromErrno("socket");
  ConnectTo(socket.get(), kControlSocket);
  std::string question;
  for (const std::string& word : words) question.append(word).push_back('\0');
  if (question.size() > kLongestPacket) throw Failure("the question is too long");
  if (send(socket.get(), question.data(), question.size(), MSG_NOSIGNAL) < 0) {
    throw Failure::FromErrno("ask the handset");
  }
  std::vector<char> packet(kLongestPacket);
  for (;;) {
    const ssize_t count = recv(socket.get(), packet.data(), packet.size(), 0);
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) throw Failure("the handset went away");
    const std::string_view bytes(packet.data() + 1, static_cast<std::size_t>(count) - 1);
    if (packet[0] == kExitPacket && bytes.size() == 1) return static_cast<unsigned char>(bytes[0]);
    if (!WriteAll(packet[0] == kErrorPacket ? STDERR_FILENO : STDOUT_FILENO, bytes)) {
      throw Failure::FromErrno("write the answer");
    }
  }
}

}  // namespace handset
