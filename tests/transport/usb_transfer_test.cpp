// Reads, writes and flushes over USB.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>

#include "platform/hresult.h"
#include "tests/transport/usb_connection_fixture.h"

using rcvlink::HResultFromError;
using rcvlink::kTimedOut;

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr DWORD kDriverCrc = 0xE0000001;
constexpr DWORD kDriverBitStuff = 0xE0000002;
constexpr DWORD kDriverToggle = 0xE0000003;

using UsbTransfer = UsbConnectionTest;

TEST_F(UsbTransfer, ReadsFromTheReadHandle) {
  OpenForTransfers();
  device.transferred = 7;
  EXPECT_EQ(Read(), S_OK);
  EXPECT_EQ(count, 7U);
  ASSERT_EQ(device.transfer_calls.size(), 1U);
  EXPECT_EQ(device.transfer_calls[0].call, "ReadFile");
  EXPECT_EQ(device.transfer_calls[0].device, ReadHandle());
  EXPECT_EQ(device.transfer_calls[0].size, sizeof(buffer));
}

TEST_F(UsbTransfer, WritesToTheWriteHandle) {
  OpenForTransfers();
  EXPECT_EQ(Write(), S_OK);
  ASSERT_EQ(device.transfer_calls.size(), 1U);
  EXPECT_EQ(device.transfer_calls[0].call, "WriteFile");
  EXPECT_EQ(device.transfer_calls[0].device, WriteHandle());
  EXPECT_EQ(device.transfer_calls[0].size, sizeof(buffer));
}

TEST_F(UsbTransfer, WaitsForEachDirectionOnItsHandle) {
  OpenForTransfers();
  device.transfer_error = ERROR_IO_PENDING;
  device.transferred = 3;
  EXPECT_EQ(Read(1234), S_OK);
  EXPECT_EQ(count, 3U);
  EXPECT_EQ(device.wait_timeout, 1234U);
  EXPECT_EQ(Write(4321), S_OK);
  EXPECT_EQ(device.wait_timeout, 4321U);
  device.wait_answer = WAIT_TIMEOUT;
  EXPECT_EQ(Read(), kTimedOut);
  EXPECT_EQ(Write(), kTimedOut);
  for (const FakeDevice::Transfer& call : device.transfer_calls) {
    const auto index = &call - device.transfer_calls.data();
    const bool reading = index < 2 || (index >= 4 && index < 6);
    EXPECT_EQ(call.device, reading ? ReadHandle() : WriteHandle()) << index << " " << call.call;
  }
  EXPECT_EQ(device.transfer_calls.size(), 8U);
  EXPECT_TRUE(report.Has(Line("CAbstractConnection::Read - wait timeout [~]")));
  EXPECT_TRUE(report.Has(Line("CAbstractConnection::Write - wait timeout [0x800705B4] [~]")));
}

TEST_F(UsbTransfer, IsNotConnectedBeforeItWasOpened) {
  EXPECT_EQ(Read(), static_cast<HRESULT>(0x8007048F));
  EXPECT_EQ(Write(), static_cast<HRESULT>(0x8007048F));
  EXPECT_THAT(device.calls, IsEmpty());
}

TEST_F(UsbTransfer, IsCancelled) {
  OpenForTransfers();
  device.transfer_error = ERROR_IO_PENDING;
  device.on_wait = [&](DWORD number, const HANDLE* handles) {
    connection->Cancel();
    device.wait_answer = WaitForMultipleObjects(number, handles, FALSE, 0);
  };
  EXPECT_EQ(Read(), S_FALSE);
  EXPECT_EQ(Write(), S_FALSE);
  EXPECT_THAT(NewLines(),
              ElementsAre(Line("CAbstractConnection::Cancel [~]"),
                          Line("CAbstractConnection::Cancel [~]")));
  EXPECT_EQ(std::ranges::count(device.calls, "CancelIo"), 2);
}

struct DriverError {
  DWORD code;
  std::string line;
};

class UsbDriverError : public UsbTransfer, public testing::WithParamInterface<DriverError> {};

TEST_P(UsbDriverError, OfAWriteIsExplained) {
  OpenForTransfers();
  device.transfer_error = GetParam().code;
  EXPECT_EQ(Write(), static_cast<HRESULT>(GetParam().code));
  EXPECT_THAT(NewLines(),
              ElementsAre(Line("CAbstractConnection::Write - write failed [" +
                               std::to_string(GetParam().code) + "] [~]"),
                          "CUSBConnection::DumpDriveErrorDesc - " + GetParam().line));
}

TEST_P(UsbDriverError, OfAWriteThatWasPendingIsExplained) {
  OpenForTransfers();
  device.transfer_error = ERROR_IO_PENDING;
  device.overlapped_error = GetParam().code;
  EXPECT_EQ(Write(), static_cast<HRESULT>(GetParam().code));
  EXPECT_THAT(NewLines(),
              ElementsAre(Line("CAbstractConnection::Write - GetOverlappedResult is failed [" +
                               std::to_string(GetParam().code) + "] [~]"),
                          "CUSBConnection::DumpDriveErrorDesc - " + GetParam().line));
}

