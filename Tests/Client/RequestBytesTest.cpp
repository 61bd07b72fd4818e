// SPDX-License-Identifier: Apache-2.0
//
// The bytes of each of the 23 requests, typed by hand: size, id, where each argument stands.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>
#include <string>

#include "Tests/Client/ConnectedClient.h"

namespace {

using fake::Bytes;
using fake::ConnectedClient;
using fake::Hex;
using fake::Packet;
using fake::Slot;
using fake::Text;
using fake::ToHex;

/// What stands before the arguments of a request that has some.
const char* const kNdr = "00000000 01000000";

/// Bits, size, three unused ports, id.
Bytes Header(const char* bits, const char* size, const char* id) {
  return Hex(bits) + Hex(size) + fake::Zeros(12) + Hex(id);
}

/// A plain request: header, NDR record, arguments.
Bytes Plain(const char* size, const char* id, const Bytes& arguments) {
  return Header("00000000", size, id) + Hex(kNdr) + arguments;
}

/// A successful reply with `results` behind the return code.
Bytes Success(const char* size, const char* id, const Bytes& results = {}) {
  return Header("00000000", size, id) + Hex(kNdr) + Hex("00000000") + results;
}

void ExpectRequest(ConnectedClient& client, const Bytes& expected) {
  const Packet packet = client.request();
  EXPECT_EQ(packet.bytes.size(), expected.size());
  EXPECT_EQ(ToHex(packet.bytes), ToHex(expected));
  EXPECT_TRUE(packet.descriptors.empty());
}

TEST(RequestBytes, SetVoicemailToken) {
  ConnectedClient client;
  client.willAnswer(Success("24000000", "81808400"));
  EXPECT_EQ(hvmh_set_voicemail_token(client.get(), "t0ken", nullptr), HVMH_OK);
  ExpectRequest(client, Plain("20010000", "1d808400", Slot(256, "t0ken")));
}

TEST(RequestBytes, SetVoicemailTokenForKey) {
  ConnectedClient client;
  client.willAnswer(Success("24000000", "82808400"));
  EXPECT_EQ(hvmh_set_voicemail_token_for_key(client.get(), "key", "token", nullptr), HVMH_OK);
  ExpectRequest(client, Plain("20020000", "1e808400", Slot(256, "key") + Slot(256, "token")));
}

TEST(RequestBytes, ClearVoicemailToken) {
  ConnectedClient client;
  client.willAnswer(Success("24000000", "83808400"));
  EXPECT_EQ(hvmh_clear_voicemail_token(client.get(), nullptr), HVMH_OK);
  ExpectRequest(client, Header("00000000", "18000000", "1f808400"));
}

TEST(RequestBytes, ResetVoicemailRecords) {
  ConnectedClient client;
  client.willAnswer(Success("24000000", "84808400"));
  EXPECT_EQ(hvmh_reset_voicemail_records(client.get(), nullptr), HVMH_OK);
  ExpectRequest(client, Header("00000000", "18000000", "20808400"));
}

TEST(RequestBytes, CopyVoicemailTokenForKey) {
  ConnectedClient client;
  client.willAnswer(Success("24010000", "85808400", Slot(256, "of the key")));
  char* token = nullptr;
  EXPECT_EQ(hvmh_copy_voicemail_token_for_key(client.get(), "key", &token, nullptr), HVMH_OK);
  EXPECT_STREQ(token, "of the key");
  hvmh_free(token);
  ExpectRequest(client, Plain("20010000", "21808400", Slot(256, "key")));
}

TEST(RequestBytes, CopyVoicemailToken) {
  ConnectedClient client;
  client.willAnswer(Success("24010000", "86808400", Slot(256, "t0ken")));
  char* token = nullptr;
  EXPECT_EQ(hvmh_copy_voicemail_token(client.get(), &token, nullptr), HVMH_OK);
  EXPECT_STREQ(token, "t0ken");
  hvmh_free(token);
  ExpectRequest(client, Header("00000000", "18000000", "22808400"));
}

TEST(RequestBytes, SetPreferenceValue) {
  ConnectedClient client;
  client.willAnswer(Success("24000000", "87808400"));
  EXPECT_EQ(hvmh_set_preference_value(client.get(), "dom", "key", "value", 5, nullptr), HVMH_OK);
  ExpectRequest(client, Header("00000080", "38020000", "23808400") +
                            Hex("01000000"
                                "0000000000000000 00010001 05000000") +
                            Hex(kNdr) + Slot(256, "dom") + Slot(256, "key") + Hex("05000000") +
                            Text("value"));
}

TEST(RequestBytes, CopyPreferenceValue) {
  ConnectedClient client;
  client.willAnswer(fake::DataReply(0x848088, 0, 5) + Text("<xml>"));
  void* value = nullptr;
  size_t size = 0;
  EXPECT_EQ(hvmh_copy_preference_value(client.get(), "dom", "key", &value, &size, nullptr),
            HVMH_OK);
  EXPECT_EQ(std::string(static_cast<const char*>(value), size), "<xml>");
  hvmh_free(value);
  ExpectRequest(client, Plain("20020000", "24808400", Slot(256, "dom") + Slot(256, "key")));
}

TEST(RequestBytes, CopyAppPreferenceValue) {
  ConnectedClient client;
  client.willAnswer(fake::DataReply(0x848089, 0, 5) + Text("<xml>"));
  void* value = nullptr;
  size_t size = 0;
  EXPECT_EQ(hvmh_copy_app_preference_value(client.get(), "dom", "key", &value, &size, nullptr),
            HVMH_OK);
  EXPECT_EQ(std::string(static_cast<const char*>(value), size), "<xml>");
  hvmh_free(value);
  ExpectRequest(client, Plain("20020000", "25808400", Slot(256, "dom") + Slot(256, "key")));
}

TEST(RequestBytes, SetCarrierBundleLink) {
  ConnectedClient client;
  client.willAnswer(Success("24000000", "8a808400"));
  EXPECT_EQ(hvmh_set_carrier_bundle_link(client.get(), "/target", "/link", "dom", nullptr),
            HVMH_OK);
  ExpectRequest(client, Plain("200c0000", "26808400",
                              Slot(1024, "/target") + Slot(1024, "/link") + Slot(1024, "dom")));
}

TEST(RequestBytes, CreateSymlink) {
  ConnectedClient client;
  client.willAnswer(Success("24000000", "8b808400"));
  EXPECT_EQ(hvmh_create_symlink(client.get(), "/target", "/link", nullptr), HVMH_OK);
  ExpectRequest(client, Plain("20080000", "27808400", Slot(1024, "/target") + Slot(1024, "/link")));
}

TEST(RequestBytes, RemoveCarrierBundleLink) {
  ConnectedClient client;
  client.willAnswer(Success("24000000", "8c808400"));
  EXPECT_EQ(hvmh_remove_carrier_bundle_link(client.get(), "/link", "dom", nullptr), HVMH_OK);
  ExpectRequest(client, Plain("20080000", "28808400", Slot(1024, "/link") + Slot(1024, "dom")));
}

TEST(RequestBytes, IsVoicemailSubscribed) {
  ConnectedClient client;
  client.willAnswer(Success("28000000", "8d808400", Hex("01000000")));
  bool subscribed = false;
  EXPECT_EQ(hvmh_is_voicemail_subscribed(client.get(), &subscribed, nullptr), HVMH_OK);
  EXPECT_TRUE(subscribed);
  ExpectRequest(client, Header("00000000", "18000000", "29808400"));
}

TEST(RequestBytes, TriggerHeartbeat) {
  ConnectedClient client;
  client.willAnswer(Success("24000000", "8e808400"));
  EXPECT_EQ(hvmh_trigger_heartbeat(client.get(), -2, nullptr), HVMH_OK);
  ExpectRequest(client, Plain("24000000", "2a808400", Hex("feffffff")));
}

TEST(RequestBytes, TriggerDatabaseUpdate) {
  ConnectedClient client;
  client.willAnswer(Success("24000000", "8f808400"));
  EXPECT_EQ(hvmh_trigger_database_update(client.get(), 0x80000005, nullptr), HVMH_OK);
  ExpectRequest(client, Plain("24000000", "2b808400", Hex("05000080")));
}

TEST(RequestBytes, CopyFile) {
  ConnectedClient client;
  client.willAnswer(Success("28000000", "90808400", Hex("01000000")));
  bool success = false;
  EXPECT_EQ(hvmh_copy_file(client.get(), "/from", "/to", "name", &success, nullptr), HVMH_OK);
  EXPECT_TRUE(success);
  ExpectRequest(client, Plain("20030000", "2c808400",
                              Slot(256, "/from") + Slot(256, "/to") + Slot(256, "name")));
}

TEST(RequestBytes, CopyCrashLogs) {
  ConnectedClient client;
  client.willAnswer(Success("28000000", "91808400", Hex("01000000")));
  bool success = false;
  EXPECT_EQ(hvmh_copy_crash_logs(client.get(), "/from", &success, nullptr), HVMH_OK);
  EXPECT_TRUE(success);
  ExpectRequest(client, Plain("20010000", "2d808400", Slot(256, "/from")));
}

TEST(RequestBytes, MoveCarrierBundles) {
  ConnectedClient client;
  client.willAnswer(Success("28000000", "92808400", Hex("00000000")));
  bool success = true;
  EXPECT_EQ(hvmh_move_carrier_bundles(client.get(), "/from", "/to", "name", &success, nullptr),
            HVMH_OK);
  EXPECT_FALSE(success);
  ExpectRequest(client, Plain("20030000", "2e808400",
                              Slot(256, "/from") + Slot(256, "/to") + Slot(256, "name")));
}

TEST(RequestBytes, RequestCountryCodeFromLocation) {
  ConnectedClient client;
  client.willAnswer(Success("24000000", "93808400"));
  EXPECT_EQ(hvmh_request_country_code_from_location(client.get(), 52.5, -13.25, nullptr), HVMH_OK);
  ExpectRequest(client, Plain("30000000", "2f808400", Hex("0000000000404a40 0000000000802ac0")));
}

TEST(RequestBytes, CopyCountryCode) {
  ConnectedClient client;
  client.willAnswer(Success("64000000", "94808400", Slot(64, "de")));
  char* code = nullptr;
  EXPECT_EQ(hvmh_copy_country_code(client.get(), &code, nullptr), HVMH_OK);
  EXPECT_STREQ(code, "de");
  hvmh_free(code);
  ExpectRequest(client, Header("00000000", "18000000", "30808400"));
}

TEST(RequestBytes, SetRadioManagerLogging) {
  ConnectedClient client;
  client.willAnswer(Success("24000000", "95808400"));
  EXPECT_EQ(hvmh_set_radio_manager_logging(client.get(), 1, nullptr), HVMH_OK);
  ExpectRequest(client, Plain("24000000", "31808400", Hex("01000000")));
}

TEST(RequestBytes, ExtractArchive) {
  ConnectedClient client;
  client.willAnswer(Success("28000000", "96808400", Hex("01000000")));
  bool success = false;
  EXPECT_EQ(hvmh_extract_archive(client.get(), "/a.zip", "/to", &success, nullptr), HVMH_OK);
  EXPECT_TRUE(success);
  ExpectRequest(client, Plain("20020000", "32808400", Slot(256, "/a.zip") + Slot(256, "/to")));
}

TEST(RequestBytes, CopyPropertyListFile) {
  ConnectedClient client;
  client.willAnswer(fake::DataReply(0x848097, 0, 3) + Hex("00ff0a"));
  void* content = nullptr;
  size_t size = 0;
  EXPECT_EQ(hvmh_copy_property_list_file(client.get(), "/p", &content, &size, nullptr), HVMH_OK);
  ASSERT_EQ(size, 3U);
  EXPECT_EQ(std::memcmp(content, "\0\xff\n", 3), 0);
  hvmh_free(content);
  ExpectRequest(client, Plain("20010000", "33808400", Slot(256, "/p")));
}

TEST(RequestTexts, FillTheirSlotUpToTheLastByteButOne) {
  ConnectedClient client;
  const std::string longest(255, 'x');
  client.willAnswer(Success("24000000", "81808400"));
  EXPECT_EQ(hvmh_set_voicemail_token(client.get(), longest.c_str(), nullptr), HVMH_OK);
  ExpectRequest(client, Plain("20010000", "1d808400", Slot(256, longest)));
  const std::string path(1023, 'y');
  client.willAnswer(Success("24000000", "8b808400"));
  EXPECT_EQ(hvmh_create_symlink(client.get(), "", path.c_str(), nullptr), HVMH_OK);
  ExpectRequest(client, Plain("20080000", "27808400", Slot(1024, "") + Slot(1024, path)));
}

TEST(RequestTexts, AreNeverCut) {
  ConnectedClient client;
  EXPECT_EQ(hvmh_set_voicemail_token(client.get(), std::string(256, 'x').c_str(), nullptr),
            HVMH_TOO_LARGE);
  EXPECT_EQ(hvmh_create_symlink(client.get(), std::string(1024, 'x').c_str(), "/l", nullptr),
            HVMH_TOO_LARGE);
  EXPECT_EQ(hvmh_create_symlink(client.get(), "/t", std::string(5000, 'x').c_str(), nullptr),
            HVMH_TOO_LARGE);
  EXPECT_TRUE(hvmh_client_is_connected(client.get()));
  // The first packet to arrive is this one: nothing was sent before it.
  client.willAnswer(Success("24000000", "83808400"));
  EXPECT_EQ(hvmh_clear_voicemail_token(client.get(), nullptr), HVMH_OK);
  ExpectRequest(client, Header("00000000", "18000000", "1f808400"));
}

TEST(RequestTexts, WithAZeroInsideAreRefused) {
  ConnectedClient unused;  // shows that a zero is found without any exchange
  halvec::EncodedRequest<requests::SetVoicemailToken> request;
  EXPECT_EQ(request.encode({std::string_view("a\0b", 3)}), halvec::Error{HVMH_INVALID_ARGUMENT});
}

TEST(RequestData, TravelsBehindTheMessageUpTo131072Bytes) {
  const fake::DescriptorBalance balance;
  ConnectedClient client;
  const Bytes value(131072, 0xa5);
  client.willAnswer(Success("24000000", "87808400"));
  EXPECT_EQ(hvmh_set_preference_value(client.get(), "d", "k", value.data(), value.size(), nullptr),
            HVMH_OK);
  const Packet packet = client.request();
  ASSERT_EQ(packet.bytes.size(), 568U + 131072U);
  EXPECT_TRUE(packet.descriptors.empty());
  EXPECT_EQ(ToHex({packet.bytes.begin() + 28, packet.bytes.begin() + 44}),
            "00000000000000000001000100000200");
  EXPECT_EQ(ToHex({packet.bytes.begin() + 564, packet.bytes.begin() + 568}), "00000200");
  EXPECT_TRUE(Bytes(packet.bytes.begin() + 568, packet.bytes.end()) == value);
}

/// Checks the memory that came with a request for `value`.
void ExpectSealedMemory(const Packet& packet, const Bytes& value, const char* sizeHex) {
  ASSERT_EQ(packet.bytes.size(), 568U);
  ASSERT_EQ(packet.descriptors.size(), 1U);
  EXPECT_EQ(ToHex({packet.bytes.begin() + 28, packet.bytes.begin() + 44}),
            "010000000000000000010001" + std::string(sizeHex));
  EXPECT_EQ(ToHex({packet.bytes.begin() + 564, packet.bytes.begin() + 568}), sizeHex);
  const int memory = packet.descriptors[0].get();
  struct stat status {};
  ASSERT_EQ(::fstat(memory, &status), 0);
  EXPECT_TRUE(S_ISREG(status.st_mode));
  EXPECT_EQ(status.st_size, static_cast<off_t>(value.size()));
  EXPECT_EQ(::fcntl(memory, F_GET_SEALS) & fake::kAllSeals, fake::kAllSeals);
  Bytes content(value.size());
  EXPECT_EQ(::pread(memory, content.data(), content.size(), 0),
            static_cast<ssize_t>(content.size()));
  EXPECT_TRUE(content == value);
}

TEST(RequestData, TravelsInSealedMemoryFrom131073Bytes) {
  const fake::DescriptorBalance balance;
  ConnectedClient client;
  const Bytes value(131073, 0x5a);
  client.willAnswer(Success("24000000", "87808400"));
  EXPECT_EQ(hvmh_set_preference_value(client.get(), "d", "k", value.data(), value.size(), nullptr),
            HVMH_OK);
  ExpectSealedMemory(client.request(), value, "01000200");
}

TEST(RequestData, OfSixteenMebibytesTravelsAndOneByteMoreDoesNot) {
  const fake::DescriptorBalance balance;
  ConnectedClient client;
  Bytes value(16777217, 0x11);
  EXPECT_EQ(hvmh_set_preference_value(client.get(), "d", "k", value.data(), value.size(), nullptr),
            HVMH_TOO_LARGE);
  value.pop_back();
  client.willAnswer(Success("24000000", "87808400"));
  EXPECT_EQ(hvmh_set_preference_value(client.get(), "d", "k", value.data(), value.size(), nullptr),
            HVMH_OK);
  ExpectSealedMemory(client.request(), value, "00000001");
}

TEST(RequestData, TravelsInMemoryWhereTheSocketTakesNoSuchPacket) {
  const fake::DescriptorBalance balance;
  ConnectedClient client;
  const int small = 8192;
  ASSERT_EQ(
      ::setsockopt(client.helperSide.sendRight.get(), SOL_SOCKET, SO_SNDBUF, &small, sizeof small),
      0);
  const Bytes value(100000, 0x77);
  client.willAnswer(Success("24000000", "87808400"));
  EXPECT_EQ(hvmh_set_preference_value(client.get(), "d", "k", value.data(), value.size(), nullptr),
            HVMH_OK);
  ExpectSealedMemory(client.request(), value, "a0860100");
}

TEST(RequestData, MayBeEmpty) {
  ConnectedClient client;
  client.willAnswer(fake::PlainReply(0x848087, 5));
  hvmh_error error;
  EXPECT_EQ(hvmh_set_preference_value(client.get(), "d", "k", nullptr, 0, &error),
            HVMH_RETURN_CODE);
  EXPECT_EQ(error.return_code, 5);
  const Packet packet = client.request();
  ASSERT_EQ(packet.bytes.size(), 568U);
  EXPECT_TRUE(packet.descriptors.empty());
  EXPECT_EQ(ToHex({packet.bytes.begin() + 28, packet.bytes.begin() + 44}),
            "00000000000000000001000100000000");
}

}  // namespace
