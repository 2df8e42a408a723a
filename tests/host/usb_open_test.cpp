// Finding a receiver on USB, through a driver that answers as the real one does.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <ostream>
#include <string>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"

using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;

namespace {

constexpr const char* kTryToContinue =
    "CUSBConnection::Create - DeviceIoControl(IOCTL_USBIO_SET_CONFIGURATION) is failed [";

// The requests to the device, in order, up to the first byte that is sent.
host::Lines RequestsOf(const bed::SimulatedUsb& usb) {
  host::Lines requests;
  for (const std::string& line : host::WireLines(usb.Transcript())) {
    if (line.starts_with("> ")) break;
    requests.push_back(line);
  }
  return requests;
}

class ApiUsb : public testing::Test {
 protected:
  HRESULT Create(const bed::SimulatedUsb& usb,
                 EProtocol protocol = eProtocolQuorin,
                 HANDLE abort_event = nullptr) {
    std::wstring device = usb.device();
    return devapi::CreateReceiverOnUSB(device.data(), protocol, abort_event, receiver_.out());
  }
  HRESULT Search(const bed::SimulatedUsb& usb, EInstanceType type, EProtocol protocol) {
    std::wstring device = usb.device();
    return devapi::SearchReceiver(device.data(), type, protocol, nullptr, receiver_.out());
  }

