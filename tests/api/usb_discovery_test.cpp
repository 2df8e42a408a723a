// Discovery on USB, with a simulated receiver at the other end of two pipes.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "platform/api_types.h"
#include "platform/handle.h"
#include "platform/hresult.h"
#include "simulator/quorin/receiver.h"
#include "tests/support/block_stream.h"
#include "tests/support/content.h"
#include "tests/support/memory_stream.h"
#include "tests/support/report_capture.h"
#include "tests/support/usb_pipes.h"

using rcvlink::KernelHandle;

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

class ApiUsb : public testing::Test {
 protected:
  static sim::FileStore OneFile() {
    sim::FileStore files;
    files.Add("A0101.log", sim::ToBytes(Content(1300)), 600000000);
    return files;
  }
  std::string Narrow() const { return {path.begin(), path.end()}; }
  // The lines of discovery itself.
  std::vector<std::string> Lines() const {
    std::vector<std::string> lines = report.Lines();
    std::erase_if(lines, [](const std::string& line) {
      return !line.starts_with("CreateReceiver") && !line.starts_with("SearchReceiver");
    });
    return lines;
  }
  HRESULT Create(EProtocol protocol, HANDLE abort_event = nullptr) {
    return devapi::CreateReceiverOnUSB(path.data(), protocol, abort_event, &handle);
  }
  std::string Heard() const { return log.str(); }

  const ReportCapture report;
  std::ostringstream log;
  sim::Transcript transcript{log};
  sim::QuorinReceiver receiver{{}, OneFile(), &transcript};
  UsbPipes pipes{receiver};
  std::wstring path = pipes.path();
  void* handle = nullptr;
};

TEST_F(ApiUsb, FindsAReceiverAndRegistersIt) {
  ASSERT_EQ(Create(eProtocolAny), S_OK);
  EXPECT_THAT(Lines(),
              ElementsAre("CreateReceiverOnUSB - opening USB [" + Narrow() + "]",
                          "CreateReceiverOnUSB - looking for Quorin receiver [" + Narrow() + "]",
                          "CreateReceiverOnUSB - Quorin receiver found [" + Narrow() + "]",
                          "CreateReceiverOnUSB - OK [" + Narrow() + "]"));
  void* same = nullptr;
  EXPECT_EQ(devapi::OpenReceiver(path.data(), &same), S_OK);
  EXPECT_EQ(same, handle);
  EXPECT_EQ(devapi::CloseReceiver(handle), S_FALSE);
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
  pipes.WaitUntilClosed();
}

TEST_F(ApiUsb, FindsAQuorinReceiverWhateverIsAskedFor) {
  ASSERT_EQ(Create(eProtocolVelmar), S_OK);
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
}

TEST_F(ApiUsb, SearchGoesThere) {
  ASSERT_EQ(devapi::SearchReceiver(path.data(), eInstanceUSB, eProtocolAny, nullptr, &handle),
            S_OK);
  EXPECT_EQ(Lines().back(), "CreateReceiverOnUSB - OK [" + Narrow() + "]");
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
}

TEST_F(ApiUsb, AsksNothingAfterAnAbort) {
  const KernelHandle aborted(CreateEventW(nullptr, TRUE, TRUE, nullptr));
  EXPECT_EQ(Create(eProtocolAny, aborted.get()), S_FALSE);
  EXPECT_EQ(handle, nullptr);
  EXPECT_THAT(Lines(), ElementsAre("CreateReceiverOnUSB - opening USB [" + Narrow() + "]"));
  pipes.WaitUntilClosed();
  EXPECT_THAT(Heard(), IsEmpty());
}

TEST_F(ApiUsb, FindsNothingWhereNothingIs) {
  path += L"-missing";
  EXPECT_EQ(Create(eProtocolAny), S_FALSE);
  EXPECT_EQ(handle, nullptr);
  EXPECT_THAT(Lines(),
              ElementsAre("CreateReceiverOnUSB - opening USB [" + Narrow() + "]",
                          "CreateReceiverOnUSB - looking for Quorin receiver [" + Narrow() + "]"));
  void* registered = nullptr;
  EXPECT_EQ(devapi::OpenReceiver(path.data(), &registered), S_FALSE);
}

TEST_F(ApiUsb, NeedsAPathAndAPlaceForTheHandle) {
  EXPECT_EQ(devapi::CreateReceiverOnUSB(nullptr, eProtocolAny, nullptr, &handle), E_INVALIDARG);
  EXPECT_EQ(devapi::CreateReceiverOnUSB(path.data(), eProtocolAny, nullptr, nullptr), E_INVALIDARG);
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST_F(ApiUsb, DownloadsAFile) {
  ASSERT_EQ(Create(eProtocolQuorin), S_OK);
  MemoryStream stream;
  std::wstring name = L"A0101.log";
  EXPECT_EQ(devapi::DownloadFile(handle, name.data(), &stream, nullptr), S_OK);
  EXPECT_TRUE(stream.bytes == Content(1300));
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
  pipes.WaitUntilClosed();
  EXPECT_FALSE(receiver.in_transfer());
  EXPECT_EQ(Heard().find("rate,"), std::string::npos);
}

}  // namespace
