// A driver that does not end what it was asked to end: the call returns, and the memory that the
// driver may still write to stays.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <memory>

#include "platform/hresult.h"
#include "tests/support/manual_clock.h"
#include "tests/transport/usb_connection_fixture.h"
#include "transport/serial_connection.h"

using rcvlink::HResultFromError;
using rcvlink::kNotConnected;
using rcvlink::kTimedOut;

using testing::Contains;
using testing::ElementsAre;

namespace {

constexpr char kKept[] = "CAbstractConnection::CancelTransfer - the driver does not end a transfer";

// Remembers where the driver of the last transfer would write.
class HangingDevice : public FakeDevice {
 public:
  void* bytes = nullptr;
  DWORD size = 0;
  OVERLAPPED* record = nullptr;

  BOOL ReadFile(HANDLE device, void* to, DWORD length, DWORD* read, OVERLAPPED* block) override {
    bytes = to;
    size = length;
    record = block;
    return FakeDevice::ReadFile(device, to, length, read, block);
  }

  // What the driver does when it ends the transfer after all.
  void EndLate() const {
    std::memset(bytes, 'x', size);
    record->InternalHigh = size;
    record->Internal = 0;
    EXPECT_TRUE(SetEvent(record->hEvent));
  }
};

class HangingDriver : public testing::Test {
 protected:
  HangingDriver() {
    Open();
    device.transfer_error = ERROR_IO_PENDING;
    device.wait_answer = WAIT_TIMEOUT;
    device.hangs = true;
  }
  void Open() {
    const DCB settings{};
    EXPECT_EQ(connection->Open(L"COM7", &settings), S_OK);
  }
  HRESULT Read() { return connection->Read(buffer.data(), sizeof(buffer), &count, 700); }
  HRESULT Write(DWORD timeout_ms = 700) {
    return connection->Write(buffer.data(), sizeof(buffer), timeout_ms);
  }

