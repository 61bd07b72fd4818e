// SPDX-License-Identifier: Apache-2.0
//
// A whole server inside the test: real sockets, a run loop on a manual clock, fakes for the system
// log, for caller security and for the voicemail tokens.
#pragma once

#include <gtest/gtest.h>

#include <memory>

#include "Helper/Platform/RunLoop.h"
#include "Helper/Shared/Interface/Connect.h"
#include "Helper/Shared/Server/CallerEntitlement.h"
#include "Helper/Shared/Server/HelperServerUtils.h"
#include "Helper/Shared/Server/RequestCatalogue.h"
#include "Tests/Fakes/FakeCallerSecurity.h"
#include "Tests/Fakes/FakeSystemLog.h"
#include "Tests/Fakes/FakeVoicemailTokenStore.h"
#include "Tests/Fakes/ManualClock.h"
#include "Tests/Support/WireClient.h"

namespace support {

class ServerFixture : public ::testing::Test {
 protected:
  ServerFixture() { security.grant(wire::kRequiredEntitlement); }
  ~ServerFixture() override {
    if (server) HelperServerDestroy(server);
    // Grants outlive servers, as they do in the process; every test begins without any.
    HandleProcessExit(::getpid());
  }

  void start(const platform::MigSubsystem* subsystem = &RequestSubsystem()) {
    server = HelperServerCreate(wire::kServiceName, subsystem);
    ASSERT_NE(server, nullptr);
    server->runLoop = &loop;
  }

  /// Serves everything that is ready.
  void pump() {
    for (int turn = 0; turn < 100'000; ++turn) {
      if (loop.run(0) != platform::RunResult::kHandledSource) return;
    }
    FAIL() << "the loop does not come to rest";
  }

  /// A client that has been let in.
  std::unique_ptr<WireClient> connect() {
    auto client = std::make_unique<WireClient>(launcher.path());
    client->sendConnect();
    pump();
    const Bytes reply = client->takeConnectReply();
    EXPECT_EQ(reply.size(), 40U);
    EXPECT_TRUE(client->privatePort);
    return client;
  }

  /// Sends one request and takes its reply.
  Packet request(const WireClient& client, const Bytes& bytes,
                 const std::vector<int>& descriptors = {}) {
    EXPECT_EQ(SendPacket(client.privatePort.get(), bytes, descriptors), 0);
    pump();
    return ReceivePacket(client.privatePort.get());
  }

  [[nodiscard]] bool idleTimerIsArmed() const {
    const std::lock_guard guard(server->lock);
    return server->idleTimer != nullptr;
  }

  fakes::ManualClock clock;
  platform::RunLoop loop{clock};
  platform::ScopedCurrentRunLoop current{loop};
  fakes::FakeSystemLog log;
  platform::ScopedReplacement<platform::SystemLog> logReplacement{log};
  fakes::FakeCallerSecurity security;
  platform::ScopedReplacement<platform::CallerSecurity> securityReplacement{security};
  fakes::FakeVoicemailTokenStore tokens;
  platform::ScopedReplacement<platform::VoicemailTokenStore> tokensReplacement{tokens};
  LauncherSocket launcher{wire::kServiceName};
  HelperServer* server = nullptr;
};

}  // namespace support
