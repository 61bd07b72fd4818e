// SPDX-License-Identifier: Apache-2.0
//
// The control socket, through which commands inside the handset ask its first process: what runs,
// what was logged, wait for this. Sequenced packets: a question is its arguments, each ended by a
// NUL; an answer is any number of 'O' packets (bytes for standard output) and 'E' packets (for
// standard error) and then one 'X' packet with the exit status as its second byte. Both ends live
// here. One thread, no lock.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Tools/handset/EventLoop.h"
#include "Tools/handset/Question.h"

namespace handset {

inline constexpr const char* kControlSocket = "/run/handset/control";

class Control {
 public:
  using Words = std::vector<std::string>;
  /// Answers a question, now or by Question::wait. `words` is what follows the verb. A Failure that
  /// it throws becomes the answer.
  using Answer = std::function<void(Question&, const Words& words)>;

  /// `catchUp` brings the handset up to everything that happened before the question was sent.
  Control(EventLoop& loop, std::function<void()> catchUp)
      : loop_(loop), catchUp_(std::move(catchUp)) {}

  /// Has `answer` answer the questions whose first word is `verb`.
  void on(const std::string& verb, Answer answer);

  /// Creates the socket, for root only, and starts to answer; throws Failure.
  void open();

  /// Answers the waits whose event has come. To be called after every change in the handset.
  void lookAtWaits();

 private:
  using ClientId = std::uint64_t;
  struct Client {
    platform::FileDescriptor socket;
    EventLoop::Ticket watch = 0;
    EventLoop::Ticket deadline = 0;
    Question question;
    bool isAsked = false;
  };

  void accept();
  void serve(ClientId id, std::uint32_t events);
  void receive(ClientId id);
  void flush(ClientId id);
  void drop(ClientId id);
  void answer(ClientId id, const Words& words);

  EventLoop& loop_;
  std::function<void()> catchUp_;
  std::map<std::string, Answer> answers_;
  platform::FileDescriptor listener_;
  std::map<ClientId, Client> clients_;
  ClientId nextClient_ = 1;
};

/// Asks the handset around the caller, copies its answer to standard output and error, and returns
/// the exit status; throws Failure where there is no handset around the caller or it went away.
[[nodiscard]] int AskHandset(const std::vector<std::string>& words);

}  // namespace handset
