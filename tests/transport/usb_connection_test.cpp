// A device on USB is opened and closed.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <string>
#include <vector>

#include "platform/hresult.h"
#include "tests/transport/usb_connection_fixture.h"

using rcvlink::kNotConnected;

using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

using UsbConnection = UsbConnectionTest;

// Opening.
TEST_F(UsbConnection, OpensInOrder) {
  EXPECT_EQ(Open(), S_OK);
  EXPECT_THAT(device.calls,
              ElementsAre("CreateFile",
                          "CreateFile",
                          "DeviceIoControl 80942024",
                          "DeviceIoControl 80942006",
                          "DeviceIoControl 80942006",
                          "DeviceIoControl 80942078",
                          "DeviceIoControl 80942078",
                          "DeviceIoControl 80942080",
                          "DeviceIoControl 80942080"));
  EXPECT_THAT(Requests(),
              ElementsAre("configure writer",
                          "get descriptor writer",
                          "get descriptor writer",
                          "bind 131 reader",
                          "bind 2 writer",
                          "reset writer",
                          "reset reader"));
  EXPECT_THAT(report.Lines(),
              ElementsAre("CUSBConnection::Create",
                          "CUSBConnection::Disconnect",
                          Line("CUSBConnection::Create - OK [~]")));
}

TEST_F(UsbConnection, OpensTheDeviceOnceForEachDirection) {
  Open();
  ASSERT_EQ(device.openings.size(), 2U);
  EXPECT_EQ(device.openings[0].access, 0x40000000U);
  EXPECT_EQ(device.openings[1].access, 0x80000000U);
  for (const FakeDevice::Opening& opening : device.openings) {
    EXPECT_EQ(opening.path, kPath);
    EXPECT_EQ(opening.share, 0U);
    EXPECT_EQ(opening.flags, 0x40000000U);
    EXPECT_TRUE(IsOpen(opening.handle));
  }
  EXPECT_NE(WriteHandle(), ReadHandle());
  EXPECT_EQ(connection->GetWriteHandle(), WriteHandle());
  EXPECT_EQ(connection->GetReadHandle(), ReadHandle());
}

TEST_F(UsbConnection, TakesThePathAsItIs) {
  connection->Open(L"COM7");
  EXPECT_EQ(device.openings.at(0).path, L"COM7");
  EXPECT_EQ(device.openings.at(1).path, L"COM7");
}

TEST_F(UsbConnection, SelectsTheFirstConfigurationWithOneInterface) {
  Open();
  const FakeDevice::Request& request = device.requests.at(0);
  // Configuration 0, one interface; interface 0 with setting 0 and 4096 bytes a transfer.
  std::string expected = Bytes({0, 0, 1, 0, 0, 0, 0, 0, 0x00, 0x10, 0, 0});
  expected.resize(260, '\0');
  EXPECT_EQ(request.input, expected);
  EXPECT_EQ(request.output_size, 0U);
}

TEST_F(UsbConnection, AsksForTheConfigurationDescriptorThenForAllOfIt) {
  Open();
  // Of the device, 32 bits; a configuration, the first, in no language.
  const std::string expected = Bytes({0, 0, 0, 0, 2, 0, 0, 0});
  EXPECT_EQ(device.requests.at(1).input, expected);
  EXPECT_EQ(device.requests.at(1).output_size, 9U);
  EXPECT_EQ(device.requests.at(2).input, expected);
  EXPECT_EQ(device.requests.at(2).output_size, 32U);
}

TEST_F(UsbConnection, AsksForALongDescriptorWhole) {
  std::string rest = InterfaceBytes(100);
  for (int i = 0; i < 98; ++i) rest += EndpointBytes(0x81, kInterrupt);
  rest += EndpointBytes(0x04, kBulk) + EndpointBytes(0x85, kBulk);
  GiveDescriptors(ConfigurationBytes(rest));
  EXPECT_EQ(Open(), S_OK);
  EXPECT_EQ(device.requests.at(2).output_size, 718U);
  EXPECT_THAT(Requests(), Contains("bind 4 writer"));
  EXPECT_THAT(Requests(), Contains("bind 133 reader"));
}

TEST_F(UsbConnection, NamesAnEndpointInOneByteAndResetsWithoutAny) {
  Open();
  EXPECT_EQ(device.requests.at(3).input, Bytes({0x83}));
  EXPECT_EQ(device.requests.at(4).input, Bytes({0x02}));
  EXPECT_EQ(device.requests.at(5).input, "");
  EXPECT_EQ(device.requests.at(6).input, "");
  for (size_t i = 3; i < 7; ++i) EXPECT_EQ(device.requests.at(i).output_size, 0U);
}

