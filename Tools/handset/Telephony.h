// SPDX-License-Identifier: Apache-2.0
//
// A stand-in for the telephony daemon: publishes its named ports, keeps every message that the
// helper sends it, and answers civic-info calls with what it was told to answer. Runs on the event
// loop of the handset's first process. One thread, no lock.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "Helper/Platform/FileDescriptor.h"
#include "Tools/handset/EventLoop.h"
#include "Tools/handset/TelephonyMessage.h"

namespace handset {

class Telephony {
 public:
  explicit Telephony(EventLoop& loop) : loop_(loop) {}

  /// Publishes the ports, as datagram sockets of the daemon's user and group, mode 0660, in the
  /// folder of named ports, which must exist. Throws Failure where they are published already, by
  /// whomever.
  void start();
  /// Takes the ports back, with what is queued there, and closes all connections. Throws Failure
  /// where they are not published.
  void stop();

  /// Leaves everything unread and unanswered. Throws Failure where nothing is published.
  void pause();
  /// Ends that; what came meanwhile is read now. Throws Failure likewise.
  void resume();

  /// What later civic-info calls are answered with; (0, 0) at the start.
  void answerWith(std::int32_t domain, std::int32_t code);
  /// Sends a notification over every open connection, and once more before the next answer.
  void notify();

  /// Reads everything that is queued now, unless paused. What was sent before the call is in
  /// entries() afterwards.
  void drain();

  /// Every message since the handset's start, in the order of reading.
  [[nodiscard]] const std::vector<TelephonyEntry>& entries() const { return entries_; }

  /// Called after new entries came.
  void onMessage(std::function<void()> action) { changed_ = std::move(action); }

 private:
  struct Port {
    std::string name;
    platform::FileDescriptor socket;
    EventLoop::Ticket watch = 0;
  };
  struct Connection {
    platform::FileDescriptor socket;
    EventLoop::Ticket watch = 0;
  };

  void publish(const char* name);
  void unpublish();
  void requirePublished() const;
  void watchEverything();
  void forgetEverything();
  void watchConnection(unsigned number);
  void drainPort(const Port& port);
  void drainConnection(unsigned number);
  void closeConnection(unsigned number);
  void openConnection(platform::FileDescriptor right, TelephonyEntry& entry);
  void answerCivicCall(const Connection& connection);
  void keep(TelephonyEntry entry);

  EventLoop& loop_;
  std::vector<Port> ports_;                     ///< Empty while not published.
  std::map<unsigned, Connection> connections_;  ///< By number, which is never used again.
  unsigned lastConnection_ = 0;
  bool isPaused_ = false;
  bool isNotificationDue_ = false;
  std::int32_t answerDomain_ = 0;
  std::int32_t answerCode_ = 0;
  std::vector<TelephonyEntry> entries_;
  std::function<void()> changed_;
};

}  // namespace handset
