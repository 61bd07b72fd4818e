// SPDX-License-Identifier: Apache-2.0
//
// The C interface apart from the wire: options, null arguments, error texts, ownership.
#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <string>

#include "Tests/Client/ConnectedClient.h"

namespace {

using fake::ConnectedClient;

TEST(CInterface, HasTheLayoutOfVersionOne) {
  EXPECT_EQ(hvmh_abi_version(), 1);
  EXPECT_EQ(sizeof(hvmh_error), 32U);
  EXPECT_EQ(offsetof(hvmh_error, return_code), 4U);
  EXPECT_EQ(offsetof(hvmh_error, system_error), 8U);
  EXPECT_EQ(offsetof(hvmh_options, flags), 4U);
  EXPECT_EQ(offsetof(hvmh_options, connect_timeout_ms), 8U);
  EXPECT_EQ(offsetof(hvmh_options, request_timeout_ms), 12U);
  EXPECT_EQ(offsetof(hvmh_options, service_path), 16U);
  EXPECT_EQ(HVMH_SYSTEM_ERROR, 12) << "the last value of version 1";
}

TEST(Options, HaveTheDocumentedDefaults) {
  hvmh_options options;
  std::memset(&options, 0xff, sizeof options);
  hvmh_options_init(&options, sizeof options);
  EXPECT_EQ(options.size, sizeof options);
  EXPECT_EQ(options.flags, 0U);
  EXPECT_EQ(options.connect_timeout_ms, 10000U);
  EXPECT_EQ(options.request_timeout_ms, 60000U);
  EXPECT_EQ(options.service_path, nullptr);
}

TEST(Options, AreNeverWrittenBeyondTheCallersSize) {
  std::array<unsigned char, sizeof(hvmh_options) + 8> memory;
  memory.fill(0xee);
  hvmh_options_init(reinterpret_cast<hvmh_options*>(memory.data()), 12);
  EXPECT_EQ(memory[11], 0x00);
  EXPECT_EQ(memory[12], 0xee);
}

TEST(Options, ThatThisLibraryDoesNotKnowAreRefused) {
  hvmh_options options;
  hvmh_client* client = nullptr;
  hvmh_options_init(&options, sizeof options);
  options.flags = 2;
  EXPECT_EQ(hvmh_client_open(&options, &client, nullptr), HVMH_INVALID_ARGUMENT);
  hvmh_options_init(&options, sizeof options);
  options.size += 8;
  EXPECT_EQ(hvmh_client_open(&options, &client, nullptr), HVMH_INVALID_ARGUMENT);
  options.size = 0;
  EXPECT_EQ(hvmh_client_open(&options, &client, nullptr), HVMH_INVALID_ARGUMENT);
  EXPECT_EQ(client, nullptr);
}

TEST(NullArguments, AreRefusedWithoutAnExchange) {
  ConnectedClient client;
  void* value = nullptr;
  size_t size = 0;
  bool flag = false;
  EXPECT_EQ(hvmh_client_open(nullptr, nullptr, nullptr), HVMH_INVALID_ARGUMENT);
  EXPECT_EQ(hvmh_client_reconnect(nullptr, nullptr), HVMH_INVALID_ARGUMENT);
  EXPECT_EQ(hvmh_clear_voicemail_token(nullptr, nullptr), HVMH_INVALID_ARGUMENT);
  EXPECT_EQ(hvmh_is_voicemail_subscribed(nullptr, &flag, nullptr), HVMH_INVALID_ARGUMENT);
  EXPECT_EQ(hvmh_set_voicemail_token(client.get(), nullptr, nullptr), HVMH_INVALID_ARGUMENT);
  EXPECT_EQ(hvmh_copy_voicemail_token(client.get(), nullptr, nullptr), HVMH_INVALID_ARGUMENT);
  EXPECT_EQ(hvmh_is_voicemail_subscribed(client.get(), nullptr, nullptr), HVMH_INVALID_ARGUMENT);
  EXPECT_EQ(hvmh_copy_preference_value(client.get(), "d", "k", nullptr, &size, nullptr),
            HVMH_INVALID_ARGUMENT);
  EXPECT_EQ(hvmh_copy_preference_value(client.get(), "d", "k", &value, nullptr, nullptr),
            HVMH_INVALID_ARGUMENT);
  EXPECT_EQ(hvmh_set_preference_value(client.get(), "d", "k", nullptr, 1, nullptr),
            HVMH_INVALID_ARGUMENT);
  EXPECT_FALSE(hvmh_client_is_connected(nullptr));
  EXPECT_EQ(hvmh_client_descriptor(nullptr), -1);
  hvmh_client_close(nullptr);
  hvmh_free(nullptr);
  EXPECT_TRUE(hvmh_client_is_connected(client.get()));
}

TEST(ErrorDetails, AreFilledOnSuccessToo) {
  ConnectedClient client;
  client.willAnswer(fake::PlainReply(0x848083, 0));
  hvmh_error error;
  std::memset(&error, 0xff, sizeof error);
  EXPECT_EQ(hvmh_clear_voicemail_token(client.get(), &error), HVMH_OK);
  constexpr hvmh_error kNone{};
  EXPECT_EQ(std::memcmp(&error, &kNone, sizeof error), 0);
}

TEST(ErrorTexts, NameTheCodeOrTheSystemError) {
  std::array<char, 200> text{};
  const hvmh_error failure{HVMH_RETURN_CODE, 5, 0, {}};
  const std::string expected = "the helper answered with a failure, code 5 (KERN_FAILURE)";
  EXPECT_EQ(hvmh_error_describe(&failure, text.data(), text.size()), expected.size());
  EXPECT_EQ(text.data(), expected);
  const hvmh_error absent{HVMH_NOT_RUNNING, 0, 2, {}};
  (void)hvmh_error_describe(&absent, text.data(), text.size());
  EXPECT_STREQ(text.data(),
               "the helper's service is not running: No such file or directory (ENOENT)");
}

TEST(ErrorTexts, AreCutToTheCallersMemory) {
  std::array<char, 8> text{};
  const hvmh_error gone{HVMH_HELPER_GONE, 0, 0, {}};
  EXPECT_EQ(hvmh_error_describe(&gone, text.data(), text.size()), 20U);
  EXPECT_STREQ(text.data(), "the hel");
  EXPECT_EQ(hvmh_error_describe(&gone, nullptr, 0), 20U);
  EXPECT_EQ(hvmh_error_describe(nullptr, text.data(), text.size()), 0U);
}

TEST(ErrorTexts, ExistForEveryStatus) {
  for (hvmh_status status = HVMH_OK; status <= HVMH_SYSTEM_ERROR; ++status) {
    EXPECT_STRNE(hvmh_status_text(status), "unknown status") << status;
  }
  EXPECT_STREQ(hvmh_status_text(13), "unknown status");
  EXPECT_STREQ(hvmh_return_code_name(8), "KERN_NO_ACCESS");
  EXPECT_STREQ(hvmh_return_code_name(1234), "unknown code");
}

}  // namespace
