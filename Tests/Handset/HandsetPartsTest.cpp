// SPDX-License-Identifier: Apache-2.0
//
// The pure parts of the handset: texts in, values out. One thread.
#include <gtest/gtest.h>
#include <signal.h>

#include <string>
#include <vector>

#include "Tools/handset/Entitlements.h"
#include "Tools/handset/EventLoop.h"
#include "Tools/handset/Failure.h"
#include "Tools/handset/Json.h"
#include "Tools/handset/Mounts.h"
#include "Tools/handset/NameServer.h"
#include "Tools/handset/Options.h"
#include "Tools/handset/Packet.h"
#include "Tools/handset/SignalName.h"
#include "Tools/handset/SystemLogCapture.h"
#include "Tools/handset/TelephonyMessage.h"
#include "Tools/handset/UserDatabase.h"
#include "Tools/handset/WireMessage.h"

namespace handset {
namespace {

TEST(HandsetUsers, JoinTheHostsAndReplaceWhatWouldBeAmbiguous) {
  EXPECT_EQ(PasswordTextWithHandsetUsers("root:x:0:0:root:/root:/bin/sh\n"
                                         "mobile:x:7:7::/nowhere:/bin/sh\n"
                                         "other:x:502:9::/home/other:/bin/sh"),
            "root:x:0:0:root:/root:/bin/sh\n"
            "mobile:x:501:501:Mobile User:/var/mobile:/bin/sh\n"
            "halvec:x:502:502:Telephony Daemon:/var/empty:/bin/sh\n");
  EXPECT_EQ(GroupTextWithHandsetGroups("root:x:0:\nothers:x:501:a,b\n"),
            "root:x:0:\nmobile:x:501:\nhalvec:x:502:\n");
}

TEST(HandsetUsers, AreFoundByNameAndByNumber) {
  const std::string text =
      "broken\nbad:x:one:1::/:/bin/sh\nroot:x:0:0:root:/root:/bin/sh\n"
      "mobile:x:501:20:Mobile User:/var/mobile:/bin/zsh\n";
  for (const char* name : {"mobile", "501"}) {
    const auto user = FindUser(text, name);
    ASSERT_TRUE(user) << name;
    EXPECT_EQ(user->name, "mobile");
    EXPECT_EQ(user->uid, 501U);
    EXPECT_EQ(user->gid, 20U);
    EXPECT_EQ(user->home, "/var/mobile");
    EXPECT_EQ(user->shell, "/bin/zsh");
  }
  EXPECT_FALSE(FindUser(text, "bad"));
  EXPECT_FALSE(FindUser(text, "5010"));
  EXPECT_FALSE(FindUser(text, ""));
}

TEST(HandsetUsers, HaveTheGroupsThatNameThem) {
  const std::string text = "a:x:1:me\nb:x:2:you,me\nc:x:3:you\nd:x:4:\ne:x:five:me\n";
  EXPECT_EQ(SupplementaryGroups(text, "me"), (std::vector<gid_t>{1, 2}));
}

TEST(LogDatagram, IsTakenApartWithoutTouchingTheText) {
  const LogEntry entry =
      ParseLogDatagram("<27>Nov  1 02:03:04 HalvecMobileHelper[12]: a: b [x]: \n");
  EXPECT_EQ(entry.facility, 3);
  EXPECT_EQ(entry.priority, 3);
  EXPECT_EQ(entry.identifier, "HalvecMobileHelper");
  EXPECT_EQ(entry.text, "a: b [x]: \n");
  EXPECT_EQ(ParseLogDatagram("<13>name: text").identifier, "name");
  EXPECT_EQ(ParseLogDatagram("<13>name: text").text, "text");
  EXPECT_EQ(ParseLogDatagram("<191>x").facility, 23);
}

TEST(LogDatagram, KeepsAMalformedHeaderInTheText) {
  for (const std::string text :
       {"", "<", "<>x", "<192>x", "<1234>x", "<-1>x", "<a>x", "no tag here: x", "name[]: x",
        "name[1x]: x", "[1]: x", ": x", "Nov 01 02-03-04 x", "name[12: x"}) {
    const LogEntry entry = ParseLogDatagram(text);
    EXPECT_EQ(entry.text, text);
    EXPECT_EQ(entry.raw, text);
    EXPECT_EQ(entry.identifier, "");
    EXPECT_EQ(entry.priority, 5);
    EXPECT_EQ(entry.facility, 1);
  }
}

TEST(LogDatagram, IsShownWithExactlyOneNewline) {
  LogEntry entry;
  entry.priority = 3;
  for (const char* text : {"x", "x\n", "x\n\n"}) {
    entry.text = text;
    EXPECT_EQ(LogEntryLine(entry), "<3>x\n");
  }
}

TEST(Json, EscapesWhatItMust) {
  EXPECT_EQ(JsonString("a\"b\\c\n\t\x7f \xC3\xA9"), "\"a\\\"b\\\\c\\n\\u0009\\u007f \xC3\xA9\"");
  EXPECT_EQ(JsonString(std::string_view("\0", 1)), "\"\\u0000\"");
  EXPECT_EQ(JsonString("\xff\xC3"), "\"\\ufffd\\ufffd\"");
  EXPECT_EQ(HexOf("\x01\xfe"), "01fe");
}

TEST(Json, KnowsUtf8) {
  for (const char* good : {"", "a", "\xC2\x80", "\xE0\xA0\x80", "\xED\x9F\xBF", "\xF0\x90\x80\x80",
                           "\xF4\x8F\xBF\xBF"}) {
    EXPECT_TRUE(IsUtf8(good)) << HexOf(good);
  }
  for (const char* bad : {"\x80", "\xC1\x81", "\xE0\x9F\xBF", "\xED\xA0\x80", "\xF0\x8F\xBF\xBF",
                          "\xF4\x90\x80\x80", "\xF5\x80\x80\x80", "\xC3", "\xE2\x82", "a\xff"}) {
    EXPECT_FALSE(IsUtf8(bad)) << HexOf(bad);
  }
}

TEST(MountPoints, AreTheTopmostOnesBelowAFolder) {
  const std::string text =
      "1 0 8:1 / / rw - ext4 a rw\n"
      "2 1 8:1 / /var rw - ext4 a rw\n"
      "3 2 8:1 / /var/lib/data/inner rw - ext4 a rw\n"
      "4 2 8:1 / /var/lib/data rw - ext4 a rw\n"
      "5 2 8:1 / /var/lib/data rw - ext4 a rw\n"
      "6 2 8:1 / /various rw - ext4 a rw\n"
      "7 2 8:1 / /var/with\\040blank rw - ext4 a rw\n";
  EXPECT_EQ(MountPointsBelow(text, "/var"),
            (std::vector<std::string>{"/var/lib/data", "/var/with blank"}));
  EXPECT_TRUE(MountPointsBelow(text, "/etc").empty());
}

TEST(RunOptions, AreTakenApart) {
  const RunOptions options = ParseRunOptions(
      {"--helper", "/h", "--bind=/a:/b", "--bind", "/c", "--install", "/x/y", "--install=/x/y:z",
       "--queue=512", "--verbose", "--no-telephony", "--web", "/w", "--", "cmd", "--helper"});
  EXPECT_EQ(options.helper, "/h");
  EXPECT_TRUE(options.verbose);
  EXPECT_EQ(options.queue, 512U);
  EXPECT_FALSE(options.hasTelephony);
  EXPECT_TRUE(options.hasNetwork);
  EXPECT_EQ(options.webDirectory, "/w");
  EXPECT_EQ(options.webHosts, std::vector<std::string>{HALVEC_MANIFEST_HOST});
  using Pairs = std::vector<std::pair<std::string, std::string>>;
  EXPECT_EQ(options.binds, (Pairs{{"/a", "/b"}, {"/c", "/c"}}));
  EXPECT_EQ(options.installs, (Pairs{{"/x/y", "y"}, {"/x/y", "z"}}));
  EXPECT_EQ(options.command, (std::vector<std::string>{"cmd", "--helper"}));
}

TEST(RunOptions, AreRefusedWhereTheyDoNotParse) {
  using Words = std::vector<std::string>;
  for (const Words& words :
       {Words{}, Words{"--verbose"}, Words{"--helper"}, Words{"--what", "x"},
        Words{"--verbose=1", "x"}, Words{"--queue", "x", "cmd"}, Words{"--queue", "-1", "cmd"},
        Words{"--bind", "relative", "cmd"}, Words{"--bind", "/a:b", "cmd"}}) {
    try {
      static_cast<void>(ParseRunOptions(words));
      ADD_FAILURE() << "accepted " << words.size() << " words";
    } catch (const Failure& failure) {
      EXPECT_EQ(failure.status(), kStatusUsage) << failure.what();
    }
  }
}

TEST(RunOptions, TakeSecondsWithFractions) {
  EXPECT_EQ(Milliseconds("1.5"), 1500);
  EXPECT_EQ(Milliseconds("0"), 0);
  EXPECT_EQ(Milliseconds("0.0001"), 1);
  for (const char* bad : {"", "-1", "x", "1s", "nan", "inf", "1e300"}) {
    EXPECT_THROW(static_cast<void>(Milliseconds(bad)), Failure) << bad;
  }
}

TEST(Entitlement, HasAFileNameOfItsOwnPerExecutable) {
  EXPECT_EQ(EntitlementFileName("/usr/libexec/a"), "usr%2Flibexec%2Fa.plist");
  EXPECT_EQ(EntitlementFileName("/usr%2Flibexec/a"), "usr%252Flibexec%2Fa.plist");
}

TEST(Entitlement, IsWrittenAsAPropertyList) {
  EXPECT_EQ(EntitlementPropertyList("/a<&>b", "501", {{"n", "<false/>"}, {"m", "<string/>"}}),
            "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n"
            "  <key>Executable</key>\n  <string>/a&lt;&amp;&gt;b</string>\n"
            "  <key>User</key>\n  <integer>501</integer>\n"
            "  <key>Entitlements</key>\n  <dict>\n"
            "    <key>n</key>\n    <false/>\n    <key>m</key>\n    <string/>\n"
            "  </dict>\n</dict>\n</plist>\n");
}

TEST(SignalName, IsFoundInEveryForm) {
  EXPECT_EQ(SignalNumber("KILL"), SIGKILL);
  EXPECT_EQ(SignalNumber("SIGTERM"), SIGTERM);
  EXPECT_EQ(SignalNumber("6"), SIGABRT);
  EXPECT_EQ(SignalNumber("NOSUCH"), std::nullopt);
  EXPECT_EQ(SignalNumber("0"), std::nullopt);
  EXPECT_EQ(SignalNumber(""), std::nullopt);
}

TEST(WireMessage, IsHeaderLengthPayloadAndPadding) {
  const std::string bytes = BytesOfHex(
      "00000000"
      "20000000"
      "00000000"
      "00000000"
      "00000000"
      "07000000"
      "03000000"
      "61626300");
  EXPECT_EQ(PayloadMessage(7, "abc"), bytes);
  std::string reason;
  const auto message = ParseWireMessage(bytes, reason);
  ASSERT_TRUE(message) << reason;
  EXPECT_EQ(message->id, 7U);
  EXPECT_EQ(message->payload, "abc");
  EXPECT_FALSE(message->carriesPort);
  EXPECT_EQ(PayloadMessage(7, "").size(), 28U);
  EXPECT_EQ(PayloadMessage(7, "abcd").size(), 32U);
}

TEST(WireMessage, MayCarryOnePort) {
  const std::string bytes = BytesOfHex(
      "00000080"
      "2c000000"
      "00000000"
      "00000000"
      "00000000"
      "07000000"
      "01000000"
      "00000000"
      "00000000"
      "00001100"
      "00000000");
  std::string reason;
  const auto message = ParseWireMessage(bytes, reason);
  ASSERT_TRUE(message) << reason;
  EXPECT_TRUE(message->carriesPort);
  EXPECT_EQ(message->payload, "");
}

TEST(WireMessage, IsRefusedWhereAnyByteIsWrong) {
  const std::string good = BytesOfHex(
      "00000080"
      "30000000"
      "00000000"
      "00000000"
      "00000000"
      "07000000"
      "01000000"
      "00000000"
      "00000000"
      "00001100"
      "01000000"
      "61000000");
  std::string reason;
  ASSERT_TRUE(ParseWireMessage(good, reason)) << reason;
  for (std::size_t length = 0; length < good.size(); ++length) {
    EXPECT_FALSE(ParseWireMessage(good.substr(0, length), reason)) << length;
  }
  for (std::size_t i = 0; i < good.size(); ++i) {
    const bool isFree = (i >= 20 && i < 24) || i == 44;  // the id and the payload
    std::string changed = good;
    changed[i] = static_cast<char>(changed[i] ^ 0x40);
    EXPECT_EQ(ParseWireMessage(changed, reason).has_value(), isFree) << "byte " << i;
  }
}

Packet PacketOfHex(const std::string& hex) { return {7, "wlan0", true, BytesOfHex(hex)}; }

TEST(Packet, IsShownWithAddressesAndPorts) {
  const Packet udp = PacketOfHex(
      "450000200000000040110000"
      "0a000002"
      "c0000201"
      "0035ffff000c0000");
  EXPECT_EQ(PacketLine(udp),
            "wlan0 out udp 10.0.0.2:53 > 192.0.2.1:65535 "
            "4500002000000000401100000a000002c00002010035ffff000c0000\n");
  const Packet other = PacketOfHex(
      "4500001400000000402f0000"
      "0a000002"
      "c0000201");
  EXPECT_EQ(PacketJson(other),
            "{\"monotonic_ns\":7,\"interface\":\"wlan0\",\"direction\":\"out\",\"protocol\":\"47\","
            "\"source\":\"10.0.0.2\",\"destination\":\"192.0.2.1\","
            "\"hex\":\"4500001400000000402f00000a000002c0000201\"}\n");
}

TEST(Packet, MayBeCutShortOrNoIpAtAll) {
  EXPECT_EQ(PacketLine(PacketOfHex("45")), "wlan0 out ? ? > ? 45\n");
  EXPECT_EQ(ProtocolOf(PacketOfHex(std::string(40, '6'))), "?");
  const Packet noPorts = PacketOfHex(
      "4f00001400000000"
      "40060000"
      "0a000002"
      "c0000201");
  EXPECT_EQ(PacketLine(noPorts).substr(0, 39), "wlan0 out tcp 10.0.0.2 > 192.0.2.1 4f00");
}

TEST(TelephonyMessage, MustCarryExactlyTheRightThatItAnnounces) {
  const std::string list = "bplist00" + BytesOfHex(
                                            "a0"  // an empty array, its offset, the trailer
                                            "08"
                                            "000000000000"
                                            "0101"
                                            "0000000000000001"
                                            "0000000000000000"
                                            "0000000000000009");
  const std::string plain = PayloadMessage(kConnectMessage, list);
  std::string carrying = plain;
  carrying[3] = '\x80';
  carrying.insert(24, BytesOfHex("01000000"
                                 "00000000"
                                 "00000000"
                                 "00001100"));
  carrying[4] = static_cast<char>(carrying.size());
  const auto fault = [](const std::string& bytes, std::size_t rights) {
    return DescribeTelephonyMessage(kConnectionPort, std::nullopt, bytes, rights).fault;
  };
  EXPECT_EQ(fault(carrying, 1), "");
  EXPECT_EQ(fault(carrying, 0), "0 rights beside the message");
  EXPECT_EQ(fault(carrying, 2), "2 rights beside the message");
  EXPECT_EQ(fault(plain, 0), "no port descriptor");
}

TEST(TelephonyMessage, BelongsToOnePort) {
  const auto fault = [](const char* port, std::optional<unsigned> connection, std::uint32_t id) {
    return DescribeTelephonyMessage(port, connection, PayloadMessage(id, "xxxx"), 0).fault;
  };
  const std::string unknown = "unknown message id";
  EXPECT_EQ(fault(kUpdatePort, std::nullopt, kLogToFileMessage), unknown);
  EXPECT_EQ(fault(kRadioPort, std::nullopt, kUpdateMessage), unknown);
  EXPECT_EQ(fault(kConnectionPort, std::nullopt, kCivicMessage), unknown);
  EXPECT_EQ(fault(kConnectionPort, 1, kConnectMessage), "no port descriptor");
  EXPECT_NE(fault(kConnectionPort, 1, kCivicMessage), unknown);
}

std::string Query(const std::string& hex) {
  return BytesOfHex(
      "0007"
      "0100"
      "0001000000000000" +
      hex);
}

std::string AnswerHex(const std::string& query) {
  const auto answer = AnswerNameQuery(query, {"a.bc"}, {192, 0, 2, 1});
  return answer ? HexOf(*answer) : "none";
}

TEST(NameQuery, IsAnsweredWithTheQuestionAndAtMostOneRecord) {
  EXPECT_EQ(AnswerHex(Query("0161026263"
                            "00"
                            "0001"
                            "0001")),
            "0007"
            "8580"
            "0001000100000000"
            "0161026263"
            "00"
            "0001"
            "0001"
            "c00c"
            "0001"
            "0001"
            "00000000"
            "0004"
            "c0000201");
  EXPECT_EQ(AnswerHex(Query("0141024243"
                            "00"
                            "001c"
                            "0001")),
            "0007"
            "8580"
            "0001000000000000"
            "0141024243"
            "00"
            "001c"
            "0001");
  EXPECT_EQ(AnswerHex(Query("0161"
                            "00"
                            "0001"
                            "0001")),
            "0007"
            "8583"
            "0001000000000000"
            "0161"
            "00"
            "0001"
            "0001");
}

TEST(NameQuery, MayBeFollowedByOtherRecords) {
  std::string query = Query(
      "0161026263"
      "00"
      "0001"
      "0001"
      "0000291000000000000000");
  query[11] = 1;  // an additional record
  EXPECT_EQ(AnswerHex(query).substr(0, 24), "000785800001000100000000");
}

TEST(NameQuery, IsNotAnsweredWhereItIsNone) {
  const std::string good = Query(
      "0161026263"
      "00"
      "0001"
      "0001");
  for (std::size_t length = 0; length < good.size(); ++length) {
    EXPECT_EQ(AnswerHex(good.substr(0, length)), "none") << length;
  }
  EXPECT_EQ(AnswerHex(Query("c00c"
                            "0001"
                            "0001")),
            "none")
      << "a pointer";
  EXPECT_EQ(AnswerHex(Query("0161026263"
                            "00"
                            "0001"
                            "0003")),
            "none")
      << "another class";
  for (const std::size_t position : {2U, 5U}) {
    std::string other = good;
    other[position] = static_cast<char>(0x90);
    EXPECT_EQ(AnswerHex(other), "none") << "a response, or not one question";
  }
}

TEST(HandsetEventLoop, RunsDeadlinesInTimeAndNoCancelledOne) {
  EventLoop loop;
  int ran = 0;
  const auto now = EventLoop::Clock::now();
  const EventLoop::Ticket cancelled = loop.at(now, [&] { ran += 100; });
  static_cast<void>(loop.at(now, [&] {
    ++ran;
    static_cast<void>(loop.at(now, [&] {
      ++ran;
      loop.stop();
    }));
  }));
  loop.cancel(cancelled);
  loop.run();
  EXPECT_EQ(ran, 2);
}

}  // namespace
}  // namespace handset
