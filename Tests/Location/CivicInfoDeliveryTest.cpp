// SPDX-License-Identifier: Apache-2.0
#include "Helper/Location/CivicInfoDelivery.h"

#include "Tests/Location/LocationFixture.h"

namespace {

using namespace location_test;
using platform::TelephonyResult;

class Delivery : public LocationFixture {};

TEST_F(Delivery, NamesTheHelperThenConnectsThenCallsAndCloses) {
  SendCivicInfoToTelephony("US", "California", "Cupertino", "95014");
  EXPECT_EQ(telephony.events,
            (std::vector<std::string>{"identifier HalvecMobileHelper", "open", "set", "close"}));
  EXPECT_EQ(takeDelivered(), (std::vector<std::string>{"US/California/Cupertino/95014"}));
  EXPECT_EQ(log.takeLines(),
            (Lines{Notice("sendCivicInfoToVL sent civic info to Halvec successfully")}));
}

TEST_F(Delivery, OpensAConnectionOfItsOwnEachTime) {
  SendCivicInfoToTelephony("US", "", "", "");
  SendCivicInfoToTelephony("CA", "", "", "");
  EXPECT_EQ(telephony.events,
            (std::vector<std::string>{"identifier HalvecMobileHelper", "open", "set", "close",
                                      "identifier HalvecMobileHelper", "open", "set", "close"}));
}

TEST_F(Delivery, OfFourEmptyTextsIsStillMade) {
  SendCivicInfoToTelephony("", "", "", "");
  EXPECT_EQ(takeDelivered(), (std::vector<std::string>{"///"}));
}

TEST_F(Delivery, WithoutTheDaemonIsOneErrorLine) {
  telephony.published = false;
  SendCivicInfoToTelephony("US", "", "", "");
  EXPECT_EQ(
      log.takeLines(),
      (Lines{Error("sendCivicInfoToVL to Halvec failed, could not open VLServerConnection")}));
  EXPECT_EQ(telephony.events, (std::vector<std::string>{"identifier HalvecMobileHelper"}));
}

TEST_F(Delivery, ThatTheDaemonRefusesIsOneNoticeLineWithTheErrorCode) {
  for (const std::int32_t code : {1, -1, INT32_MIN}) {
    telephony.answer = {.domain = 0, .errorCode = code};
    SendCivicInfoToTelephony("US", "", "", "");
    EXPECT_EQ(log.takeLines(),
              (Lines{Notice("sendCivicInfoToVL failed civic info to Halvec due to error: " +
                            std::to_string(code))}));
  }
  EXPECT_EQ(telephony.delivered.size(), 3U);
}

TEST_F(Delivery, SucceedsWithErrorCode0InWhateverDomain) {
  telephony.answer = {.domain = 7, .errorCode = 0};
  SendCivicInfoToTelephony("US", "", "", "");
  EXPECT_EQ(log.takeLines(),
            (Lines{Notice("sendCivicInfoToVL sent civic info to Halvec successfully")}));
}

TEST_F(Delivery, PassesATextThatIsNotUtf8AsNull) {
  SendCivicInfoToTelephony("US", "\xc3\x28", std::string("a\0b", 3), "1");
  EXPECT_EQ(takeDelivered(), (std::vector<std::string>{"US/null/null/1"}));
}

TEST_F(Delivery, LogsEachNotificationThatArrivesMeanwhile) {
  telephony.notificationsBeforeAnswer = 2;
  SendCivicInfoToTelephony("US", "", "", "");
  EXPECT_EQ(log.takeLines(),
            (Lines{Notice("_ServerConnectionCallback for HalvecMobileHelper"),
                   Notice("_ServerConnectionCallback for HalvecMobileHelper"),
                   Notice("sendCivicInfoToVL sent civic info to Halvec successfully")}));
}

TEST(StringToPlatformString, ConvertsUtf8AndNothingElse) {
  EXPECT_EQ(StringToPlatformString("Z\xc3\xbcrich")->utf8(), "Z\xc3\xbcrich");
  EXPECT_EQ(StringToPlatformString("")->utf8(), "");
  EXPECT_EQ(StringToPlatformString("Z\xfcrich"), std::nullopt);
}

TEST(StringToPlatformString, OutlivesTheTextItWasMadeOf) {
  std::optional<platform::String> string;
  {
    const std::string text(100, 'x');
    string = StringToPlatformString(text);
  }
  EXPECT_EQ(string->utf8(), std::string(100, 'x'));
}

}  // namespace
