// Deleting, renaming, uploading, and the settings of the receiver's own port.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <string>

#include "rcvlink.h"
#include "tests/host/support/file_list.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;

namespace {

TEST(ApiDeleteFile, RemovesTheFileNamed) {
  const bed::SimulatedPort port({"quorin"}, {{"A.log", "a"}, {"B b.log", "b"}});
  const host::Receiver receiver(port);
  const host::Report report;
  wchar_t name[] = L"B b.log";
  EXPECT_EQ(devapi::DeleteFileW(receiver.get(), name), S_OK);
  EXPECT_THAT(host::WireLines(port.Transcript()).back(), R"(< RE%#%\r\n)");
  EXPECT_THAT(receiver.SentSince(), ElementsAre(R"(%#%remove,B b.log\r\n)"));
  EXPECT_THAT(report.Lines(),
              ElementsAre("CAbstractReceiver::DeleteFile",
                          "CQuorinProtocol::DeleteFile - connection is locked [HANDLE]",
                          "CDeleteFileCmd::CDeleteFileCmd",
                          "CSerialConnection::Flush",
                          "CQuorinCommand::Execute - start reading. Timeout is [30000 msec]",
                          "CQuorinProtocol::DeleteFile - OK"));
  const host::FileList list(receiver.get());
  ASSERT_EQ(list.Count(), 1);
  EXPECT_EQ(list.At(0).name, L"A.log");

  EXPECT_EQ(devapi::DeleteFileW(receiver.get(), name), host::kNotConnected) << "it is gone";
}

TEST(ApiDeleteFile, AbortEndsItOnce) {
  bed::SimulatedPort port({"quorin"}, {{"A.log", "a"}});
  const host::Receiver receiver(port);
  wchar_t name[] = L"A.log";
  devapi::Abort(receiver.get());
  EXPECT_EQ(devapi::DeleteFileW(receiver.get(), name), S_FALSE);
  EXPECT_THAT(receiver.SentSince(), IsEmpty());

  const host::Report report;
  port.Pause();
  auto deletion = host::OnThread([&] { return devapi::DeleteFileW(receiver.get(), name); });
  report.WaitFor("CQuorinCommand::Execute - start reading");
  devapi::Abort(receiver.get());
  EXPECT_EQ(deletion.get(), S_FALSE);
  port.Resume();
  EXPECT_EQ(receiver.Identify().result, S_OK);
}

TEST(ApiUnoffered, OperationsAreRefusedWithoutACommand) {
  const bed::SimulatedPort port({"quorin"}, {{"A.log", "a"}});
  const host::Receiver receiver(port);
  const host::Report report;
  wchar_t name[] = L"A.log";
  wchar_t new_name[] = L"B.log";
  CFileInfo info{};
  MemoryStream stream;
  host::Progress progress;
  EXPECT_EQ(devapi::RenameFile(receiver.get(), name, new_name), E_NOTIMPL);
  EXPECT_EQ(devapi::RenameFile(receiver.get(), nullptr, nullptr), E_NOTIMPL);
  EXPECT_EQ(devapi::UploadFile(receiver.get(), &info, &stream, progress.record()), E_NOTIMPL);
  EXPECT_EQ(devapi::UploadFile(receiver.get(), nullptr, nullptr, nullptr), E_NOTIMPL);
  EXPECT_THAT(report.Lines(),
              ElementsAre("CAbstractReceiver::RenameFile",
                          "CAbstractReceiver::RenameFile",
                          "CAbstractReceiver::UploadFile",
                          "CAbstractReceiver::UploadFile"));
  EXPECT_THAT(receiver.SentSince(), IsEmpty());
  EXPECT_THAT(progress.percents(), IsEmpty());
  EXPECT_EQ(stream.other_calls + stream.writes, 0U);
}

class ApiPortSettings : public testing::Test {
 protected:
  // A setting has no reply, so the test waits for it.
  void ExpectSetting(const std::string& setting, const std::string& taken) {
    sent_.push_back(R"(%#%print,/cur/term\r\n)");
    sent_.push_back("set,/par/dev/ser/c/" + setting + R"(\r\n)");
    receiver_.WaitForSent(sent_.size());
    EXPECT_THAT(receiver_.SentSince(), ElementsAreArray(sent_));
    port_.WaitForTranscript(taken + "\n");
  }

