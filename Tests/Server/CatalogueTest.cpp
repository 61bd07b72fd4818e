// SPDX-License-Identifier: Apache-2.0
//
// The 23 rows against a table typed by hand, and every row over a real port.
#include "Helper/Shared/Interface/Requests.h"
#include "Tests/Support/ServerFixture.h"

namespace {

using support::Bytes;
using support::Get;
using support::Put;

struct GoldenRow {
  std::int32_t id;
  const char* name;
  std::uint32_t requestSize;
  std::uint32_t replySize;  // of success
  std::uint32_t maxReplySize;
  std::uint32_t argumentCount;
};

// clang-format off
constexpr GoldenRow kGolden[] = {
    {0x84801d, "SetVoicemailToken",              288,  36,  36,  2},
    {0x84801e, "SetVoicemailTokenForKey",        544,  36,  36,  3},
    {0x84801f, "ClearVoicemailToken",            24,   36,  36,  1},
    {0x848020, "ResetVoicemailRecords",          24,   36,  36,  1},
    {0x848021, "CopyVoicemailTokenForKey",       288,  292, 292, 3},
    {0x848022, "CopyVoicemailToken",             24,   292, 292, 2},
    {0x848023, "SetPreferenceValue",             568,  36,  36,  5},
    {0x848024, "CopyPreferenceValue",            544,  56,  56,  5},
    {0x848025, "CopyAppPreferenceValue",         544,  56,  56,  5},
    {0x848026, "SetCarrierBundleLink",           3104, 36,  36,  4},
    {0x848027, "CreateSymlink",                  2080, 36,  36,  3},
    {0x848028, "RemoveCarrierBundleLink",        2080, 36,  36,  3},
    {0x848029, "IsVoicemailSubscribed",          24,   40,  40,  2},
    {0x84802a, "TriggerHeartbeat",               36,   36,  36,  2},
    {0x84802b, "TriggerDatabaseUpdate",          36,   36,  36,  2},
    {0x84802c, "CopyFile",                       800,  40,  40,  5},
    {0x84802d, "CopyCrashLogs",                  288,  40,  40,  3},
    {0x84802e, "MoveCarrierBundles",             800,  40,  40,  5},
    {0x84802f, "RequestCountryCodeFromLocation", 48,   36,  36,  5},
    {0x848030, "CopyCountryCode",                24,   100, 100, 2},
    {0x848031, "SetRadioManagerLogging",         36,   36,  36,  2},
    {0x848032, "ExtractArchive",                 544,  40,  40,  4},
    {0x848033, "CopyPropertyListFile",           288,  56,  56,  4},
};
// clang-format on

template <class Row>
void ExpectRow(const GoldenRow& golden, const platform::MigRoutineDescriptor& descriptor) {
  EXPECT_EQ(Row::kId, golden.id);
  EXPECT_EQ(Row::kName, golden.name);
  EXPECT_EQ(Row::kRequestSize, golden.requestSize) << golden.name;
  EXPECT_EQ(Row::kReplySize, golden.replySize) << golden.name;
  EXPECT_EQ(descriptor.maxReplySize, golden.maxReplySize) << golden.name;
  EXPECT_EQ(descriptor.argumentCount, golden.argumentCount) << golden.name;
}

TEST(Catalogue, AgreesWithTheTableTypedByHand) {
  const platform::MigSubsystem& subsystem = RequestSubsystem();
  ASSERT_EQ(std::size(kGolden), 23U);
  ASSERT_EQ(subsystem.routines.size(), 23U);
  [&]<class... Rows>(std::type_identity<std::tuple<Rows...>>) {
    std::size_t index = 0;
    ((ExpectRow<Rows>(kGolden[index], subsystem.routines[index]), ++index), ...);
  }(std::type_identity<requests::All>{});
  EXPECT_EQ(subsystem.startId, 8683549);
  EXPECT_EQ(subsystem.endId, 8683572);
  EXPECT_EQ(subsystem.maxReplySize, 292U);
}

TEST(Catalogue, HasNoStubBelowItsFirstIdNorAboveItsLast) {
  const auto demultiplex = RequestSubsystem().demultiplex;
  for (const std::int32_t id : {8683548, 8683572, 0, -1, INT32_MIN, INT32_MAX}) {
    EXPECT_EQ(demultiplex({.id = id}), nullptr) << id;
  }
  for (const GoldenRow& row : kGolden) EXPECT_NE(demultiplex({.id = row.id}), nullptr);
}

constexpr std::int32_t kSetPreferenceValue = 8683555;

class RequestWire : public support::ServerFixture {
 protected:
  void SetUp() override {
    start();
    client = connect();
  }
  support::Packet send(const Bytes& bytes, const std::vector<int>& descriptors = {}) {
    return request(*client, bytes, descriptors);
  }
  static Bytes errorReply(std::int32_t id, std::int32_t code) {
    Bytes reply(36);
    Put(reply, 4, 36);
    Put(reply, 20, static_cast<std::uint32_t>(id) + 100);
    reply[28] = 1;
    Put(reply, 32, code);
    return reply;
  }
  static Bytes setPreference(const std::string& value) {
    return support::SetPreferenceRequest("domain", "key", value);
  }
  std::unique_ptr<support::WireClient> client;
};

TEST_F(RequestWire, OfAnyButItsExactSizeGetsMinus304) {
  for (const GoldenRow& row : kGolden) {
    if (row.id == kSetPreferenceValue) continue;
    for (const std::uint32_t size :
         {24U, 28U, row.requestSize - 1, row.requestSize + 1, row.requestSize + 4, 4096U}) {
      if (size < 24 || size == row.requestSize) continue;
      EXPECT_EQ(send(support::Message(row.id, size)).bytes, errorReply(row.id, -304))
          << row.name << " of " << size;
    }
  }
}

TEST_F(RequestWire, Of289BytesForTheFirstIdGetsMinus304) {
  EXPECT_EQ(send(support::Message(8683549, 289)).bytes, errorReply(8683549, -304));
}

TEST_F(RequestWire, ThatIsComplexGetsMinus304) {
  for (const GoldenRow& row : kGolden) {
    if (row.id == kSetPreferenceValue) continue;
    Bytes bytes = support::Message(row.id, row.requestSize);
    Put(bytes, 0, 0x80000000U);
    EXPECT_EQ(send(bytes).bytes, errorReply(row.id, -304)) << row.name;
  }
}

TEST_F(RequestWire, WhoseHeaderLiesAboutItsSizeGetsMinus304) {
  for (const std::uint32_t size : {0U, 23U, 287U, 289U, 0xffffffffU}) {
    Bytes bytes = support::Message(8683549, 288);
    Put(bytes, 4, size);
    EXPECT_EQ(send(bytes).bytes, errorReply(8683549, -304)) << size;
  }
}

TEST_F(RequestWire, WithAnUnknownIdGetsMinus303) {
  for (const std::int32_t id : {8683548, 8683572, 4792174, 0, -1, INT32_MIN, INT32_MAX}) {
    EXPECT_EQ(send(support::Message(id, 24)).bytes, errorReply(id, -303)) << id;
  }
}

TEST_F(RequestWire, IsAnsweredOnItsReplyRightWhereItCarriesOne) {
  const support::PortPair port = support::MakePort();
  Bytes bytes = support::Message(8683551, 28);
  Put(bytes, 0, 18U);
  EXPECT_TRUE(send(bytes, {port.send.get()}).bytes.empty());
  EXPECT_EQ(support::ReceivePacket(port.receive.get()).bytes, errorReply(8683551, -304));
}

TEST_F(RequestWire, SetPreferenceWithoutTheComplexBitGetsMinus304) {
  Bytes bytes = setPreference("");
  Put(bytes, 0, 0U);
  EXPECT_EQ(send(bytes).bytes, errorReply(kSetPreferenceValue, -304));
}

TEST_F(RequestWire, SetPreferenceOfAnotherSizeGetsMinus304) {
  for (const std::uint32_t size : {24U, 28U, 44U, 567U, 569U, 572U}) {
    Bytes bytes = setPreference("");
    bytes.resize(size);
    Put(bytes, 4, size);
    EXPECT_EQ(send(bytes).bytes, errorReply(kSetPreferenceValue, -304)) << size;
  }
}

TEST_F(RequestWire, SetPreferenceWithAnotherDescriptorCountGetsMinus304) {
  for (const std::uint32_t count : {0U, 2U, 3U, 0x80000000U}) {
    Bytes bytes = setPreference("");
    Put(bytes, 24, count);
    EXPECT_EQ(send(bytes).bytes, errorReply(kSetPreferenceValue, -304)) << count;
  }
}

TEST_F(RequestWire, SetPreferenceWithAnotherDescriptorTypeGetsMinus300) {
  for (const int type : {0, 2, 3, 255}) {
    Bytes bytes = setPreference("");
    bytes[39] = static_cast<std::uint8_t>(type);
    EXPECT_EQ(send(bytes).bytes, errorReply(kSetPreferenceValue, -300)) << type;
  }
}

TEST_F(RequestWire, SetPreferenceWithByteCount10AndDescriptorSize11GetsMinus300) {
  Bytes bytes = setPreference("elevenbytes");
  Put(bytes, 564, 10U);
  EXPECT_EQ(send(bytes).bytes, errorReply(kSetPreferenceValue, -300));
}

TEST_F(RequestWire, SetPreferenceWithoutAllItsBytesGetsMinus304) {
  Bytes bytes = setPreference("elevenbytes");
  bytes.pop_back();
  EXPECT_EQ(send(bytes).bytes, errorReply(kSetPreferenceValue, -304));
  bytes.resize(bytes.size() + 2);
  EXPECT_EQ(send(bytes).bytes, errorReply(kSetPreferenceValue, -304));
}

TEST_F(RequestWire, DoesNotExamineTheNdrRecord) {
  Bytes bytes = support::Message(8683562, 36);
  for (std::size_t at = 24; at < 32; ++at) bytes[at] = 0xff;
  EXPECT_EQ(send(bytes).bytes, errorReply(8683562, 0));
}

}  // namespace