TEST_F(UsbConnection, BindsTheUsualEndpointsOfADeviceWithoutItsOwn) {
  GiveDescriptors(DeviceBytes({EndpointBytes(0x02, kInterrupt), EndpointBytes(0x83, kBulk)}));
  EXPECT_EQ(Open(), S_OK);
  EXPECT_THAT(Requests(), Contains("bind 129 reader"));
  EXPECT_THAT(Requests(), Contains("bind 1 writer"));
}

TEST_F(UsbConnection, HasTheNameThatItWasOpenedWith) {
  BSTR name = nullptr;
  EXPECT_EQ(connection->GetName(&name), S_OK);
  EXPECT_EQ(name, nullptr);
  Open();
  EXPECT_EQ(connection->GetName(&name), S_OK);
  EXPECT_STREQ(name, kPath);
  SysFreeString(name);
}

TEST_F(UsbConnection, NeedsAPath) {
  EXPECT_EQ(connection->Open(nullptr), E_INVALIDARG);
  EXPECT_THAT(device.calls, IsEmpty());
  EXPECT_THAT(report.Lines(), ElementsAre("CUSBConnection::Create"));
  EXPECT_EQ(Read(), kNotConnected);  // its events were not made
}

TEST_F(UsbConnection, StaysOpenWhenOpenedWithoutAPath) {
  OpenForTransfers();
  EXPECT_EQ(connection->Open(nullptr), E_INVALIDARG);
  EXPECT_THAT(NewLines(), ElementsAre("CUSBConnection::Create"));
  EXPECT_TRUE(IsOpen(WriteHandle()));
  EXPECT_TRUE(IsOpen(ReadHandle()));
}

// Failures that an opening ignores.
TEST_F(UsbConnection, GoesOnWithoutTheHandles) {
  device.open_errors = {ERROR_FILE_NOT_FOUND, ERROR_ACCESS_DENIED};
  EXPECT_EQ(Open(), S_OK);
  EXPECT_THAT(report.Lines(),
              ElementsAre("CUSBConnection::Create",
                          "CUSBConnection::Disconnect",
                          "2",
                          "5",
                          Line("CUSBConnection::Create - OK [~]")));
  EXPECT_EQ(device.requests.size(), 7U);
  for (const FakeDevice::Request& request : device.requests) {
    EXPECT_EQ(request.device, INVALID_HANDLE_VALUE);
  }
}

TEST_F(UsbConnection, GoesOnWithoutTheWriteHandle) {
  device.open_errors = {0xFFFFFFFE, ERROR_SUCCESS};
  EXPECT_EQ(Open(), S_OK);
  EXPECT_TRUE(report.Has("4294967294"));
  EXPECT_EQ(connection->GetWriteHandle(), INVALID_HANDLE_VALUE);
  EXPECT_EQ(connection->GetReadHandle(), ReadHandle());
}

TEST_F(UsbConnection, GoesOnWithoutTheReadHandle) {
  device.open_errors = {ERROR_SUCCESS, ERROR_SHARING_VIOLATION};
  EXPECT_EQ(Open(), S_OK);
  EXPECT_TRUE(report.Has("32"));
  EXPECT_EQ(connection->GetWriteHandle(), WriteHandle());
  EXPECT_EQ(connection->GetReadHandle(), INVALID_HANDLE_VALUE);
}

TEST_F(UsbConnection, GoesOnWithADeviceThatCannotBeConfigured) {
  Fail(kSetConfiguration, {0xE0001001});
  EXPECT_EQ(Open(), S_OK);
  EXPECT_THAT(report.Lines(),
              ElementsAre("CUSBConnection::Create",
                          "CUSBConnection::Disconnect",
                          Line("CUSBConnection::Create - "
                               "DeviceIoControl(IOCTL_USBIO_SET_CONFIGURATION) is failed "
                               "[3758100481] [~]. Try to continue..."),
                          Line("CUSBConnection::Create - OK [~]")));
  EXPECT_EQ(device.requests.size(), 7U);
}

