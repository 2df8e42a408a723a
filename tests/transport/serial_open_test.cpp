// What CSerialConnection::Open does and traces when it cannot clear the port.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "platform/hresult.h"
#include "tests/support/fake_device.h"
#include "tests/support/report_capture.h"
#include "transport/serial_connection.h"

namespace {

using testing::ElementsAre;

class SerialOpenWhoseFlushFails : public testing::TestWithParam<const char*> {
 protected:
  SerialOpenWhoseFlushFails() {
    device.failing_call = GetParam();
    device.failure = ERROR_GEN_FAILURE;
    settings.DCBlength = sizeof(DCB);
    settings.BaudRate = 19200;
    settings.ByteSize = 8;
  }
  HRESULT Open() { return connection.Open(L"COM12", &settings); }

  ReportCapture report;
  FakeDevice device;
  CSerialConnection connection{device};
  DCB settings{};
};

TEST_P(SerialOpenWhoseFlushFails, TracesItAndGoesOn) {
  EXPECT_EQ(Open(), S_OK);
  EXPECT_THAT(
      report.Lines(),
      ElementsAre("CAbstractConnection::Cancel []",
                  "CSerialConnection::Flush",
                  "CSerialConnection::Flush - " + std::string(GetParam()) + " failed [31] [COM12]",
                  "CSerialConnection::Open - OK [COM12]"));
}

TEST_P(SerialOpenWhoseFlushFails, StillMakesEveryCall) {
  Open();
  EXPECT_THAT(device.calls,
              ElementsAre("CreateFile",
                          "SetCommMask",
                          "SetupComm",
                          "ClearCommError",
                          "PurgeComm",
                          "GetCommState",
                          "SetCommState",
                          "SetCommTimeouts"));
}

TEST_P(SerialOpenWhoseFlushFails, LeavesAPortThatCanBeUsed) {
  Open();
  DWORD speed = 0;
  EXPECT_EQ(connection.GetSpeed(&speed), S_OK);
  EXPECT_EQ(speed, 19200u);
  ASSERT_EQ(device.set_states.size(), 1u);
  EXPECT_EQ(device.set_states[0].BaudRate, 19200u);
  EXPECT_NE(connection.GetReadHandle(), INVALID_HANDLE_VALUE);
  const char byte = 'x';
  EXPECT_EQ(connection.Write(&byte, 1, 0), S_OK);
}

INSTANTIATE_TEST_SUITE_P(Calls,
                         SerialOpenWhoseFlushFails,
                         testing::Values("ClearCommError", "PurgeComm"),
                         [](const auto& call) { return std::string(call.param); });

// Earlier errors of the line are traced and then cleared.
TEST(SerialOpen, TracesErrorsOfTheLineAndGoesOn) {
  const ReportCapture report;
  FakeDevice device;
  device.line = {{CE_FRAME | CE_RXPARITY, 0}};
  CSerialConnection connection(device);
  const DCB settings{};
  EXPECT_EQ(connection.Open(L"COM12", &settings), S_OK);
  EXPECT_THAT(report.Lines(),
              ElementsAre("CAbstractConnection::Cancel []",
                          "CSerialConnection::Flush",
                          "CSerialConnection::Flush - error detected [The hardware detected a "
                          "framing error.] [COM12]",
                          "CSerialConnection::Flush - error detected [The hardware detected a "
                          "parity error.] [COM12]",
                          "CSerialConnection::Open - OK [COM12]"));
}

}  // namespace
