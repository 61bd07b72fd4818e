// SPDX-License-Identifier: Apache-2.0
//
// Questions and answers. A client that does not read keeps its own answer waiting and nobody
// else's. One thread, no lock.
#include "Tools/handset/Control.h"

#include <signal.h>
#include <sys/epoll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <memory>
#include <optional>
#include <utility>

#include "Tools/handset/Failure.h"
#include "Tools/handset/Files.h"
#include "Tools/handset/Options.h"
#include "Tools/handset/SignalName.h"
#include "Tools/handset/UnixAddress.h"

namespace handset {
namespace {

constexpr char kOutput = 'O';
constexpr char kError = 'E';
constexpr char kExit = 'X';
constexpr std::size_t kLongestPacket = std::size_t{32} * 1024;
constexpr int kNoLimit = -1;

std::vector<std::string> SplitWords(std::string_view question) {
  std::vector<std::string> words;
  while (!question.empty()) {
    const std::size_t end = std::min(question.find('\0'), question.size() - 1);
    words.emplace_back(question.substr(0, question[end] == '\0' ? end : end + 1));
    question.remove_prefix(end + 1);
  }
  return words;
}

std::string StatusJson(const LauncherStatus& status, std::size_t logLines) {
  const auto boolean = [](bool value) { return std::string(value ? "true" : "false"); };
  std::string json = "{\"running\":" + boolean(status.running.has_value());
  json += ",\"pid\":" + (status.running ? std::to_string(*status.running) : "null");
  json += ",\"starts\":" + std::to_string(status.starts);
  json += ",\"exits\":" + std::to_string(status.exits);
  json += ",\"stopped\":" + boolean(status.isStopped);
  json += ",\"message_queued\":" + boolean(status.isMessageQueued);
  json += ",\"log_lines\":" + std::to_string(logLines) + ",\"last_exit\":";
  if (!status.last) return json + "null}\n";
  return json + "{\"pid\":" + std::to_string(status.last->pid) +
         ",\"code\":" + std::to_string(status.last->code) +
         ",\"signal\":" + std::to_string(status.last->signal) +
         ",\"lived_ms\":" + std::to_string(status.last->lived.count()) + "}}\n";
}

std::string StatusLines(const LauncherStatus& status, std::size_t logLines) {
  std::string text = status.running ? "running as process " + std::to_string(*status.running)
                                    : std::string("not running");
  if (status.isStopped) text += ", stopped after a crash loop";
  text += "\nstarts: " + std::to_string(status.starts) + "\n";
  if (status.last) text += "last instance: " + Describe(*status.last) + "\n";
  text += "log lines: " + std::to_string(logLines) + "\n";
  return text;
}

enum class LogForm { kLines, kJson, kRaw };

std::string Render(const LogEntry& entry, LogForm form) {
  if (form == LogForm::kJson) return LogEntryJson(entry);
  if (form == LogForm::kRaw) return entry.raw + '\n';
  return LogEntryLine(entry);
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
  try {
    answer(id, SplitWords(question));
  } catch (const Failure& failure) {
    say(client, kError, std::string("handset: ") + failure.what() + "\n");
    finish(client, failure.status());
  }
  flush(id);
}

void Control::flush(ClientId id) {
  Client& client = clients_.at(id);
  while (!client.packets.empty()) {
    const std::string& packet = client.packets.front();
    if (send(client.socket.get(), packet.data(), packet.size(), MSG_DONTWAIT | MSG_NOSIGNAL) < 0) {
      if (errno != EAGAIN) {
        drop(id);
        return;
      }
      loop_.change(client.watch, EPOLLIN | EPOLLOUT);
      return;
    }
    const bool isLast = packet.front() == kExit;
    client.packets.pop_front();
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

void Control::say(Client& client, char stream, std::string_view text) {
  while (!text.empty()) {
    const std::string_view part = text.substr(0, kLongestPacket - 1);
    client.packets.push_back(stream + std::string(part));
    text.remove_prefix(part.size());
  }
}

void Control::finish(Client& client, int status) {
  client.isAnswered = nullptr;
  client.packets.push_back({kExit, static_cast<char>(status)});
}

void Control::lookAtWaits() {
  std::vector<ClientId> answered;
  for (auto& [id, client] : clients_) {
    // A copy: the answer ends the wait, and with it the function that is running.
    const auto isAnswered = client.isAnswered;
    if (isAnswered && isAnswered(client)) answered.push_back(id);
  }
  for (const ClientId id : answered) flush(id);
}

void Control::wait(ClientId id, int milliseconds, std::function<bool(Client&)> isAnswered) {
  Client& client = clients_.at(id);
  if (isAnswered(client)) return;
  client.isAnswered = std::move(isAnswered);
  if (milliseconds == kNoLimit) return;
  const auto deadline = EventLoop::Clock::now() + std::chrono::milliseconds(milliseconds);
  client.deadline = loop_.at(deadline, [this, id] {
    Client& late = clients_.at(id);
    say(late, kError, "handset: timed out\n");
    finish(late, kStatusTimedOut);
    flush(id);
  });
}

void Control::answer(ClientId id, const Words& words) {
  Client& client = clients_.at(id);
  const std::string verb = words.empty() ? "" : words.front();
  const Words rest(words.begin() + (words.empty() ? 0 : 1), words.end());
  if (verb == "status") {
    answerStatus(client, rest);
  } else if (verb == "kill") {
    answerKill(client, rest);
  } else if (verb == "start-helper") {
    answerStart(client);
  } else if (verb == "wait-start") {
    waitForStart(id, rest);
  } else if (verb == "wait-exit") {
    waitForExit(id, rest);
  } else if (verb == "log") {
    waitForLog(id, rest);
  } else {
    RefuseUsage("unknown command " + verb);
  }
}

void Control::answerStatus(Client& client, const Words& words) const {
  bool isJson = false;
  OptionReader reader(words);
  while (const auto option = reader.nextOption()) {
    if (*option != "--json") RefuseUsage("unknown option " + *option);
    isJson = true;
  }
  const std::size_t logLines = capture_.entries().size();
  const LauncherStatus status = launcher_.status();
  say(client, kOutput, isJson ? StatusJson(status, logLines) : StatusLines(status, logLines));
  finish(client, 0);
}

void Control::answerKill(Client& client, const Words& words) const {
  const std::optional<int> signal = words.empty() ? SIGTERM : SignalNumber(words.front());
  if (!signal) RefuseUsage("unknown signal " + words.front());
  if (!launcher_.signalHelper(*signal)) throw Failure("no helper runs", 1);
  finish(client, 0);
}

void Control::answerStart(Client& client) const {
  if (!launcher_.startNow()) throw Failure("a helper runs already", 1);
  finish(client, 0);
}

void Control::waitForStart(ClientId id, const Words& words) {
  int limit = kNoLimit;
  std::optional<unsigned> starts;
  OptionReader reader(words);
  while (const auto option = reader.nextOption()) {
    if (*option == "--timeout") {
      limit = Milliseconds(reader.value());
    } else if (*option == "--starts") {
      starts = WholeNumber(reader.value());
    } else {
      RefuseUsage("unknown option " + *option);
    }
  }
  wait(id, limit, [this, starts](Client& client) {
    const LauncherStatus status = launcher_.status();
    if (starts ? status.starts < *starts : !status.running) return false;
    if (status.running) say(client, kOutput, std::to_string(*status.running) + "\n");
    finish(client, 0);
    return true;
  });
}

void Control::waitForExit(ClientId id, const Words& words) {
  int limit = kNoLimit;
  const LauncherStatus now = launcher_.status();
  // The instance that runs now, or else the last one, or else the first one to come.
  unsigned exits = std::max(1U, now.exits + (now.running ? 1U : 0U));
  OptionReader reader(words);
  while (const auto option = reader.nextOption()) {
    if (*option == "--timeout") {
      limit = Milliseconds(reader.value());
    } else if (*option == "--exits") {
      exits = WholeNumber(reader.value());
    } else {
      RefuseUsage("unknown option " + *option);
    }
  }
  wait(id, limit, [this, exits](Client& client) {
    const LauncherStatus status = launcher_.status();
    if (status.exits < exits) return false;
    if (status.last) say(client, kOutput, Describe(*status.last) + "\n");
    finish(client, 0);
    return true;
  });
}

void Control::waitForLog(ClientId id, const Words& words) {
  int limit = kNoLimit;
  LogForm form = LogForm::kLines;
  // Shared, because the function that keeps it is copied while it runs.
  const auto next = std::make_shared<std::size_t>(0);
  std::optional<std::string> until;
  OptionReader reader(words);
  while (const auto option = reader.nextOption()) {
    if (*option == "--timeout") {
      limit = Milliseconds(reader.value());
    } else if (*option == "--follow-until") {
      until = reader.value();
    } else if (*option == "--skip") {
      *next = WholeNumber(reader.value());
    } else if (*option == "--json") {
      form = LogForm::kJson;
    } else if (*option == "--raw") {
      form = LogForm::kRaw;
    } else {
      RefuseUsage("unknown option " + *option);
    }
  }
  wait(id, limit, [this, form, until, next](Client& client) {
    const auto& entries = capture_.entries();
    while (*next < entries.size()) {
      const LogEntry& entry = entries[(*next)++];
      say(client, kOutput, Render(entry, form));
      if (until && entry.text.find(*until) != std::string::npos) {
        finish(client, 0);
        return true;
      }
    }
    if (!until) finish(client, 0);
    return !until;
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
    if (packet[0] == kExit && bytes.size() == 1) return static_cast<unsigned char>(bytes[0]);
    if (!WriteAll(packet[0] == kError ? STDERR_FILENO : STDOUT_FILENO, bytes)) {
      throw Failure::FromErrno("write the answer");
    }
  }
}

}  // namespace handset