// Opening again and closing.
TEST_F(UsbConnection, OpeningAgainClosesFirst) {
  OpenForTransfers();
  const HANDLE old_writer = WriteHandle();
  const HANDLE old_reader = ReadHandle();
  int open_handles = 0;
  device.on_open = [&] { open_handles += IsOpen(old_writer) + IsOpen(old_reader); };
  device.open_errors = {ERROR_ACCESS_DENIED, ERROR_ACCESS_DENIED};
  device.openings.clear();
  device.requests.clear();
  GiveDescriptors(DeviceBytes({EndpointBytes(0x04, kBulk), EndpointBytes(0x85, kBulk)}));
  EXPECT_EQ(connection->Open(L"another"), S_OK);
  EXPECT_THAT(NewLines(),
              ElementsAre("CUSBConnection::Create",
                          "CUSBConnection::Disconnect",
                          Line("CAbstractConnection::Cancel [~]"),
                          Line("CAbstractConnection::Disconnect - disconnected [~]"),
                          "5",
                          "5",
                          "CUSBConnection::Create - OK [another]"));
  EXPECT_EQ(open_handles, 0);
  EXPECT_EQ(device.requests.at(3).input, Bytes({0x85}));
  EXPECT_EQ(device.requests.at(4).input, Bytes({0x04}));
}

TEST_F(UsbConnection, OpensAgainWithNewHandles) {
  Open();
  connection->Disconnect();
  device.openings.clear();
  device.requests.clear();
  GiveDescriptors(UsualDevice());
  EXPECT_EQ(Open(), S_OK);
  EXPECT_EQ(connection->GetWriteHandle(), WriteHandle());
  EXPECT_EQ(connection->GetReadHandle(), ReadHandle());
  EXPECT_EQ(device.openings.size(), 2U);
  EXPECT_EQ(device.requests.size(), 7U);
}

TEST_F(UsbConnection, KeepsItsOldNameWhenItCannotBeOpenedAgain) {
  OpenForTransfers();
  GiveDescriptors("");
  EXPECT_EQ(connection->Open(L"another"), S_FALSE);
  BSTR name = nullptr;
  connection->GetName(&name);
  EXPECT_STREQ(name, kPath);
  SysFreeString(name);
}

TEST_F(UsbConnection, ClosesBothHandles) {
  OpenForTransfers();
  EXPECT_EQ(connection->Disconnect(), S_OK);
  EXPECT_THAT(NewLines(),
              ElementsAre("CUSBConnection::Disconnect",
                          Line("CAbstractConnection::Cancel [~]"),
                          Line("CAbstractConnection::Disconnect - disconnected [~]")));
  EXPECT_THAT(device.calls, IsEmpty());  // the pipes are not unbound
  EXPECT_FALSE(IsOpen(WriteHandle()));
  EXPECT_FALSE(IsOpen(ReadHandle()));
  EXPECT_EQ(connection->GetWriteHandle(), INVALID_HANDLE_VALUE);
  EXPECT_EQ(connection->GetReadHandle(), INVALID_HANDLE_VALUE);
}

TEST_F(UsbConnection, ClosesItsHandlesOnce) {
  OpenForTransfers();
  connection->Disconnect();
  lines_before = report.Lines().size();
  EXPECT_EQ(connection->Disconnect(), S_OK);
  EXPECT_THAT(NewLines(),
              ElementsAre("CUSBConnection::Disconnect", Line("CAbstractConnection::Cancel [~]")));
}

TEST_F(UsbConnection, ThatWasNeverOpenedHasNothingToClose) {
  EXPECT_EQ(connection->Disconnect(), S_OK);
  EXPECT_THAT(report.Lines(), ElementsAre("CUSBConnection::Disconnect"));
  connection->SetLinkState(u'2');
  EXPECT_EQ(connection->Disconnect(), S_OK);
  EXPECT_THAT(device.calls, IsEmpty());
}

TEST_F(UsbConnection, IsClosedWhenItGoes) {
  OpenForTransfers();
  connection.reset();
  EXPECT_THAT(NewLines(),
              ElementsAre("CUSBConnection::Disconnect",
                          Line("CAbstractConnection::Cancel [~]"),
                          Line("CAbstractConnection::Disconnect - disconnected [~]")));
  EXPECT_FALSE(IsOpen(WriteHandle()));
  EXPECT_FALSE(IsOpen(ReadHandle()));
}

TEST_F(UsbConnection, ClearsACancelWhenItIsClosed) {
  OpenForTransfers();
  connection->Cancel();
  connection->Disconnect();
  EXPECT_EQ(WaitForSingleObject(connection->GetAbortEvent(), 0), WAIT_TIMEOUT);
}

// The state that would have the pipe unbound.
TEST_F(UsbConnection, IsOfStateZeroForever) {
  EXPECT_EQ(connection->LinkState(), u'0');
  Open();
  EXPECT_EQ(connection->LinkState(), u'0');
  connection->Disconnect();
  EXPECT_EQ(connection->LinkState(), u'0');
}

