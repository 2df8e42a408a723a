// A search with many tries: it takes a hundred seconds, because of the time-outs.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <string>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"

using testing::ElementsAreArray;

namespace {

// The receiver is at 19200 bit/s and does not answer the first three times that it is asked: at the
// end of the first mode, at the beginning of the second, which tries the port's current speed, and
// at the end of the second. It answers at the beginning of the third. (It never answers the first
// of the two commands: nobody waits for that reply, and a late one could be taken for the other.)
TEST(ApiVelmarSweep, FindsAReceiverInTheThirdMode) {
  const bed::SimulatedPort port(
      {"velmar", "--speed", "19200", "--mute", "interfacemode", "--mute", "unlogall@3"});
  std::wstring name = port.name();
  const std::string told = " [" + host::Narrow(name) + "]";
  const host::Report report;
  // The speed at which the port was left.
  void* handle = nullptr;
  DCB settings = host::Settings(CBR_4800);
  const host::Event at_once(true);
  ASSERT_EQ(devapi::CreateReceiverOnSerial(
                name.data(), eProtocolVelmar, &settings, at_once.get(), &handle),
            S_FALSE);

  ASSERT_EQ(devapi::SearchReceiver(name.data(), eInstanceSerial, eProtocolVelmar, nullptr, &handle),
            S_OK);
  host::Lines expected;
  for (const char* const rts : {"handshake", "enable", "disable"}) {
    for (const char* const speed : {"current port speed",
                                    "speed [9600]",
                                    "speed [115200]",
                                    "speed [57600]",
                                    "speed [38400]",
                                    "speed [19200]"}) {
      expected.push_back(std::string("SearchReceiverOnSerial - try ") + speed + told);
      expected.push_back(std::string("SearchReceiverOnSerial - try RTS control is ") + rts + told);
    }
  }
  constexpr size_t kTries = 13;
  expected.resize(2 * kTries);
  EXPECT_THAT(report.LinesWith("SearchReceiverOnSerial"), ElementsAreArray(expected));
  EXPECT_EQ(report.LinesWith("CAbstractConnection::Read - wait timeout").size(), kTries - 1);
  EXPECT_EQ(report.LinesWith("CreateReceiverOnSerial - Velmar receiver found").size(), 1U);
  EXPECT_EQ(host::CountOf(host::SentByHost(port.Transcript()), R"(unlogall thisport\r)"), 4U);

  ASSERT_NE(handle, nullptr);
  CReceiverInfo info{};
  EXPECT_EQ(devapi::GetReceiverInfo(handle, nullptr, &info), S_OK);
  EXPECT_EQ(info.dwProtocol, 2U);
  SysFreeString(info.bstrReceiverId);
  SysFreeString(info.bstrModel);
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
}

}  // namespace
