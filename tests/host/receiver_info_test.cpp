// GetReceiverInfo: the identity of the receiver.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <cstring>
#include <ostream>
#include <string>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"

using testing::ElementsAre;

namespace {

constexpr int kFill = 0xCD;
constexpr unsigned kFilled = 0xCDCDCDCD;

// A record in which every byte that was not written can be recognised.
CReceiverInfo FilledRecord() {
  CReceiverInfo info;
  std::memset(&info, kFill, sizeof(info));
  return info;
}

wchar_t* FilledPointer() { return FilledRecord().bstrReserved; }

// What another thread gets now: S_OK with the lock, or S_FALSE when it is held.
long TryLockElsewhere(void* handle) {
  return host::OnThread([handle] {
           const host::Event at_once(true);
           const long result = devapi::LockConnection(handle, at_once.get());
           if (result == S_OK) devapi::UnlockConnection(handle);
           return result;
         })
      .get();
}

TEST(ApiReceiverInfo, FillsTheRecordAndNothingElse) {
  const bed::SimulatedPort port({"quorin", "--id", "  QR 7 ", "--model", "\tHVA3 X"});
  const host::Receiver receiver(port);
  const host::Report report;
  CReceiverInfo info = FilledRecord();
  ASSERT_EQ(devapi::GetReceiverInfo(receiver.get(), nullptr, &info), S_OK);

  EXPECT_EQ(info.dwFeatures, 9U);
  EXPECT_EQ(info.dwPadding, kFilled);
  EXPECT_STREQ(info.bstrReceiverId, L"QR 7 ") << "only leading white space goes";
  EXPECT_EQ(SysStringLen(info.bstrReceiverId), 5U) << "no BSTR";
  EXPECT_EQ(info.bstrReserved, FilledPointer());
  EXPECT_STREQ(info.bstrModel, L"HVA3 X");
  EXPECT_EQ(SysStringLen(info.bstrModel), 6U) << "no BSTR";
  EXPECT_EQ(info.dwProtocol, 1U);
  EXPECT_EQ(info.dwVariant, 2U);
  SysFreeString(info.bstrReceiverId);
  SysFreeString(info.bstrModel);

  EXPECT_THAT(receiver.SentSince(),
              ElementsAre(R"(%#%print,/par/rcvid\r\n)", R"(%#%print,/par/rcv/model\r\n)"));
  EXPECT_THAT(report.Lines(),
              ElementsAre("CAbstractReceiver::GetReceiverInfo",
                          "CQuorinProtocol::GetReceiverInfo",
                          "CQuorinProtocol::LockConnection - connection is locked [HANDLE]",
                          "CGetReceiverIDCmd::CGetReceiverIDCmd",
                          "CSerialConnection::Flush",
                          "CQuorinCommand::Execute - start reading. Timeout is [30000 msec]",
                          "CGetReceiverModelCmd::CGetReceiverModelCmd",
                          "CSerialConnection::Flush",
                          "CQuorinCommand::Execute - start reading. Timeout is [30000 msec]",
                          "CQuorinProtocol::UnlockConnection - connection is unlocked [HANDLE]",
                          "CQuorinProtocol::GetReceiverInfo - OK"));
  EXPECT_EQ(TryLockElsewhere(receiver.get()), S_OK) << "the lock is still held";
}

struct Model {
  std::string text;
  unsigned variant;
};

std::ostream& operator<<(std::ostream& out, const Model& model) { return out << model.text; }

class ApiReceiverInfoOfModel : public testing::TestWithParam<Model> {};

TEST_P(ApiReceiverInfoOfModel, HasTheVariant) {
  const bed::SimulatedPort port({"quorin", "--model", GetParam().text});
  const host::Receiver receiver(port);
  CReceiverInfo info{};
  ASSERT_EQ(devapi::GetReceiverInfo(receiver.get(), nullptr, &info), S_OK);
  EXPECT_EQ(info.bstrModel, std::wstring(GetParam().text.begin(), GetParam().text.end()));
  EXPECT_EQ(info.dwVariant, GetParam().variant);
  SysFreeString(info.bstrReceiverId);
  SysFreeString(info.bstrModel);
}

INSTANTIATE_TEST_SUITE_P(Models,
                         ApiReceiverInfoOfModel,
                         testing::Values(Model{"HVB5", 2}, Model{"HVA4-G3T", 1}, Model{"HVA", 1}));

class ApiReceiverInfoRefused : public testing::TestWithParam<std::string> {};

TEST_P(ApiReceiverInfoRefused, GivesNoStringsAndKeepsTheLock) {
  const bed::SimulatedPort port({"quorin", "--refuse", GetParam()});
  const host::Receiver receiver(port);
  const host::Report report;
  CReceiverInfo info = FilledRecord();
  EXPECT_EQ(devapi::GetReceiverInfo(receiver.get(), nullptr, &info), host::kNotConnected);

  EXPECT_EQ(info.bstrReceiverId, nullptr);
  EXPECT_EQ(info.bstrModel, nullptr);
  EXPECT_EQ(info.bstrReserved, FilledPointer());
  EXPECT_EQ(info.dwFeatures, kFilled);
  EXPECT_EQ(info.dwProtocol, kFilled);
  EXPECT_EQ(info.dwVariant, kFilled);
  const host::Lines dumped = report.LinesWith("CQuorinProtocol::DumpInvalidResponse");
  ASSERT_EQ(dumped.size(), 1U);
  EXPECT_EQ(dumped[0],
            "CQuorinProtocol::DumpInvalidResponse - [0x8007048F] [{refused}] [" +
                host::Narrow(port.name()) + "]");

  EXPECT_EQ(TryLockElsewhere(receiver.get()), S_FALSE) << "the lock was given back";
  EXPECT_EQ(devapi::UnlockConnection(receiver.get()), S_OK);
  EXPECT_EQ(TryLockElsewhere(receiver.get()), S_OK);
}

INSTANTIATE_TEST_SUITE_P(Questions,
                         ApiReceiverInfoRefused,
                         testing::Values("print,/par/rcvid", "print,/par/rcv/model"));

TEST(ApiReceiverInfo, AbortEventEndsTheWaitForTheLock) {
  const bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  void* const handle = receiver.get();
  ASSERT_EQ(devapi::LockConnection(handle, nullptr), S_OK);
  const host::Report report;

  host::Event abort_event;
  CReceiverInfo info = FilledRecord();
  auto asked =
      host::OnThread([&] { return devapi::GetReceiverInfo(handle, abort_event.get(), &info); });
  report.WaitFor("CQuorinProtocol::GetReceiverInfo");
  abort_event.Set();
  EXPECT_EQ(asked.get(), S_FALSE);
  EXPECT_EQ(info.bstrReceiverId, nullptr);
  EXPECT_EQ(info.bstrModel, nullptr);
  EXPECT_TRUE(report.Has("CQuorinProtocol::LockConnection - is cancelled [HANDLE]"));
  EXPECT_TRUE(receiver.SentSince().empty());
  devapi::UnlockConnection(handle);
}

// An abort ends the operation that finds it, and only this one.
TEST(ApiReceiverInfo, AbortBeforehandEndsOneCall) {
  const bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  ASSERT_EQ(devapi::Abort(receiver.get()), S_OK);
  EXPECT_EQ(receiver.Identify().result, S_FALSE);
  const host::Identity identity = receiver.Identify();
  EXPECT_EQ(identity.result, S_OK);
  EXPECT_EQ(identity.id, L"QR00421");
  EXPECT_EQ(identity.model, L"HVA3-G3T");
}

TEST(ApiReceiverInfo, AbortEndsTheWaitForAnAnswer) {
  bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  const host::Report report;
  port.Pause();
  auto asked = host::OnThread([&] { return receiver.Identify(); });
  report.WaitFor("CQuorinCommand::Execute - start reading");
  EXPECT_EQ(devapi::Abort(receiver.get()), S_OK);
  const host::Identity identity = asked.get();
  EXPECT_EQ(identity.result, S_FALSE);
  EXPECT_TRUE(identity.id.empty());
  port.Resume();
  EXPECT_EQ(receiver.Identify().model, L"HVA3-G3T");
}

}  // namespace