TEST_F(UsbConnection, UnbindsAtStateTwoBeforeAnythingIsClosed) {
  OpenForTransfers();
  device.requests.clear();
  connection->SetLinkState(u'2');
  Fail(kUnbindPipe, {ERROR_GEN_FAILURE});
  std::vector<std::string> lines;
  bool both_open = false;
  device.on_request = [&](const FakeDevice::Request&) {
    lines = NewLines();
    both_open = IsOpen(WriteHandle()) && IsOpen(ReadHandle());
  };
  EXPECT_EQ(connection->Disconnect(), S_OK);
  EXPECT_THAT(Requests(), ElementsAre("unbind writer"));
  EXPECT_EQ(device.requests.at(0).input, "");
  EXPECT_EQ(device.requests.at(0).output_size, 0U);
  EXPECT_THAT(lines, ElementsAre("CUSBConnection::Disconnect"));
  EXPECT_TRUE(both_open);
  EXPECT_FALSE(IsOpen(WriteHandle()));
  EXPECT_FALSE(IsOpen(ReadHandle()));
}

TEST_F(UsbConnection, UnbindsAtNoOtherState) {
  for (const char16_t state : {u'0', u'1', u'3', u'\0', u'\x02', u'\x3232'}) {
    GiveDescriptors(UsualDevice());
    Open();
    device.requests.clear();
    connection->SetLinkState(state);
    connection->Disconnect();
    EXPECT_THAT(device.requests, IsEmpty()) << static_cast<int>(state);
  }
}

// The events.
TEST_F(UsbConnection, MakesItsEventsOnce) {
  std::vector<std::array<HANDLE, 2>> waited;
  device.transfer_error = ERROR_IO_PENDING;
  device.on_wait = [&](DWORD, const HANDLE* handles) {
    waited.push_back({handles[0], handles[1]});
  };
  for (int i = 0; i < 2; ++i) {
    GiveDescriptors(UsualDevice());
    ASSERT_EQ(Open(), S_OK);
    Read();
    Write();
  }
  ASSERT_EQ(waited.size(), 4U);
  const auto [cancel, read] = waited[0];
  const auto [same_cancel, write] = waited[1];
  EXPECT_EQ(cancel, same_cancel);
  EXPECT_NE(read, write);
  EXPECT_EQ(waited[2], waited[0]);
  EXPECT_EQ(waited[3], waited[1]);
}

TEST_F(UsbConnection, HasEventsOfTheirKinds) {
  // Whether the event stays signalled once somebody has waited for it.
  const auto is_manual = [](HANDLE event) {
    SetEvent(event);
    WaitForSingleObject(event, 0);
    return WaitForSingleObject(event, 0) == WAIT_OBJECT_0;
  };
  std::vector<bool> manual;
  device.transfer_error = ERROR_IO_PENDING;
  device.on_wait = [&](DWORD, const HANDLE* handles) {
    manual.push_back(is_manual(handles[0]));
    manual.push_back(is_manual(handles[1]));
  };
  Open();
  Read();
  Write();
  EXPECT_THAT(manual, ElementsAre(false, true, false, false));
}

// The kind of connection.
TEST_F(UsbConnection, IsOfUsb) {
  EInstanceType type = eInstanceAny;
  EXPECT_EQ(connection->GetInstanceType(&type), S_OK);
  EXPECT_EQ(static_cast<int>(type), 2);
}

TEST_F(UsbConnection, HasNoSpeed) {
  OpenForTransfers();
  DWORD speed = 99;
  EXPECT_EQ(connection->GetSpeed(&speed), S_FALSE);
  EXPECT_EQ(speed, 0U);
  EXPECT_EQ(connection->SetSpeed(115200), S_FALSE);
  speed = 99;
  EXPECT_EQ(connection->GetSpeed(&speed), S_FALSE);
  EXPECT_EQ(speed, 0U);
  EXPECT_THAT(device.calls, IsEmpty());
  EXPECT_THAT(NewLines(), IsEmpty());
}

TEST_F(UsbConnection, HasNothingToSweep) {
  EXPECT_EQ(connection->Connect(kPath, nullptr, nullptr), E_NOTIMPL);
  EXPECT_EQ(connection->Connect(nullptr, nullptr, nullptr), E_NOTIMPL);
  EXPECT_THAT(device.calls, IsEmpty());
  EXPECT_THAT(report.Lines(), IsEmpty());
}

}  // namespace
