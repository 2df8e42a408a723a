// Velmar receivers on serial ports: which families are probed, in which order.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <string>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"

using testing::ElementsAre;
using testing::ElementsAreArray;

namespace {

constexpr const char* kFirstQuestion = R"(interfacemode thisport novatel novatel on\r)";
constexpr const char* kSecondQuestion = R"(unlogall thisport\r)";

class ApiVelmarSearch : public testing::Test {
 protected:
  long Create(EProtocol protocol) {
    std::wstring name = port_.name();
    DCB settings = host::Settings(CBR_9600);
    return devapi::CreateReceiverOnSerial(
        name.data(), protocol, &settings, nullptr, receiver_.out());
  }
  host::Lines Sent() const { return host::SentByHost(port_.Transcript()); }
  std::string Told(const std::string& step) const {
    return "CreateReceiverOnSerial - " + step + " [" + host::Narrow(port_.name()) + "]";
  }
  void ExpectSteps(const host::Lines& steps) const {
    host::Lines expected;
    for (const std::string& step : steps) expected.push_back(Told(step));
    EXPECT_THAT(report_.LinesWith("CreateReceiverOnSerial"), ElementsAreArray(expected));
  }

  const bed::SimulatedPort port_{{"velmar"}};
  const host::Report report_;
  host::OpenReceiver receiver_;
};

TEST_F(ApiVelmarSearch, FindsItWithoutAskingTheOtherFamily) {
  ASSERT_EQ(Create(eProtocolVelmar), S_OK);
  EXPECT_NE(receiver_.get(), nullptr);
  ExpectSteps(
      {"opening serial port", "looking for Velmar receiver", "Velmar receiver found", "OK"});
  EXPECT_THAT(Sent(), ElementsAre(kFirstQuestion, kSecondQuestion));

  EXPECT_EQ(receiver_.Check(), VARIANT_TRUE);
  EXPECT_THAT(Sent(),
              ElementsAre(kFirstQuestion, kSecondQuestion, kFirstQuestion, kSecondQuestion));
}

TEST_F(ApiVelmarSearch, AnyFamilyIsQuorinFirst) {
  ASSERT_EQ(Create(eProtocolAny), S_OK);
  ExpectSteps({"opening serial port",
               "looking for Quorin receiver",
               "looking for Velmar receiver",
               "Velmar receiver found",
               "OK"});
  CReceiverInfo info{};
  ASSERT_EQ(devapi::GetReceiverInfo(receiver_.get(), nullptr, &info), S_OK);
  EXPECT_EQ(info.dwProtocol, 2U);
  SysFreeString(info.bstrReceiverId);
  SysFreeString(info.bstrModel);
}

TEST_F(ApiVelmarSearch, IsNotAskedWhereQuorinIsWanted) {
  EXPECT_EQ(Create(eProtocolQuorin), S_FALSE);
  EXPECT_EQ(receiver_.get(), nullptr);
  ExpectSteps({"opening serial port", "looking for Quorin receiver"});
  const std::string transcript = port_.Transcript();
  EXPECT_NE(transcript.find("dm"), std::string::npos) << "it was not asked at all";
  EXPECT_EQ(transcript.find("interfacemode"), std::string::npos) << transcript;
  EXPECT_EQ(transcript.find("unlogall"), std::string::npos) << transcript;
}

// A receiver that refuses the second command is not found. (The reply to the first, for which
// nobody waits, could be taken for it.)
TEST(ApiVelmarSearchRefused, IsNoReceiver) {
  const bed::SimulatedPort port({"velmar", "--mute", "interfacemode", "--refuse", "unlogall"});
  std::wstring name = port.name();
  DCB settings = host::Settings(CBR_9600);
  void* handle = nullptr;
  EXPECT_EQ(
      devapi::CreateReceiverOnSerial(name.data(), eProtocolVelmar, &settings, nullptr, &handle),
      S_FALSE);
  EXPECT_EQ(handle, nullptr);
  EXPECT_THAT(host::SentByHost(port.Transcript()), ElementsAre(kFirstQuestion, kSecondQuestion));
}

}  // namespace