  const bed::SimulatedPort port_{{"quorin", "--port-letter", "c"}};
  const host::Receiver receiver_{port_};
  void* const handle_ = receiver_.get();
  host::Lines sent_;
};

TEST_F(ApiPortSettings, ParityIsOddEvenOrNone) {
  const host::Report report;
  EXPECT_EQ(devapi::DCSetRcvParity(handle_, 1), S_OK);
  ExpectSetting("parity,odd", "= port c parity odd");
  EXPECT_EQ(devapi::DCSetRcvParity(handle_, 3), S_OK);
  ExpectSetting("parity,N", "= port c parity N");
  EXPECT_EQ(devapi::DCSetRcvParity(handle_, 2), S_OK);
  ExpectSetting("parity,even", "= port c parity even");
  EXPECT_EQ(devapi::DCSetRcvParity(handle_, 0), S_OK);
  ExpectSetting("parity,N", "= port c parity N");
  const host::Lines lines = report.Lines();
  EXPECT_THAT(host::Lines(lines.begin(), lines.begin() + 5),
              ElementsAre("CAbstractReceiver::DCSetRcvParity",
                          "CGetPortCmd::CGetPortCmd",
                          "CSerialConnection::Flush",
                          "CQuorinCommand::Execute - start reading. Timeout is [30000 msec]",
                          "CSerialConnection::Flush"));
}

TEST_F(ApiPortSettings, StopBitsAreOneOrTwo) {
  EXPECT_EQ(devapi::DCSetRcvStopbits(handle_, 1), S_OK);
  ExpectSetting("stops,2", "= port c stops 2");
  EXPECT_EQ(devapi::DCSetRcvStopbits(handle_, 0), S_OK);
  ExpectSetting("stops,1", "= port c stops 1");
  EXPECT_EQ(devapi::DCSetRcvStopbits(handle_, 255), S_OK);
  ExpectSetting("stops,2", "= port c stops 2");
}

TEST_F(ApiPortSettings, RtsIsOnOrOff) {
  EXPECT_EQ(devapi::DCSetRcvRTSControl(handle_, 0), S_OK);
  ExpectSetting("rts,off", "= port c rts off");
  EXPECT_EQ(devapi::DCSetRcvRTSControl(handle_, 1), S_OK);
  ExpectSetting("rts,on", "= port c rts on");
  EXPECT_EQ(devapi::DCSetRcvRTSControl(handle_, 128), S_OK);
  ExpectSetting("rts,on", "= port c rts on");
}

TEST_F(ApiPortSettings, SpeedChangesOnTheReceiverOnly) {
  EXPECT_EQ(devapi::DCSetRcvBaudrate(handle_, 4294967295UL), S_OK);
  port_.WaitForTranscript(R"(rate,-1\r\n)");
  EXPECT_EQ(devapi::DCSetRcvBaudrate(handle_, 19200), S_OK);
  port_.WaitForTranscript("= speed 19200\n");
  EXPECT_THAT(receiver_.SentSince(),
              ElementsAre(R"(%#%print,/cur/term\r\n)",
                          R"(set,/par/dev/ser/c/rate,-1\r\n)",
                          R"(%#%print,/cur/term\r\n)",
                          R"(set,/par/dev/ser/c/rate,19200\r\n)"));
  // The host stays at the old speed; a new connection at the new speed finds the receiver.
  const host::Receiver follower(port_, CBR_19200);
  EXPECT_EQ(follower.Identify().result, S_OK);
}

TEST_F(ApiPortSettings, AbortBeforehandLeavesTheSettingAlone) {
  devapi::Abort(handle_);
  EXPECT_EQ(devapi::DCSetRcvParity(handle_, 1), S_FALSE);
  EXPECT_EQ(devapi::DCSetRcvParity(handle_, 2), S_OK);
  port_.WaitForTranscript("= port c parity even\n");
  EXPECT_EQ(port_.Transcript().find("parity,odd"), std::string::npos);
}

}  // namespace