  const host::Report report_;
  host::OpenReceiver receiver_;
};

TEST_F(ApiUsb, BindsAndResetsBothPipesInOrder) {
  const bed::SimulatedUsb usb({"quorin", "--id", "QU7"});
  const std::string device = host::Narrow(usb.device());
  EXPECT_EQ(Create(usb), S_OK);
  EXPECT_THAT(RequestsOf(usb),
              ElementsAre("= configuration transfer=4096",
                          "- descriptor 9",
                          "- descriptor 32",
                          "= bind 0x81",
                          "= bind 0x02",
                          "= reset 0x02",
                          "= reset 0x81"));
  EXPECT_TRUE(report_.Has("CreateReceiverOnUSB - opening USB [" + device + "]"));
  EXPECT_TRUE(report_.Has("CUSBConnection::Create - OK [" + device + "]"));
  EXPECT_TRUE(report_.Has("CreateReceiverOnUSB - Quorin receiver found [" + device + "]"));
  EXPECT_TRUE(report_.Has("CreateReceiverOnUSB - OK [" + device + "]"));
  EXPECT_EQ(receiver_.Identify().id, L"QU7");
  EXPECT_EQ(receiver_.Check(), -1);
}

TEST_F(ApiUsb, ClosingClosesBothHandles) {
  const bed::SimulatedUsb usb({"quorin"});
  EXPECT_EQ(Create(usb), S_OK);
  EXPECT_EQ(devapi::CloseReceiver(receiver_.Release()), S_OK);
  usb.WaitForTranscript("= close 0x81\n");
  usb.WaitForTranscript("= close 0x02\n");
  // It can be opened again, although it is already configured.
  EXPECT_EQ(Create(usb), S_OK);
  EXPECT_EQ(report_.LinesWith(kTryToContinue).size(), 1U);
}

// The family is ignored: only Quorin receivers are on USB.
TEST_F(ApiUsb, LooksForQuorinWhateverIsAskedFor) {
  const bed::SimulatedUsb usb({"quorin"});
  EXPECT_EQ(Search(usb, eInstanceUSB, eProtocolVelmar), S_OK);
  EXPECT_TRUE(report_.LinesWith("CSerialConnection").empty());
  EXPECT_TRUE(report_.LinesWith("CVelmarCommand").empty());
}

TEST_F(ApiUsb, ASecondSearchFindsTheRegisteredReceiver) {
  const bed::SimulatedUsb usb({"quorin"});
  EXPECT_EQ(Search(usb, eInstanceUSB, eProtocolAny), S_OK);
  host::OpenReceiver second;
  std::wstring device = usb.device();
  EXPECT_EQ(
      devapi::SearchReceiver(device.data(), eInstanceUSB, eProtocolAny, nullptr, second.out()),
      S_OK);
  EXPECT_EQ(second.get(), receiver_.get());
}

TEST_F(ApiUsb, AnyLinkGoesOnToUsb) {
  const bed::SimulatedUsb usb({"quorin"});
  EXPECT_EQ(Search(usb, eInstanceAny, eProtocolAny), S_OK);
  const std::string device = host::Narrow(usb.device());
  EXPECT_TRUE(
      report_.Has("SearchReceiver - SearchReceiverOnSerial failed[" + device + "] [0x8007007B]"));
  EXPECT_TRUE(report_.LinesWith("SearchReceiver - CreateReceiverOnUSB failed").empty());
}

TEST_F(ApiUsb, AnyLinkReportsTheFailureOfEach) {
  const bed::SimulatedUsb usb({"quorin", "--refuse-bind", "0x81"});
  const std::string device = host::Narrow(usb.device());
  EXPECT_EQ(Search(usb, eInstanceAny, eProtocolAny), static_cast<HRESULT>(0x80070057));
  EXPECT_TRUE(
      report_.Has("SearchReceiver - SearchReceiverOnSerial failed[" + device + "] [0x8007007B]"));
  EXPECT_TRUE(
      report_.Has("SearchReceiver - CreateReceiverOnUSB failed[" + device + "] [0x80070057]"));
}

TEST_F(ApiUsb, ASignalledEventEndsItAfterTheOpen) {
  const bed::SimulatedUsb usb({"quorin"});
  const host::Event event(true);
  EXPECT_EQ(Create(usb, eProtocolAny, event.get()), S_FALSE);
  EXPECT_EQ(receiver_.get(), nullptr);
  EXPECT_EQ(report_.LinesWith("CUSBConnection::Create - OK").size(), 1U);
  EXPECT_TRUE(report_.LinesWith("CreateReceiverOnUSB - looking").empty());
  usb.WaitForTranscript("= close 0x02\n");
}

TEST_F(ApiUsb, AnEventEndsTheWaitForAnAnswer) {
  const bed::SimulatedUsb usb({"quorin", "--mute", "*", "--mute", "ping"});
  host::Event event;
  auto creation = host::OnThread([&] { return Create(usb, eProtocolAny, event.get()); });
  usb.WaitForTranscript("%\\r\\n");  // it waits for the answer to its ping
  const DWORD start = GetTickCount();
  event.Set();
  EXPECT_EQ(creation.get(), S_FALSE);
  EXPECT_LT(GetTickCount() - start, 6000U) << "it waited for its time-out of 8 s";
}

TEST_F(ApiUsb, ASilentReceiverIsNone) {
  const bed::SimulatedUsb usb({"quorin", "--refuse", "*", "--refuse", "ping"});
  EXPECT_EQ(Create(usb), S_FALSE);
  EXPECT_EQ(receiver_.get(), nullptr);
}

// --- Other devices

struct Device {
  std::string name;
  std::vector<std::string> switches;
  std::vector<std::string> bindings;
};

std::ostream& operator<<(std::ostream& out, const Device& device) { return out << device.name; }

class ApiUsbServes : public ApiUsb, public testing::WithParamInterface<Device> {};

TEST_P(ApiUsbServes, TheDevice) {
  std::vector<std::string> arguments = {"quorin"};
  arguments.insert(arguments.end(), GetParam().switches.begin(), GetParam().switches.end());
  const bed::SimulatedUsb usb(arguments);
  EXPECT_EQ(Create(usb), S_OK) << usb.Transcript();
  host::Lines bindings;
  for (const std::string& line : RequestsOf(usb)) {
    if (line.starts_with("= bind")) bindings.push_back(line);
  }
  EXPECT_THAT(bindings, testing::ElementsAreArray(GetParam().bindings));
}

INSTANTIATE_TEST_SUITE_P(
    Devices,
    ApiUsbServes,
    testing::Values(
        Device{"OtherAddresses", {"--endpoints", "0x02,0x83"}, {"= bind 0x83", "= bind 0x02"}},
        Device{"InFirst", {"--endpoints", "0x84,0x03"}, {"= bind 0x84", "= bind 0x03"}},
        Device{"AnInterruptPipe",
               {"--endpoints", "0x85:interrupt,0x04,0x86"},
               {"= bind 0x86", "= bind 0x04"}},
        Device{"TheFirstOfSeveral",
               {"--endpoints", "0x01,0x81,0x02,0x82"},
               {"= bind 0x81", "= bind 0x01"}},
        Device{"AlreadyConfigured", {"--configured"}, {"= bind 0x81", "= bind 0x02"}}),
    [](const auto& device) { return device.param.name; });

struct Refusal {
  std::string name;
  std::vector<std::string> switches;
  bool fails;    // else no receiver is found
  size_t pipes;  // bound before it ended
};

std::ostream& operator<<(std::ostream& out, const Refusal& refusal) { return out << refusal.name; }

class ApiUsbRefuses : public ApiUsb, public testing::WithParamInterface<Refusal> {};

TEST_P(ApiUsbRefuses, TheDevice) {
  std::vector<std::string> arguments = {"quorin"};
  arguments.insert(arguments.end(), GetParam().switches.begin(), GetParam().switches.end());
  const bed::SimulatedUsb usb(arguments);
  const HRESULT result = Create(usb);
  EXPECT_EQ(FAILED(result), GetParam().fails) << std::hex << result;
  EXPECT_TRUE(GetParam().fails || result == S_FALSE) << std::hex << result;
  EXPECT_EQ(receiver_.get(), nullptr);
  EXPECT_THAT(report_.Lines(), Not(Contains(testing::StartsWith("CUSBConnection::Create - OK"))));
  EXPECT_EQ(host::CountStarting(RequestsOf(usb), "= bind"), GetParam().pipes) << usb.Transcript();
  // The receiver received nothing.
  const bool heard = usb.Transcript().find("> ") != std::string::npos;
  EXPECT_FALSE(heard);
  // The device is not kept open: the next search can open it, with the same result.
  EXPECT_EQ(Create(usb), result);
}

INSTANTIATE_TEST_SUITE_P(
    Devices,
    ApiUsbRefuses,
    testing::Values(Refusal{"AClassDescriptor", {"--class-descriptor"}, false, 0},
                    Refusal{"OneEndpoint", {"--one-endpoint"}, false, 0},
                    Refusal{"LongEndpoints", {"--endpoint-length", "9"}, false, 0},
                    Refusal{"ATotalLengthTooLong", {"--total-length", "60000"}, false, 0},
                    Refusal{"ATotalLengthTooShort", {"--total-length", "20"}, false, 0},
                    Refusal{"NoTotalLength", {"--total-length", "0"}, false, 0},
                    Refusal{"AShortDescriptor", {"--short-descriptor", "8"}, false, 0},
                    Refusal{"ACutDescriptor", {"--short-descriptor", "20"}, false, 0},
                    Refusal{"NoHeader", {"--refuse-descriptor", "header"}, false, 0},
                    Refusal{"NoDescriptor", {"--refuse-descriptor", "whole"}, true, 0},
                    Refusal{"NoBindIn", {"--refuse-bind", "0x81"}, true, 0},
                    Refusal{"NoBindOut", {"--refuse-bind", "0x02"}, true, 1},
                    Refusal{"NoResetOut", {"--refuse-reset", "0x02"}, true, 2},
                    Refusal{"NoResetIn", {"--refuse-reset", "0x81"}, true, 2}),
    [](const auto& refusal) { return refusal.param.name; });

// The device has neither of the default endpoints, 0x01 and 0x81, so binding fails.
TEST_F(ApiUsb, WithoutBulkPipesTheUsualAddressesAreTried) {
  const bed::SimulatedUsb usb({"quorin", "--endpoints", "0x83:interrupt,0x02:interrupt"});
  EXPECT_TRUE(FAILED(Create(usb)));
}

TEST_F(ApiUsb, TheDriversOwnErrorOfAWriteIsNamed) {
  const bed::SimulatedUsb usb({"quorin", "--write-error", "0xE0001009@always"});
  EXPECT_EQ(Create(usb), S_FALSE);
  EXPECT_THAT(
      host::ReadReport(report_.path()),
      HasSubstr("CUSBConnection::DumpDriveErrorDesc - USBIO_ERR_NOT_BOUND [e000100908X]\r\n"));
}

TEST_F(ApiUsb, AWriteErrorLaterOnIsTheResult) {
  const bed::SimulatedUsb usb({"quorin", "--write-error", "0xE0000002:20"});
  ASSERT_EQ(Create(usb), S_OK) << usb.Transcript();
  long result = S_OK;
  for (int i = 0; i < 20 && result == S_OK; ++i) result = receiver_.Identify().result;
  EXPECT_EQ(result, static_cast<HRESULT>(0xE0000002));
  EXPECT_THAT(
      host::ReadReport(report_.path()),
      HasSubstr("CUSBConnection::DumpDriveErrorDesc - USBIO_ERR_BTSTUFF [e000000208X]\r\n"));
}

// --- Operations

TEST_F(ApiUsb, ListsAndDeletesFiles) {
  const bed::SimulatedUsb usb({"quorin"}, {{"A.log", "a"}, {"B.log", "bb"}});
  ASSERT_EQ(Create(usb), S_OK);
  wchar_t name[] = L"A.log";
  EXPECT_EQ(devapi::DeleteFileW(receiver_.get(), name), S_OK);
  void* list = nullptr;
  ASSERT_EQ(devapi::OpenFileList(receiver_.get(), &list), S_OK);
  long count = 0;
  EXPECT_EQ(devapi::GetFilesCount(list, &count), S_OK);
  EXPECT_EQ(count, 1);
  devapi::CloseFileList(list);
}

TEST_F(ApiUsb, TwoDevicesDoNotDisturbEachOther) {
  const bed::SimulatedUsb usb({"quorin", "--id", "ONE"});
  const bed::SimulatedUsb other({"quorin", "--id", "TWO"});
  const host::UsbReceiver one(usb);
  const host::UsbReceiver two(other);
  EXPECT_EQ(one.Identify().id, L"ONE");
  EXPECT_EQ(two.Identify().id, L"TWO");
}

}  // namespace
