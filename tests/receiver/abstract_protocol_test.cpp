// The parts of the base of drivers that a family need not override.
#include "receiver/abstract_protocol.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "receiver/file_list.h"
#include "tests/support/report_capture.h"
#include "tests/support/scripted_connection.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class BareProtocol : public CAbstractProtocol {
 public:
  explicit BareProtocol(std::unique_ptr<CIConnection> connection)
      : CAbstractProtocol(L"BareProtocol", std::move(connection)) {}

  using CAbstractProtocol::AppendEntries;
  using CAbstractProtocol::RaiseSpeed;

  HRESULT GetReceiverInfo(HANDLE, CReceiverInfo*) override { return E_NOTIMPL; }
  HRESULT GetFiles(CFileList*) override { return E_NOTIMPL; }
  HRESULT DownloadFile(const wchar_t*, IStream*, CProgressCallback*) override { return E_NOTIMPL; }

 private:
  bool IsAnswering(HANDLE) override { return false; }
};

// One whose receivers can be raised, but not set back.
class RaisedProtocol : public BareProtocol {
 public:
  using BareProtocol::BareProtocol;

 private:
  HRESULT RaiseReceiver(DWORD) override { return S_OK; }
};

struct Progress : CIProtocolCallback {
  void OnProgress(BYTE percent) override { percents.push_back(percent); }
  std::vector<int> percents;
};

TEST(AbstractProtocol, WithoutASpeedCommandTheLinkStaysAsItIs) {
  const ReportCapture report;
  auto owned = std::make_unique<ScriptedConnection>();
  const ScriptedConnection& connection = *owned;
  BareProtocol driver(std::move(owned));
  EXPECT_FALSE(driver.RaiseSpeed(9600));
  EXPECT_THAT(connection.calls, IsEmpty());
  EXPECT_THAT(report.Lines(),
              ElementsAre("BareProtocol::DownloadFile - receiver speed up is failed [0x80004001]"));
}

TEST(AbstractProtocol, AHostsPortThatCannotBeRaisedIsTold) {
  const ReportCapture report;
  auto owned = std::make_unique<ScriptedConnection>();
  owned->set_speed_result = E_ACCESSDENIED;
  RaisedProtocol driver(std::move(owned));
  EXPECT_FALSE(driver.RaiseSpeed(9600));
  EXPECT_THAT(report.Lines(),
              ElementsAre("BareProtocol::DownloadFile - host speed up is failed [0x80070005]"));
}

TEST(AbstractProtocol, OffersNoChangeOfTheReceiver) {
  BareProtocol driver(std::make_unique<ScriptedConnection>());
  EXPECT_EQ(driver.UploadFile(nullptr, nullptr), E_NOTIMPL);
  EXPECT_EQ(driver.DeleteFile(L"a"), E_NOTIMPL);
  EXPECT_EQ(driver.RenameFile(L"a", L"b"), E_NOTIMPL);
  EXPECT_EQ(driver.DCSetRcvBaudrate(9600), E_NOTIMPL);
  EXPECT_EQ(driver.DCSetRcvRTSControl(0), E_NOTIMPL);
  EXPECT_EQ(driver.DCSetRcvParity(0), E_NOTIMPL);
  EXPECT_EQ(driver.DCSetRcvStopbits(0), E_NOTIMPL);
}

// The last tenth of the progress is that of the copy into the host's list.
TEST(AbstractProtocol, ProgressOfACopyGoesOnFromNinety) {
  BareProtocol driver(std::make_unique<ScriptedConnection>());
  Progress progress;
  driver.SetCallback(&progress);
  CFileList files;
  driver.AppendEntries({{.name = L"a"}, {.name = L"b"}, {.name = L"c"}, {.name = L"d"}}, files);
  EXPECT_EQ(files.Count(), 4);
  EXPECT_THAT(progress.percents, ElementsAre(90, 90, 92, 95, 97));
}

}  // namespace