  const ReportCapture report;
  HangingDevice device;
  std::unique_ptr<CSerialConnection> connection = std::make_unique<CSerialConnection>(device);
  std::array<char, 16> buffer{};
  DWORD count = 0;
};

TEST_F(HangingDriver, ARead) {
  EXPECT_EQ(Read(), kTimedOut);
  EXPECT_THAT(device.end_timeouts, ElementsAre(5000U));
  EXPECT_THAT(report.Lines(), Contains(std::string(kKept) + " [COM7]"));
}

// The memory is neither the caller's nor freed with the connection.
TEST_F(HangingDriver, MayWriteLater) {
  Read();
  device.EndLate();
  EXPECT_EQ(buffer, decltype(buffer){});
  connection.reset();
  device.EndLate();
}

TEST_F(HangingDriver, ReadsNothingMoreUntilItIsOpenedAgain) {
  Read();
  device.calls.clear();
  EXPECT_EQ(Read(), kNotConnected);
  EXPECT_THAT(device.calls, ElementsAre());
  device.transfer_error = ERROR_SUCCESS;
  EXPECT_EQ(Write(), S_OK) << "the other direction has its own transfer";

  Open();
  EXPECT_EQ(Read(), S_OK);
}

TEST_F(HangingDriver, AWrite) {
  EXPECT_EQ(Write(), kTimedOut);
  EXPECT_THAT(report.Lines(), Contains(std::string(kKept) + " [COM7]"));
  EXPECT_EQ(Write(), kNotConnected);
}

TEST_F(HangingDriver, AWriteThatIsNotWaitedFor) {
  device.overlapped_error = ERROR_IO_INCOMPLETE;
  EXPECT_EQ(Write(0), HResultFromError(ERROR_IO_INCOMPLETE));
  EXPECT_THAT(report.Lines(), Contains(std::string(kKept) + " [COM7]"));
  EXPECT_EQ(Write(), kNotConnected);
}

// A transfer that ended while it was being cancelled is used again, also when its event was missed.
TEST_F(HangingDriver, ATransferThatHasEndedIsNotKept) {
  class Late : public HangingDevice {
    DWORD WaitForSingleObject(HANDLE, DWORD) override {
      record->Internal = 0;
      return WAIT_TIMEOUT;
    }
  } late;
  CSerialConnection other(late);
  const DCB settings{};
  other.Open(L"COM8", &settings);
  late.transfers = {{ERROR_IO_PENDING, 0}};
  late.wait_answer = WAIT_TIMEOUT;
  late.hangs = true;
  EXPECT_EQ(other.Read(buffer.data(), sizeof(buffer), &count, 700), kTimedOut);
  EXPECT_EQ(other.Read(buffer.data(), sizeof(buffer), &count, 700), S_OK);
}

// Requests to the driver of a USB device.
class UsbRequest : public UsbConnectionTest {};

TEST_F(UsbRequest, ThatIsPendingIsWaitedFor) {
  device.request_answers[kSetConfiguration] = {{.error = ERROR_IO_PENDING}};
  EXPECT_EQ(Open(), S_OK);
  EXPECT_THAT(device.end_timeouts, ElementsAre(10000U));
}

TEST_F(UsbRequest, ThatFailsLaterGivesItsError) {
  device.request_answers[kResetPipe] = {{.error = ERROR_IO_PENDING}};
  device.overlapped_error = ERROR_GEN_FAILURE;
  EXPECT_EQ(Open(), HResultFromError(ERROR_GEN_FAILURE));
}

TEST_F(UsbRequest, WithoutAnAnswerEndsTheOpening) {
  device.request_answers[kBindPipe] = {{.error = ERROR_IO_PENDING}};
  device.hangs = true;
  EXPECT_EQ(Open(), kTimedOut);
  EXPECT_THAT(device.end_timeouts, ElementsAre(10000U, 5000U));
  EXPECT_THAT(report.Lines(), Contains("CUSBConnection::Request - no answer to 0x80942078"));
  EXPECT_THAT(report.Lines(), Contains(std::string(kKept) + " []"));
}

// Each try of the descriptor's first bytes that fails gives the plain number, as other errors do.
TEST_F(UsbRequest, ForTheDescriptorWithoutAnAnswerIsNoFailure) {
  device.request_answers[kGetDescriptor] = {{.error = ERROR_IO_PENDING}};
  device.hangs = true;
  EXPECT_EQ(Open(), static_cast<HRESULT>(ERROR_TIMEOUT));
}

// A device that never stops sending.
class TickingDevice : public FakeDevice {
 public:
  explicit TickingDevice(ManualClock& clock) : clock_(clock) {}
  size_t reads = 0;
  DWORD read_takes_ms = 1;

  BOOL ReadFile(HANDLE device, void* to, DWORD length, DWORD* read, OVERLAPPED* block) override {
    ++reads;
    clock_.now += read_takes_ms;
    return FakeDevice::ReadFile(device, to, length, read, block);
  }

 private:
  ManualClock& clock_;
};

TEST(UsbFlushOfADeviceThatDoesNotStop, EndsAfter3Seconds) {
  const ReportCapture report;
  ManualClock clock;
  clock.now = 0xFFFFFF00;  // the clock wraps meanwhile
  TickingDevice device(clock);
  const std::string descriptors =
      DeviceBytes({EndpointBytes(0x02, kBulk), EndpointBytes(0x83, kBulk)});
  device.request_answers[kGetDescriptor] = {{.output = descriptors}, {.output = descriptors}};
  CUSBConnection connection(device);
  ASSERT_EQ(connection.Open(kPath), S_OK);
  device.transferred = 1;
  EXPECT_EQ(connection.Flush(), S_OK);
  EXPECT_EQ(device.reads, 3001U);
  EXPECT_EQ(
      report.Lines().back(),
      "CUSBConnection::Flush - the device does not stop sending [" + std::string(kName) + "]");
}

}  // namespace
