// The four settings of the receiver's port.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <string>

#include "platform/hresult.h"
#include "tests/quorin/quorin_driver.h"

using rcvlink::kNotConnected;

using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Not;

namespace {

struct PortSetting {
  std::string name;
  std::function<HRESULT(CIProtocol&)> set;
  std::string command;
};

class QuorinPortSettings : public QuorinDriverTest,
                           public testing::WithParamInterface<PortSetting> {
 protected:
  HRESULT Set() { return GetParam().set(driver); }
};

constexpr char kPortCommand[] = "print,/cur/term\r\n";

TEST_P(QuorinPortSettings, AreSentToThePortThatTheReceiverNames) {
  receiver.Reply(kPortCommand, "/dev/ser/c");
  EXPECT_EQ(Set(), S_OK);
  EXPECT_THAT(Said(), ElementsAre("%%print,/cur/term\r\n", GetParam().command));
  EXPECT_EQ(connection->AnswersLeft(), 0U);
}

TEST_P(QuorinPortSettings, DoNotTakeTheLock) {
  receiver.Reply(kPortCommand, "/dev/ser/c");
  driver.LockConnection(nullptr);
  EXPECT_EQ(Set(), S_OK);
  EXPECT_EQ(driver.UnlockConnection(), 1);
  EXPECT_EQ(driver.UnlockConnection(), 0);
}

TEST_P(QuorinPortSettings, AreNotMadeForAPortWithoutALetter) {
  receiver.Reply(kPortCommand, "usb");
  EXPECT_EQ(Set(), S_FALSE);
  EXPECT_THAT(Said(), ElementsAre("%%print,/cur/term\r\n"));
}

TEST_P(QuorinPortSettings, FailWithThePortQuery) {
  receiver.Reply(kPortCommand, "/dev/ser/c", "ER");
  EXPECT_EQ(Set(), kNotConnected);
  EXPECT_THAT(Said(), ElementsAre("%%print,/cur/term\r\n"));
}

TEST_P(QuorinPortSettings, FailWhenTheSettingCannotBeWritten) {
  receiver.Reply(kPortCommand, "/dev/ser/c");
  receiver.FailWriteOf(GetParam().command, E_HANDLE);
  EXPECT_EQ(Set(), E_HANDLE);
}

TEST_P(QuorinPortSettings, AreNotSentAfterAnAbort) {
  receiver.Reply(kPortCommand, "/dev/ser/c");
  driver.Abort();
  EXPECT_EQ(Set(), S_FALSE);
  EXPECT_THAT(Said(), Not(Contains(GetParam().command)));
  EXPECT_EQ(Set(), S_OK);
}

TEST_P(QuorinPortSettings, AreNotSentAfterAnAbortDuringThePortQuery) {
  receiver.On(kPortCommand, [this](const std::string& tag) {
    connection->Give({S_OK, Message("RE", tag + "/dev/ser/c"), [this] { driver.Abort(); }});
  });
  EXPECT_EQ(Set(), S_FALSE);
  EXPECT_THAT(Said(), ElementsAre("%%print,/cur/term\r\n"));
}

TEST_P(QuorinPortSettings, ReportNoProgress) {
  receiver.Reply(kPortCommand, "/dev/ser/c");
  Set();
  EXPECT_THAT(progress.percents, IsEmpty());
}

std::string SettingName(const testing::TestParamInfo<PortSetting>& setting) {
  return setting.param.name;
}

INSTANTIATE_TEST_SUITE_P(
    All,
    QuorinPortSettings,
    testing::Values(PortSetting{"Baudrate",
                                [](CIProtocol& d) { return d.DCSetRcvBaudrate(57600); },
                                "set,/par/dev/ser/c/rate,57600\r\n"},
                    PortSetting{"RtsOn",
                                [](CIProtocol& d) { return d.DCSetRcvRTSControl(255); },
                                "set,/par/dev/ser/c/rts,on\r\n"},
                    PortSetting{"RtsOff",
                                [](CIProtocol& d) { return d.DCSetRcvRTSControl(0); },
                                "set,/par/dev/ser/c/rts,off\r\n"},
                    PortSetting{"Parity",
                                [](CIProtocol& d) { return d.DCSetRcvParity(2); },
                                "set,/par/dev/ser/c/parity,even\r\n"},
                    PortSetting{"OneStopBit",
                                [](CIProtocol& d) { return d.DCSetRcvStopbits(0); },
                                "set,/par/dev/ser/c/stops,1\r\n"},
                    PortSetting{"TwoStopBits",
                                [](CIProtocol& d) { return d.DCSetRcvStopbits(2); },
                                "set,/par/dev/ser/c/stops,2\r\n"}),
    SettingName);

}  // namespace
