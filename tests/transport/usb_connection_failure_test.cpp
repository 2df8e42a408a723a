// Openings of a device on USB that fail. The report has no line for them.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "platform/hresult.h"
#include "tests/transport/usb_connection_fixture.h"

using testing::ElementsAre;

namespace {

class UsbConnectionFailure : public UsbConnectionTest {
 protected:
  void ExpectEnd(HRESULT result, size_t requests) {
    EXPECT_EQ(Open(), result);
    EXPECT_EQ(device.requests.size(), requests);
    EXPECT_THAT(report.Lines(),
                ElementsAre("CUSBConnection::Create", "CUSBConnection::Disconnect"));
    BSTR name = nullptr;
    connection->GetName(&name);
    EXPECT_EQ(name, nullptr);
    EXPECT_TRUE(IsOpen(connection->GetWriteHandle()));  // until it is closed
    EXPECT_TRUE(IsOpen(connection->GetReadHandle()));
  }
};

TEST_F(UsbConnectionFailure, OfTheFirstDescriptorRequestIsThePlainError) {
  Fail(kGetDescriptor, {ERROR_GEN_FAILURE});
  ExpectEnd(ERROR_GEN_FAILURE, 2);
}

TEST_F(UsbConnectionFailure, OfTheFirstDescriptorRequestMayBeTheDrivers) {
  Fail(kGetDescriptor, {0xE0001005});
  ExpectEnd(static_cast<HRESULT>(0xE0001005), 2);
}

TEST_F(UsbConnectionFailure, OfADescriptorThatIsCutShortIsNoFailure) {
  GiveDescriptors(UsualDevice().substr(0, 8));
  ExpectEnd(S_FALSE, 2);
}

TEST_F(UsbConnectionFailure, OfADescriptorThatDoesNotComeIsNoFailure) {
  GiveDescriptors("");
  ExpectEnd(S_FALSE, 2);
}

TEST_F(UsbConnectionFailure, OfTheSecondDescriptorRequestIsAResult) {
  Fail(kGetDescriptor, {ERROR_SUCCESS, ERROR_GEN_FAILURE});
  device.request_answers[kGetDescriptor].front().output = UsualDevice();
  ExpectEnd(static_cast<HRESULT>(0x8007001F), 3);
}

TEST_F(UsbConnectionFailure, OfTheSecondDescriptorRequestMayBeTheDrivers) {
  Fail(kGetDescriptor, {ERROR_SUCCESS, 0xE0001005});
  device.request_answers[kGetDescriptor].front().output = UsualDevice();
  ExpectEnd(static_cast<HRESULT>(0xE0001005), 3);
}

TEST_F(UsbConnectionFailure, ToBindTheInputIsAResult) {
  Fail(kBindPipe, {ERROR_INVALID_PARAMETER});
  ExpectEnd(static_cast<HRESULT>(0x80070057), 4);
  EXPECT_EQ(Requests().back(), "bind 131 reader");
}

TEST_F(UsbConnectionFailure, ToBindTheOutputIsAResult) {
  Fail(kBindPipe, {ERROR_SUCCESS, ERROR_ACCESS_DENIED});
  ExpectEnd(static_cast<HRESULT>(0x80070005), 5);
  EXPECT_EQ(Requests().back(), "bind 2 writer");
}

TEST_F(UsbConnectionFailure, ToResetTheOutputIsAResult) {
  Fail(kResetPipe, {ERROR_GEN_FAILURE});
  ExpectEnd(static_cast<HRESULT>(0x8007001F), 6);
  EXPECT_EQ(Requests().back(), "reset writer");
}

TEST_F(UsbConnectionFailure, ToResetTheInputIsAResult) {
  Fail(kResetPipe, {ERROR_SUCCESS, kDriverNotBound});
  ExpectEnd(static_cast<HRESULT>(kDriverNotBound), 7);
  EXPECT_EQ(Requests().back(), "reset reader");
}

// Other layouts of the device: opening succeeds, but the pipes stay unbound.
TEST_F(UsbConnectionFailure, OfAClassDescriptorIsNoFailure) {
  GiveDescriptors(ConfigurationBytes(InterfaceBytes(2) + Bytes({5, 0x24, 0, 0x10, 0x01}) +
                                     EndpointBytes(0x02, kBulk) + EndpointBytes(0x83, kBulk)));
  ExpectEnd(S_FALSE, 3);
}

TEST_F(UsbConnectionFailure, OfAnEndpointOfAnotherLengthIsNoFailure) {
  GiveDescriptors(DeviceBytes({EndpointBytes(0x02, kBulk), EndpointBytes(0x83, kBulk, 9)}));
  ExpectEnd(S_FALSE, 3);
}

TEST_F(UsbConnectionFailure, OfASingleEndpointIsNoFailure) {
  GiveDescriptors(DeviceBytes({EndpointBytes(0x02, kBulk)}));
  ExpectEnd(S_FALSE, 3);
}

class UsbConnectionTotalLength : public UsbConnectionFailure,
                                 public testing::WithParamInterface<uint16_t> {};

// The device sends its whole descriptor, whatever length it announced.
TEST_P(UsbConnectionTotalLength, ThatIsWrongIsNoFailure) {
  std::string bytes = UsualDevice();
  bytes[2] = static_cast<char>(GetParam() & 0xFF);
  bytes[3] = static_cast<char>(GetParam() >> 8);
  GiveDescriptors(bytes);
  ExpectEnd(S_FALSE, 3);
  EXPECT_EQ(device.requests.back().output_size, GetParam());
}

INSTANTIATE_TEST_SUITE_P(Lengths,
                         UsbConnectionTotalLength,
                         testing::Values(0, 1, 8, 9, 13, 25, 31, 33, 39, 288, 0xFFFF));

TEST_F(UsbConnectionFailure, OfADescriptorThatComesIncompleteTheSecondTimeIsNoFailure) {
  device.request_answers[kGetDescriptor][1].output = UsualDevice().substr(0, 25);
  ExpectEnd(S_FALSE, 3);
}

TEST_F(UsbConnectionFailure, IsTracedWithoutANameWhenItIsClosed) {
  GiveDescriptors("");
  Open();
  EXPECT_EQ(connection->Disconnect(), S_OK);
  EXPECT_TRUE(report.Has("CAbstractConnection::Cancel []"));
  EXPECT_TRUE(report.Has("CAbstractConnection::Disconnect - disconnected [(null)]"));
}

TEST_F(UsbConnectionFailure, LeavesAConnectionThatCanBeRead) {
  GiveDescriptors("");
  EXPECT_EQ(Open(), S_FALSE);
  device.transfer_error = kDriverNotBound;
  EXPECT_EQ(Read(), static_cast<HRESULT>(kDriverNotBound));
  EXPECT_EQ(device.transfer_calls.back().device, ReadHandle());
}

}  // namespace
