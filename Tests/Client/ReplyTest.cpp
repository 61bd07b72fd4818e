// SPDX-License-Identifier: Apache-2.0
//
// Replies as literal bytes: what the client takes out of them and what it refuses.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <unistd.h>

#include <climits>
#include <string>

#include "Tests/Client/ConnectedClient.h"

namespace {

using fake::Bytes;
using fake::ConnectedClient;
using fake::DataReply;
using fake::Hex;
using fake::PlainReply;

constexpr std::uint32_t kClearReply = 0x848083;
constexpr std::uint32_t kFlagReply = 0x84808d;
constexpr std::uint32_t kValueReply = 0x848088;

Bytes FlagReply(const char* flag) {
  Bytes reply = PlainReply(kFlagReply, 0) + Hex(flag);
  reply.at(4) = 40;
  return reply;
}

/// The outcome of a request without results that is answered with `reply`.
hvmh_error Clear(const Bytes& reply) {
  ConnectedClient client;
  client.willAnswer(reply);
  hvmh_error error;
  (void)hvmh_clear_voicemail_token(client.get(), &error);
  EXPECT_EQ(hvmh_client_is_connected(client.get()), error.status != HVMH_PROTOCOL_VIOLATION);
  return error;
}

/// The outcome of a request for data that is answered with `reply`.
hvmh_error Copy(const Bytes& reply, const std::vector<int>& descriptors = {},
                std::string* content = nullptr) {
  ConnectedClient client;
  client.willAnswer(reply, descriptors);
  hvmh_error error;
  void* value = &error;  // the call must clear it
  size_t size = 1;
  (void)hvmh_copy_preference_value(client.get(), "d", "k", &value, &size, &error);
  if (error.status != HVMH_OK) {
    EXPECT_EQ(value, nullptr);
    EXPECT_EQ(size, 0U);
  }
  if (content != nullptr) *content = std::string(static_cast<const char*>(value), size);
  hvmh_free(value);
  EXPECT_EQ(hvmh_client_is_connected(client.get()), error.status != HVMH_PROTOCOL_VIOLATION);
  return error;
}

TEST(Reply, GivesTheReturnCodeAsItIs) {
  for (const std::int32_t code : {5, 8, 9, -300, -303, -304, INT_MIN}) {
    const hvmh_error error = Clear(PlainReply(kClearReply, code));
    EXPECT_EQ(error.status, HVMH_RETURN_CODE);
    EXPECT_EQ(error.return_code, code);
    EXPECT_EQ(error.system_error, 0);
  }
  EXPECT_EQ(Clear(PlainReply(kClearReply, 35)).status, HVMH_REFUSED);
}

TEST(Reply, ReadsAFlagFromTheLowestByteAlone) {
  for (const auto& [bytes, expected] : {std::pair{"01000000", true},
                                        {"02ffffff", true},
                                        {"00ffffff", false},
                                        {"00000000", false}}) {
    ConnectedClient client;
    client.willAnswer(FlagReply(bytes));
    bool flag = !expected;
    EXPECT_EQ(hvmh_is_voicemail_subscribed(client.get(), &flag, nullptr), HVMH_OK);
    EXPECT_EQ(flag, expected) << bytes;
  }
}

TEST(Reply, EndsATextAtItsSlotWhenTheZeroIsMissing) {
  ConnectedClient client;
  Bytes reply = PlainReply(0x848094, 0) + fake::Slot(64, std::string(64, 'c'));
  reply.at(4) = 100;
  client.willAnswer(reply);
  char* code = nullptr;
  EXPECT_EQ(hvmh_copy_country_code(client.get(), &code, nullptr), HVMH_OK);
  EXPECT_EQ(std::string(code), std::string(64, 'c'));
  hvmh_free(code);
}

TEST(Reply, WithoutResultsIsRefusedUnlessItIsExact) {
  const fake::DescriptorBalance balance;
  Bytes wrongSize = PlainReply(kClearReply, 0);
  wrongSize.at(4) = 37;
  Bytes complex = PlainReply(kClearReply, 0);
  complex.at(3) = 0x80;
  for (const Bytes& reply :
       {Bytes(1, 0), Bytes(24, 0), Bytes(35, 0), PlainReply(kClearReply + 1, 0), wrongSize, complex,
        PlainReply(kClearReply, 0) + Bytes(4, 0), PlainReply(kClearReply, 5) + Bytes(4, 0),
        PlainReply(kClearReply, 0) + Bytes(100000, 0)}) {
    EXPECT_EQ(Clear(reply).status, HVMH_PROTOCOL_VIOLATION) << fake::ToHex(reply).substr(0, 100);
  }
}

TEST(Reply, WithResultsIsRefusedUnlessItIsExact) {
  const Bytes good = FlagReply("01000000");
  Bytes withCode = good;
  withCode.at(32) = 5;
  for (const Bytes& reply : {PlainReply(kFlagReply, 0), withCode, good + Bytes(1, 0),
                             Bytes(good.begin(), good.end() - 1)}) {
    ConnectedClient client;
    client.willAnswer(reply);
    bool flag = true;
    EXPECT_EQ(hvmh_is_voicemail_subscribed(client.get(), &flag, nullptr), HVMH_PROTOCOL_VIOLATION);
    EXPECT_FALSE(flag);
  }
}

TEST(Reply, IsFoundBehindEmptyPackets) {
  ConnectedClient client;
  client.willAnswer({});
  client.willAnswer({});
  client.willAnswer(PlainReply(kClearReply, 0));
  EXPECT_EQ(hvmh_clear_voicemail_token(client.get(), nullptr), HVMH_OK);
}

TEST(Reply, DropsDescriptorsThatNobodyAnnounced) {
  const fake::DescriptorBalance balance;
  const auto memory = fake::MakeMemory({1, 2, 3}, fake::kAllSeals);
  ConnectedClient client;
  client.willAnswer(PlainReply(kClearReply, 0), {memory.get(), memory.get(), memory.get()});
  EXPECT_EQ(hvmh_clear_voicemail_token(client.get(), nullptr), HVMH_OK);
  client.willAnswer(PlainReply(kValueReply, 5), {memory.get(), memory.get(), memory.get()});
  void* value = nullptr;
  size_t size = 0;
  EXPECT_EQ(hvmh_copy_preference_value(client.get(), "d", "k", &value, &size, nullptr),
            HVMH_RETURN_CODE);
}

TEST(DataReply, BringsBytesBehindTheMessage) {
  std::string content;
  EXPECT_EQ(Copy(DataReply(kValueReply, 0, 4) + fake::Text("<a/>"), {}, &content).status, HVMH_OK);
  EXPECT_EQ(content, "<a/>");
  const std::string large(131072, 'z');
  EXPECT_EQ(Copy(DataReply(kValueReply, 0, 131072) + fake::Text(large), {}, &content).status,
            HVMH_OK);
  EXPECT_TRUE(content == large);
}

TEST(DataReply, MayBeEmpty) {
  std::string content = "unchanged";
  EXPECT_EQ(Copy(DataReply(kValueReply, 0, 0), {}, &content).status, HVMH_OK);
  EXPECT_EQ(content, "");
}

TEST(DataReply, BringsBytesInSealedMemory) {
  const fake::DescriptorBalance balance;
  const Bytes value(200000, 0x42);
  const auto memory = fake::MakeMemory(value, fake::kAllSeals);
  ASSERT_EQ(::lseek(memory.get(), 77, SEEK_SET), 77);
  std::string content;
  EXPECT_EQ(Copy(DataReply(kValueReply, 1, 200000), {memory.get()}, &content).status, HVMH_OK);
  EXPECT_TRUE(content == std::string(200000, 0x42));
  EXPECT_EQ(::lseek(memory.get(), 0, SEEK_CUR), 77) << "the offset belongs to the helper too";
}

TEST(DataReply, RefusesMemoryThatTheHelperCouldStillChange) {
  const fake::DescriptorBalance balance;
  const Bytes value(200000, 0x42);
  for (const int seals : {0, 2 | 4, 2 | 8, 4 | 8, 2 | 4 | 16}) {
    const auto memory = fake::MakeMemory(value, seals);
    EXPECT_EQ(Copy(DataReply(kValueReply, 1, 200000), {memory.get()}).status,
              HVMH_PROTOCOL_VIOLATION)
        << "seals " << seals;
  }
}

TEST(DataReply, RefusesMemoryOfAnotherSize) {
  const fake::DescriptorBalance balance;
  const auto memory = fake::MakeMemory(Bytes(200000, 0x42), fake::kAllSeals);
  for (const std::uint32_t size : {199999U, 200001U, 0U, 16777217U, 0xffffffffU}) {
    EXPECT_EQ(Copy(DataReply(kValueReply, 1, size), {memory.get()}).status, HVMH_PROTOCOL_VIOLATION)
        << size;
  }
}

TEST(DataReply, RefusesWhatIsNoMemory) {
  const fake::DescriptorBalance balance;
  const fake::FileDescriptor file(::open("/proc/self/exe", O_RDONLY | O_CLOEXEC));
  const auto pair = fake::MakePair(SOCK_STREAM);
  for (const int descriptor : {file.get(), pair.first.get()}) {
    EXPECT_EQ(Copy(DataReply(kValueReply, 1, 200000), {descriptor}).status,
              HVMH_PROTOCOL_VIOLATION);
  }
  EXPECT_EQ(Copy(DataReply(kValueReply, 1, 200000)).status, HVMH_PROTOCOL_VIOLATION)
      << "no descriptor at all";
}

TEST(DataReply, RefusesFieldsThatContradictOneAnother) {
  const fake::DescriptorBalance balance;
  const Bytes good = DataReply(kValueReply, 0, 4) + fake::Text("<a/>");
  const auto changed = [&](std::size_t offset, std::uint8_t value) {
    Bytes bytes = good;
    bytes.at(offset) = value;
    return bytes;
  };
  const Bytes plainSuccess = PlainReply(kValueReply, 0);
  Bytes plainOfFullSize = good;
  plainOfFullSize.at(3) = 0;
  for (const Bytes& reply :
       {changed(4, 57), changed(20, 0x87), changed(24, 0), changed(24, 2), changed(28, 2),
        changed(31, 1), changed(39, 0), changed(40, 5), changed(52, 5), good + Bytes(1, 0),
        Bytes(good.begin(), good.end() - 1), Bytes(good.begin(), good.begin() + 50), plainSuccess,
        plainOfFullSize, DataReply(kValueReply, 0, 131073) + Bytes(131073, 1)}) {
    EXPECT_EQ(Copy(reply).status, HVMH_PROTOCOL_VIOLATION) << fake::ToHex(reply).substr(0, 112);
  }
}

TEST(DataReply, ReportsTheDescriptorLimitAndStaysConnected) {
  const fake::DescriptorBalance balance;
  ConnectedClient client;
  const auto memory = fake::MakeMemory(Bytes(200000, 0x42), fake::kAllSeals);
  client.willAnswer(DataReply(kValueReply, 1, 200000), {memory.get()});
  rlimit before{};
  ASSERT_EQ(::getrlimit(RLIMIT_NOFILE, &before), 0);
  rlimit none = before;
  none.rlim_cur = 0;
  ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &none), 0);
  hvmh_error error;
  void* value = nullptr;
  size_t size = 0;
  (void)hvmh_copy_preference_value(client.get(), "d", "k", &value, &size, &error);
  ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &before), 0);
  EXPECT_EQ(error.status, HVMH_SYSTEM_ERROR);
  EXPECT_EQ(error.system_error, EMFILE);
  client.willAnswer(PlainReply(kClearReply, 0));
  EXPECT_EQ(hvmh_clear_voicemail_token(client.get(), nullptr), HVMH_OK);
}

}  // namespace
