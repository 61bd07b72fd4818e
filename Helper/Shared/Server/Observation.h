// SPDX-License-Identifier: Apache-2.0
//
// Answers to "why is it still running?" and "what is it doing?": which clients are connected, which
// work tokens are out since when, when the idle exit is due, and each message as it is served. The
// observers' socket takes no request and changes nothing of what the service does. Main thread; the
// tables are guarded by the server's lock, because work tokens come and go on any thread.
#pragma once

#include <array>
#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "Helper/Platform/MigSource.h"
#include "Helper/Platform/ObserverChannel.h"
#include "Helper/Platform/RunLoop.h"

struct HelperServer;

class Observation {
 public:
  /// Opens the observers' socket at `path` for `server`; null when it cannot be opened. Main
  /// thread, whose loop serves it. One at a time in a process.
  [[nodiscard]] static std::unique_ptr<Observation> Open(HelperServer& server,
                                                         const std::string& path);
  ~Observation();
  Observation(const Observation&) = delete;
  Observation& operator=(const Observation&) = delete;

  // With the server's lock held:
  void noteClient(PortName privatePort, const wire::AuditToken& client);
  void forgetClient(PortName privatePort);
  /// A token handed out twice keeps its first owner.
  void noteWorkToken(std::uint32_t token);
  void forgetWorkToken(std::uint32_t token);

 private:
  struct Client {
    std::uint32_t process;
    std::uint32_t user;
    platform::TimePoint since;
    std::uint64_t requests = 0;
    std::int32_t lastRequest = 0;
    KernReturn lastCode = KERN_SUCCESS;
  };
  struct WorkToken {
    std::string owner;  // empty: the token is not out
    platform::TimePoint since;
  };

  Observation(HelperServer& server, platform::RunLoop& loop) : server_(server), loop_(loop) {}
  void noteServed(const platform::ServedMessage& message);
  [[nodiscard]] std::vector<std::byte> snapshot() const;

  HelperServer& server_;
  platform::RunLoop& loop_;
  std::map<PortName, Client> clients_;
  std::array<WorkToken, 32> workTokens_;
  std::unique_ptr<platform::ObserverChannel> channel_;
};
