// SPDX-License-Identifier: Apache-2.0
//
// The control socket, through which commands inside the handset ask its first process: what runs,
// what was logged, wait for this. Sequenced packets: a question is its arguments, each ended by a
// NUL; an answer is any number of 'O' packets (bytes for standard output) and 'E' packets (for
// standard error) and then one 'X' packet with the exit status as its second byte. Both ends live
// here. One thread, no lock.
#pragma once

#include <deque>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Tools/handset/EventLoop.h"
#include "Tools/handset/Launcher.h"
#include "Tools/handset/SystemLogCapture.h"

namespace handset {

inline constexpr const char* kControlSocket = "/run/handset/control";

class Control {
 public:
  /// `catchUp` brings launcher and capture up to everything that happened before the question was
  /// sent.
  Control(EventLoop& loop, Launcher& launcher, SystemLogCapture& capture,
          std::function<void()> catchUp)
      : loop_(loop), launcher_(launcher), capture_(capture), catchUp_(std::move(catchUp)) {}

  /// Creates the socket, for root only, and starts to answer; throws Failure.
  void open();

  /// Answers the waits whose event has come. To be called after every change of launcher or log.
  void lookAtWaits();

 private:
  using ClientId = std::uint64_t;
  struct Client {
    platform::FileDescriptor socket;
    EventLoop::Ticket watch = 0;
    EventLoop::Ticket deadline = 0;
    std::deque<std::string> packets;          ///< Not sent yet.
    std::function<bool(Client&)> isAnswered;  ///< What it waits for; answers when it is there.
    bool isAsked = false;
  };
  using Words = std::vector<std::string>;

  void accept();
  void serve(ClientId id, std::uint32_t events);
  void receive(ClientId id);
  void flush(ClientId id);
  void drop(ClientId id);
  void answer(ClientId id, const Words& words);
  void answerStatus(Client& client, const Words& words) const;
  void answerKill(Client& client, const Words& words) const;
  void answerStart(Client& client) const;
  void waitForStart(ClientId id, const Words& words);
  void waitForExit(ClientId id, const Words& words);
  void waitForLog(ClientId id, const Words& words);
  void wait(ClientId id, int milliseconds, std::function<bool(Client&)> isAnswered);

  static void say(Client& client, char stream, std::string_view text);
  static void finish(Client& client, int status);

  EventLoop& loop_;
  Launcher& launcher_;
  SystemLogCapture& capture_;
  std::function<void()> catchUp_;
  platform::FileDescriptor listener_;
  std::map<ClientId, Client> clients_;
  ClientId nextClient_ = 1;
};

/// Asks the handset around the caller, copies its answer to standard output and error, and returns
/// the exit status; throws Failure where there is no handset around the caller or it went away.
[[nodiscard]] int AskHandset(const std::vector<std::string>& words);

}  // namespace handset
