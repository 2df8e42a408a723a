#include "transport/abstract_connection.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <string>

#include "platform/hresult.h"
#include "tests/support/fake_device.h"
#include "tests/support/report_capture.h"

using rcvlink::CopyBstr;
using rcvlink::DeviceCalls;
using rcvlink::FileHandle;
using rcvlink::HResultFromError;
using rcvlink::KernelHandle;
using rcvlink::UniqueBstr;

namespace {

using testing::ElementsAre;

// The common part of all connections, opened on a fake device.
class TestConnection : public CAbstractConnection {
 public:
  explicit TestConnection(DeviceCalls& calls) : CAbstractConnection(calls) {}
  void Open(const wchar_t* name) {
    CreateEvents();
    name_ = CopyBstr(name);
    device_ = FileHandle(calls_.CreateFile(L"x", 0, 0, 0));
  }
  HRESULT GetInstanceType(EInstanceType*) override { return E_NOTIMPL; }
  HRESULT GetSpeed(DWORD*) override { return E_NOTIMPL; }
  HRESULT SetSpeed(DWORD) override { return E_NOTIMPL; }
};

class AbstractConnection : public testing::Test {
 protected:
  HRESULT Read(DWORD timeout_ms = 700) {
    return connection.Read(buffer.data(), sizeof(buffer), &count, timeout_ms);
  }
  HRESULT Write(DWORD timeout_ms = 700) {
    return connection.Write(buffer.data(), sizeof(buffer), timeout_ms);
  }
  void Open() {
    connection.Open(L"COM7");
    device.calls.clear();
  }