TEST_P(UsbDriverError, OfAReadIsNotExplained) {
  OpenForTransfers();
  device.transfer_error = GetParam().code;
  EXPECT_EQ(Read(), static_cast<HRESULT>(GetParam().code));
  EXPECT_THAT(NewLines(),
              ElementsAre(Line("CAbstractConnection::Read - read failed [" +
                               std::to_string(GetParam().code) + "] [~]")));
}

INSTANTIATE_TEST_SUITE_P(
    All,
    UsbDriverError,
    testing::Values(DriverError{kDriverCrc, "USBIO_ERR_CRC [e000000108X]"},
                    DriverError{kDriverBitStuff, "USBIO_ERR_BTSTUFF [e000000208X]"},
                    DriverError{kDriverToggle, "USBIO_ERR_DATA_TOGGLE_MISMATCH [e000000308X]"},
                    DriverError{kDriverNotBound, "USBIO_ERR_NOT_BOUND [e000100908X]"}));

TEST_F(UsbTransfer, ExplainsNoOtherErrors) {
  OpenForTransfers();
  for (const DWORD error : {DWORD{1},
                            DWORD{ERROR_GEN_FAILURE},
                            DWORD{0x60000001},
                            DWORD{0xE0000000},
                            DWORD{0xE0000004},
                            DWORD{0xE0001008},
                            DWORD{0xE000100A}}) {
    lines_before = report.Lines().size();
    device.transfer_error = error;
    EXPECT_EQ(Write(), HResultFromError(error));
    EXPECT_THAT(NewLines(),
                ElementsAre(Line("CAbstractConnection::Write - write failed [" +
                                 std::to_string(error) + "] [~]")));
  }
}

// Flushing.
class UsbFlush : public UsbTransfer {
 protected:
  void SetUp() override { OpenForTransfers(); }
  size_t Reads() const { return static_cast<size_t>(std::ranges::count(device.calls, "ReadFile")); }
};

TEST_F(UsbFlush, DiscardsWaitingBytesOneByOne) {
  device.transfers = {{0, 1}, {0, 1}, {0, 1}, {ERROR_IO_PENDING, 0}};
  device.wait_answer = WAIT_TIMEOUT;
  device.wait_timeout = 99;
  EXPECT_EQ(connection->Flush(), S_OK);
  EXPECT_THAT(
      device.calls,
      ElementsAre(
          "ReadFile", "ReadFile", "ReadFile", "ReadFile", "Wait", "CancelIo", "WaitForEnd"));
  for (const FakeDevice::Transfer& call : device.transfer_calls) {
    EXPECT_EQ(call.device, ReadHandle());
    EXPECT_EQ(call.size, call.call == "ReadFile" ? 1U : 0U);
  }
  EXPECT_EQ(device.wait_timeout, 0U);
  EXPECT_THAT(
      NewLines(),
      ElementsAre("CUSBConnection::Flush", Line("CAbstractConnection::Read - wait timeout [~]")));
}

TEST_F(UsbFlush, GoesOnAfterAByteThatWasPending) {
  device.transfers = {{ERROR_IO_PENDING, 0}, {ERROR_IO_PENDING, 0}, {ERROR_GEN_FAILURE, 0}};
  device.transferred = 1;
  EXPECT_EQ(connection->Flush(), S_OK);
  EXPECT_EQ(Reads(), 3U);
}

TEST_F(UsbFlush, EndsWithAnEmptyRead) {
  device.transfers = {{0, 1}, {0, 0}, {0, 1}};
  EXPECT_EQ(connection->Flush(), S_OK);
  EXPECT_EQ(Reads(), 2U);
}

TEST_F(UsbFlush, EndsWithAFailedReadButSucceeds) {
  device.transfers = {{0, 1}, {kDriverNotBound, 0}, {0, 1}};
  EXPECT_EQ(connection->Flush(), S_OK);
  EXPECT_EQ(Reads(), 2U);
  EXPECT_THAT(NewLines(),
              ElementsAre("CUSBConnection::Flush",
                          Line("CAbstractConnection::Read - read failed [3758100489] [~]")));
}

// The cancel also ends the wait of the next command, for which it is meant.
TEST_F(UsbFlush, EndsWithACancelAndKeepsIt) {
  device.transfers = {{0, 1}, {ERROR_IO_PENDING, 0}, {ERROR_IO_PENDING, 0}};
  device.transferred = 1;
  DWORD handles_of_flush = 0;
  device.on_wait = [&](DWORD handles, const HANDLE*) {
    handles_of_flush = handles;
    connection->Cancel();
  };
  EXPECT_EQ(connection->Flush(), S_OK);
  EXPECT_EQ(Reads(), 2U);
  EXPECT_EQ(handles_of_flush, 1U) << "the flush waits for its own reads only";

  DWORD first = WAIT_FAILED;
  device.on_wait = [&](DWORD, const HANDLE* handles) {
    first = WaitForSingleObject(handles[0], 0);
  };
  BYTE byte = 0;
  DWORD arrived = 0;
  connection->Read(&byte, 1, &arrived, 1000);
  EXPECT_EQ(first, WAIT_OBJECT_0);
}

TEST(UsbFlushUnopened, EndsAtOnce) {
  const ReportCapture report;
  FakeDevice device;
  CUSBConnection connection(device);
  EXPECT_EQ(connection.Flush(), S_OK);
  EXPECT_THAT(report.Lines(), ElementsAre("CUSBConnection::Flush"));
  EXPECT_THAT(device.calls, IsEmpty());
}

}  // namespace
