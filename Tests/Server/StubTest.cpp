// SPDX-License-Identifier: Apache-2.0
//
// What a stub writes into the reply and what it leaves alone, called with messages in memory: over
// a port the dispatcher has prepared the reply, and who wrote what can no longer be told.
#include <semaphore>

#include "Helper/LASD/LASDUpdater.h"
#include "Tests/Fakes/FakeHttpTransport.h"
#include "Tests/Fakes/FakeMessagePorts.h"
#include "Tests/Fakes/FakePreferencesStore.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using support::Bytes;
using support::Get;
using support::Put;

constexpr std::int32_t kClearVoicemailToken = 8683551;
constexpr std::int32_t kSetPreferenceValue = 8683555;
constexpr std::int32_t kCopyPreferenceValue = 8683556;
constexpr std::int32_t kTriggerDatabaseUpdate = 8683563;

class Stub : public support::ServerFixture {
 protected:
  /// The reply's 56 bytes, 0x55 each before the stub of `request` ran.
  static Bytes call(Bytes request) {
    Bytes reply(platform::kMaxReplySize, 0x55);
    auto* message = reinterpret_cast<std::byte*>(request.data());
    const auto header = wire::Load<wire::MessageHeader>(message);
    RequestSubsystem().demultiplex(header)(message, reinterpret_cast<std::byte*>(reply.data()));
    reply.resize(56);
    return reply;
  }
  static Bytes ndrOf(const Bytes& reply) { return {reply.begin() + 24, reply.begin() + 32}; }

  const Bytes untouched = Bytes(8, 0x55);
  const Bytes ndrRecord{0, 0, 0, 0, 1, 0, 0, 0};
  fakes::FakePreferencesStore store;
  platform::ScopedReplacement<platform::PreferencesStore> storeReplacement{store};
  fakes::FakeMessagePorts ports;
  platform::ScopedReplacement<platform::MessagePorts> portsReplacement{ports};
  fakes::FakeHttpTransport web;
  platform::ScopedReplacement<vlu::Http::HttpTransport> webReplacement{web};
};

TEST_F(Stub, OfTheDatabaseUpdateLeavesTheNdrRecordToTheDispatcherOnSuccess) {
  const Bytes reply = call(support::Message(kTriggerDatabaseUpdate, 36));
  std::binary_semaphore ended(0);
  lasdUpdater->post([&] { ended.release(); });
  ended.acquire();
  EXPECT_EQ(Get<std::int32_t>(reply, 32), 0);
  EXPECT_EQ(ndrOf(reply), untouched);
}

TEST_F(Stub, OfAnyOtherRequestWritesTheNdrRecordOnSuccess) {
  const Bytes reply = call(support::Message(kClearVoicemailToken, 24));
  EXPECT_EQ(Get<std::int32_t>(reply, 32), 0);
  EXPECT_EQ(ndrOf(reply), ndrRecord);
}

TEST_F(Stub, OfEveryRequestWritesTheNdrRecordWithAnErrorOfItsOwn) {
  for (std::int32_t id = 8683549; id < 8683572; ++id) {
    Bytes request = support::Message(id, 24);
    if (id != kSetPreferenceValue) Put(request, 0, 0x80000000U);
    const Bytes reply = call(request);
    EXPECT_EQ(Get<std::int32_t>(reply, 32), -304) << id;
    EXPECT_EQ(ndrOf(reply), ndrRecord) << id;
  }
}

TEST_F(Stub, WithDataStoresTheDescriptorsFlagsAlsoWhenTheRoutineFails) {
  Bytes request = support::Message(kCopyPreferenceValue, 544);
  request[32] = 0xff;  // no UTF-8
  const Bytes reply = call(request);
  EXPECT_EQ(Get<std::int32_t>(reply, 32), 5);
  EXPECT_EQ((Bytes{reply.begin() + 36, reply.begin() + 40}), (Bytes{1, 1, 0, 1}));
  EXPECT_EQ((Bytes{reply.begin() + 40, reply.end()}), Bytes(16, 0x55)) << "nothing behind them";
}

}  // namespace