  ReportCapture report;
  FakeDevice device;
  TestConnection connection{device};
  std::array<char, 16> buffer{};
  DWORD count = 99;
};

TEST_F(AbstractConnection, NeverOpenedIsNotConnected) {
  EXPECT_EQ(Read(), static_cast<HRESULT>(0x8007048F));
  EXPECT_EQ(count, 0u);
  EXPECT_EQ(Write(), static_cast<HRESULT>(0x8007048F));
  EXPECT_TRUE(device.calls.empty());
}

TEST_F(AbstractConnection, ReadThatCompletesAtOnceDoesNotWait) {
  Open();
  device.transferred = 5;
  EXPECT_EQ(Read(), S_OK);
  EXPECT_EQ(count, 5u);
  EXPECT_THAT(device.calls, ElementsAre("ReadFile"));
}

TEST_F(AbstractConnection, ReadThatFailsAtOnceIsReported) {
  Open();
  device.transfer_error = ERROR_ACCESS_DENIED;
  EXPECT_EQ(Read(), HResultFromError(ERROR_ACCESS_DENIED));
  EXPECT_TRUE(report.Has("CAbstractConnection::Read - read failed [5] [COM7]"));
  EXPECT_THAT(device.calls, ElementsAre("ReadFile"));
}

TEST_F(AbstractConnection, PendingReadWaitsForAbortFirstThenItsEvent) {
  Open();
  device.transfer_error = ERROR_IO_PENDING;
  device.transferred = 7;
  DWORD handles = 0;
  HANDLE first = nullptr;
  device.on_wait = [&](DWORD number, const HANDLE* list) {
    handles = number;
    first = list[0];
  };
  EXPECT_EQ(Read(700), S_OK);
  EXPECT_EQ(count, 7u);
  EXPECT_EQ(handles, 2u);
  EXPECT_EQ(first, connection.GetAbortEvent());
  EXPECT_EQ(device.wait_timeout, 700u);
  EXPECT_THAT(device.calls, ElementsAre("ReadFile", "Wait", "GetOverlappedResult"));
}

TEST_F(AbstractConnection, ReadThatTimesOutIsCancelledAndWaitedFor) {
  Open();
  device.transfer_error = ERROR_IO_PENDING;
  device.wait_answer = WAIT_TIMEOUT;
  EXPECT_EQ(Read(), static_cast<HRESULT>(0x800705B4));
  EXPECT_THAT(device.calls, ElementsAre("ReadFile", "Wait", "CancelIo", "WaitForEnd"));
  EXPECT_TRUE(report.Has("CAbstractConnection::Read - wait timeout [COM7]"));
}

TEST_F(AbstractConnection, ReadThatIsAbortedIsCancelledAndWaitedFor) {
  Open();
  device.transfer_error = ERROR_IO_PENDING;
  device.wait_answer = WAIT_OBJECT_0;
  EXPECT_EQ(Read(), S_FALSE);
  EXPECT_THAT(device.calls, ElementsAre("ReadFile", "Wait", "CancelIo", "WaitForEnd"));
}

TEST_F(AbstractConnection, ReadWhoseWaitFailsGivesTheReasonWithoutALine) {
  Open();
  const size_t lines = report.Lines().size();
  device.transfer_error = ERROR_IO_PENDING;
  device.wait_answer = WAIT_FAILED;
  device.failure = ERROR_INVALID_HANDLE;
  EXPECT_EQ(Read(), HResultFromError(ERROR_INVALID_HANDLE));
  EXPECT_THAT(device.calls, ElementsAre("ReadFile", "Wait", "CancelIo", "WaitForEnd"));
  EXPECT_EQ(report.Lines().size(), lines);
}

// On Wine a serial read that ends empty fails so; on Windows it is a success of 0 bytes.
TEST_F(AbstractConnection, ReadWhoseResultIsATimeOutGivesIt) {
  Open();
  device.transfer_error = ERROR_IO_PENDING;
  device.overlapped_error = ERROR_TIMEOUT;
  EXPECT_EQ(Read(), static_cast<HRESULT>(0x800705B4));
  EXPECT_TRUE(
      report.Has("CAbstractConnection::Read - GetOverlappedResult is failed [1460] [COM7]"));
}

TEST_F(AbstractConnection, ReadThatEndsEmptyIsASuccess) {
  Open();
  device.transfer_error = ERROR_IO_PENDING;
  device.transferred = 0;
  EXPECT_EQ(Read(), S_OK);
  EXPECT_EQ(count, 0u);
}

TEST_F(AbstractConnection, WriteThatCompletesAtOnceDoesNotWait) {
  Open();
  EXPECT_EQ(Write(), S_OK);
  EXPECT_THAT(device.calls, ElementsAre("WriteFile"));
}

TEST_F(AbstractConnection, WriteThatFailsAtOnceIsReported) {
  Open();
  device.transfer_error = ERROR_GEN_FAILURE;
  EXPECT_EQ(Write(), HResultFromError(ERROR_GEN_FAILURE));
  EXPECT_TRUE(report.Has("CAbstractConnection::Write - write failed [31] [COM7]"));
}

TEST_F(AbstractConnection, PendingWriteIsWaitedFor) {
  Open();
  device.transfer_error = ERROR_IO_PENDING;
  EXPECT_EQ(Write(3000), S_OK);
  EXPECT_EQ(device.wait_timeout, 3000u);
  EXPECT_THAT(device.calls, ElementsAre("WriteFile", "Wait", "GetOverlappedResult"));
}

TEST_F(AbstractConnection, WriteThatTimesOutIsCancelledAndWaitedFor) {
  Open();
  device.transfer_error = ERROR_IO_PENDING;
  device.wait_answer = WAIT_TIMEOUT;
  EXPECT_EQ(Write(), static_cast<HRESULT>(0x800705B4));
  EXPECT_THAT(device.calls, ElementsAre("WriteFile", "Wait", "CancelIo", "WaitForEnd"));
  EXPECT_TRUE(report.Has("CAbstractConnection::Write - wait timeout [0x800705B4] [COM7]"));
}

TEST_F(AbstractConnection, WriteThatIsAbortedIsCancelledAndWaitedFor) {
  Open();
  device.transfer_error = ERROR_IO_PENDING;
  device.wait_answer = WAIT_OBJECT_0;
  EXPECT_EQ(Write(), S_FALSE);
  EXPECT_THAT(device.calls, ElementsAre("WriteFile", "Wait", "CancelIo", "WaitForEnd"));
}

TEST_F(AbstractConnection, WriteWhoseWaitFailsGivesTheReason) {
  Open();
  device.transfer_error = ERROR_IO_PENDING;
  device.wait_answer = WAIT_FAILED;
  device.failure = ERROR_INVALID_HANDLE;
  EXPECT_EQ(Write(), HResultFromError(ERROR_INVALID_HANDLE));
  EXPECT_THAT(device.calls, ElementsAre("WriteFile", "Wait", "CancelIo", "WaitForEnd"));
}

TEST_F(AbstractConnection, WriteWithoutATimeOutDoesNotWaitAndFailsWhileItIsUnderWay) {
  Open();
  device.transfer_error = ERROR_IO_PENDING;
  device.overlapped_error = ERROR_IO_INCOMPLETE;
  EXPECT_EQ(Write(0), HResultFromError(ERROR_IO_INCOMPLETE));
  EXPECT_THAT(device.calls,
              ElementsAre("WriteFile", "GetOverlappedResult", "CancelIo", "WaitForEnd"));
  EXPECT_TRUE(
      report.Has("CAbstractConnection::Write - GetOverlappedResult is failed [996] [COM7]"));
}

TEST_F(AbstractConnection, WriteWithoutATimeOutThatIsDoneIsASuccess) {
  Open();
  device.transfer_error = ERROR_IO_PENDING;
  EXPECT_EQ(Write(0), S_OK);
  EXPECT_THAT(device.calls, ElementsAre("WriteFile", "GetOverlappedResult"));
}

TEST_F(AbstractConnection, DriversOwnErrorNumbersPassUnchanged) {
  Open();
  device.transfer_error = 0xE0001009;
  EXPECT_EQ(Write(), static_cast<HRESULT>(0xE0001009));
}

TEST_F(AbstractConnection, FlushHasNothingToDo) { EXPECT_EQ(connection.Flush(), S_FALSE); }

TEST_F(AbstractConnection, CancelSignalsTheAbortEventOnce) {
  connection.Cancel();  // before the first opening: nothing to signal, no line
  EXPECT_TRUE(report.Lines().empty());
  Open();
  connection.Cancel();
  EXPECT_TRUE(report.Has("CAbstractConnection::Cancel [COM7]"));
  EXPECT_EQ(WaitForSingleObject(connection.GetAbortEvent(), 0), WAIT_OBJECT_0);
  EXPECT_EQ(WaitForSingleObject(connection.GetAbortEvent(), 0), WAIT_TIMEOUT);
}

TEST_F(AbstractConnection, AnOutsideAbortEventReplacesCancel) {
  Open();
  const HANDLE own = connection.GetAbortEvent();
  const KernelHandle outside(CreateEventW(nullptr, TRUE, FALSE, nullptr));
  connection.SetAbortEvent(outside.get());
  EXPECT_EQ(connection.GetAbortEvent(), outside.get());
  connection.Cancel();
  EXPECT_EQ(WaitForSingleObject(outside.get(), 0), WAIT_TIMEOUT);
  connection.SetAbortEvent(nullptr);
  EXPECT_EQ(connection.GetAbortEvent(), own);
}

TEST_F(AbstractConnection, DisconnectTwiceWritesDisconnectedOnce) {
  Open();
  EXPECT_EQ(connection.Disconnect(), S_OK);
  EXPECT_EQ(connection.Disconnect(), S_OK);
  int lines = 0;
  for (const std::string& line : report.Lines()) {
    lines += line == "CAbstractConnection::Disconnect - disconnected [COM7]";
  }
  EXPECT_EQ(lines, 1);
}

TEST_F(AbstractConnection, DisconnectClearsACancel) {
  Open();
  connection.Cancel();
  connection.Disconnect();
  EXPECT_EQ(WaitForSingleObject(connection.GetAbortEvent(), 0), WAIT_TIMEOUT);
}

TEST_F(AbstractConnection, GivesCopiesOfItsName) {
  BSTR name = nullptr;
  EXPECT_EQ(connection.GetName(nullptr), static_cast<HRESULT>(0x80004003));
  EXPECT_EQ(connection.GetName(&name), S_OK);
  EXPECT_EQ(name, nullptr);
  Open();
  BSTR other = nullptr;
  EXPECT_EQ(connection.GetName(&name), S_OK);
  EXPECT_EQ(connection.GetName(&other), S_OK);
  const UniqueBstr name_owner(name);
  const UniqueBstr other_owner(other);
  EXPECT_STREQ(name, L"COM7");
  EXPECT_NE(name, other);
}

TEST_F(AbstractConnection, HandlesAreTheDevices) {
  EXPECT_EQ(connection.GetReadHandle(), INVALID_HANDLE_VALUE);
  Open();
  EXPECT_NE(connection.GetReadHandle(), INVALID_HANDLE_VALUE);
  EXPECT_EQ(connection.GetReadHandle(), connection.GetWriteHandle());
}

}  // namespace
