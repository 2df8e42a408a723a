#include "simulator/usb/device.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include "simulator/quorin/receiver.h"
#include "simulator/usb/interface.h"
#include "tests/simulator/session.h"

namespace sim {
namespace {

using usb_bus::Action;
using usb_bus::ActionKind;
using usb_bus::Reads;
using usb_bus::Request;
using usb_bus::RequestKind;

constexpr uint32_t kReader = 1;  // handles of the host
constexpr uint32_t kWriter = 2;
constexpr uint32_t kRoom = 512;

const Bytes kDescriptorRequest = {0, 0, 0, 0, 2, 0, 0, 0};

struct Acted {
  Action action{};
  Bytes bytes;
};

std::vector<Acted> Split(const Bytes& actions) {
  std::vector<Acted> all;
  for (size_t at = 0; at < actions.size();) {
    Acted acted;
    std::memcpy(&acted.action, actions.data() + at, sizeof(Action));
    const auto bytes = actions.begin() + static_cast<std::ptrdiff_t>(at + sizeof(Action));
    acted.bytes.assign(bytes, bytes + acted.action.length);
    at += usb_bus::Aligned(sizeof(Action) + acted.action.length);
    all.push_back(acted);
  }
  return all;
}

Bytes Configuration() {
  Bytes bytes(usb::kConfigurationLength);
  bytes[usb::kInterfaceCountOffset] = 1;
  return bytes;
}

// A device with a Quorin receiver in it, and the host at its other end.
class UsbDeviceTest : public testing::Test {
 protected:
  std::vector<Acted> Take(RequestKind kind,
                          uint32_t handle,
                          const Bytes& bytes = {},
                          uint32_t code = 0,
                          uint32_t room = kRoom) {
    Request request{};
    request.id = ++last_id;
    request.handle = handle;
    request.kind = kind;
    request.control_code = code;
    request.length = static_cast<uint32_t>(bytes.size());
    request.room = room;
    device().Take(request, bytes, now_ms);
    return Split(device().TakeActions());
  }
  // The answer to a request that is answered at once.
  Acted Ask(RequestKind kind, uint32_t handle, const Bytes& bytes = {}, uint32_t code = 0) {
    const std::vector<Acted> acted = Take(kind, handle, bytes, code);
    EXPECT_EQ(acted.size(), 1U);
    if (acted.size() != 1) return {};
    EXPECT_EQ(acted[0].action.kind, ActionKind::kAnswer);
    EXPECT_EQ(acted[0].action.id, last_id);
    return acted[0];
  }
  uint32_t Control(uint32_t handle, uint32_t code, const Bytes& bytes = {}) {
    return Ask(RequestKind::kControl, handle, bytes, code).action.status;
  }
  uint32_t Configure() { return Control(kReader, usb::kSetConfiguration, Configuration()); }
  uint32_t Bind(uint32_t handle, uint8_t address) {
    return Control(handle, usb::kBindPipe, {address});
  }
  // Configured, and both ends bound.
  void Connect() {
    EXPECT_EQ(Configure(), usb::kSuccess);
    EXPECT_EQ(Bind(kReader, kDefaultInEndpoint), usb::kSuccess);
    EXPECT_EQ(Bind(kWriter, kDefaultOutEndpoint), usb::kSuccess);
  }
  Acted Write(const std::string& text) { return Ask(RequestKind::kWrite, kWriter, ToBytes(text)); }
  // What one call sends to the host, transfer by transfer.
  std::vector<std::string> SendDue() {
    device().SendDue(now_ms);
    std::vector<std::string> transfers;
    for (const Acted& acted : Split(device().TakeActions())) {
      EXPECT_EQ(acted.action.kind, ActionKind::kSend);
      transfers.push_back(ToText(acted.bytes));
    }
    return transfers;
  }
  UsbDevice& device() {
    if (!device_) {
      receiver_.emplace(quorin, OneFile(1100));
      device_.emplace(options, *receiver_, transcript);
    }
    return *device_;
  }

  // To be set before the first request.
  UsbOptions options;
  QuorinOptions quorin;

  std::ostringstream log;
  Transcript transcript{log};
  uint64_t last_id = 0;
  uint64_t now_ms = 0;

 private:
  std::optional<QuorinReceiver> receiver_;
  std::optional<UsbDevice> device_;
};

TEST_F(UsbDeviceTest, GivesAsMuchOfItsDescriptorAsThereIsRoomFor) {
  const Bytes whole = MakeConfigurationDescriptor({});
  for (const size_t room : {size_t{9}, whole.size() - 1, whole.size(), size_t{512}}) {
    const auto acted = Take(RequestKind::kControl,
                            kReader,
                            kDescriptorRequest,
                            usb::kGetDescriptor,
                            static_cast<uint32_t>(room));
    ASSERT_EQ(acted.size(), 1U);
    const size_t length = std::min(room, whole.size());
    EXPECT_EQ(acted[0].bytes, Bytes(whole.begin(), whole.begin() + static_cast<int>(length)));
    EXPECT_EQ(acted[0].action.count, length);
  }
}

TEST_F(UsbDeviceTest, RefusesOtherDescriptors) {
  for (const size_t place : {usb::kRecipientOffset, usb::kTypeOffset, usb::kIndexOffset}) {
    Bytes request = kDescriptorRequest;
    ++request[place];
    EXPECT_EQ(Control(kReader, usb::kGetDescriptor, request), usb::kInvalidParameter) << place;
  }
  EXPECT_EQ(Control(kReader, usb::kGetDescriptor, {0, 0}), usb::kInvalidParameter);
}

TEST_F(UsbDeviceTest, MayGiveLessOfItsDescriptorOrRefuseIt) {
  options.faults.short_descriptor = 4;
  options.faults.descriptors = {{DescriptorPart::kWhole, kOnce}};
  EXPECT_EQ(Control(kReader, usb::kGetDescriptor, kDescriptorRequest), usb::kInvalidParameter);
  EXPECT_EQ(
      Ask(RequestKind::kControl, kReader, kDescriptorRequest, usb::kGetDescriptor).bytes.size(),
      4U);
}

TEST_F(UsbDeviceTest, IsConfiguredOnce) {
  Bytes wrong = Configuration();
  wrong[usb::kInterfacesOffset] = 1;
  EXPECT_EQ(Control(kReader, usb::kSetConfiguration, wrong), usb::kInvalidParameter);
  EXPECT_EQ(Control(kReader, usb::kSetConfiguration, {1}), usb::kInvalidParameter);
  EXPECT_EQ(Configure(), usb::kSuccess);
  EXPECT_EQ(Configure(), usb::kInvalidDeviceState);
}

TEST_F(UsbDeviceTest, BindsAnEndpointToOneHandleOnceItIsConfigured) {
  EXPECT_EQ(Bind(kReader, kDefaultInEndpoint), usb::kInvalidDeviceState);
  Configure();
  EXPECT_EQ(Bind(kReader, 0x83), usb::kInvalidParameter);
  EXPECT_EQ(Control(kReader, usb::kBindPipe), usb::kInvalidParameter);
  EXPECT_EQ(Bind(kReader, kDefaultInEndpoint), usb::kSuccess);
  EXPECT_EQ(Bind(kReader, kDefaultOutEndpoint), usb::kInvalidDeviceState);
  EXPECT_EQ(Bind(kWriter, kDefaultInEndpoint), usb::kInvalidDeviceState);
}

TEST_F(UsbDeviceTest, MayRefuseToBindAndToReset) {
  options.configured = true;
  options.faults.binds = {{kDefaultInEndpoint, kOnce}};
  options.faults.resets = {{kDefaultInEndpoint, kOnce}};
  EXPECT_EQ(Bind(kReader, kDefaultInEndpoint), usb::kInvalidParameter);
  EXPECT_EQ(Control(kReader, usb::kResetPipe), usb::kNotBound);
  EXPECT_EQ(Bind(kReader, kDefaultInEndpoint), usb::kSuccess);
  EXPECT_EQ(Control(kReader, usb::kResetPipe), usb::kInvalidParameter);
  EXPECT_EQ(Control(kReader, usb::kResetPipe), usb::kSuccess);
}

TEST_F(UsbDeviceTest, OnlyTheReceiversEndpointGetsTransfers) {
  options.configured = true;
  options.descriptor.endpoints = {{0x83, EndpointType::kInterrupt}, {0x81}, {0x82}, {0x02}};
  const auto reads_after_bind = [&](uint32_t handle, uint8_t address) {
    return Ask(RequestKind::kControl, handle, {address}, usb::kBindPipe).action.reads;
  };
  EXPECT_EQ(reads_after_bind(1, 0x83), Reads::kUnchanged);
  EXPECT_EQ(reads_after_bind(2, 0x81), Reads::kGetTransfers);
  EXPECT_EQ(reads_after_bind(3, 0x82), Reads::kUnchanged);
  EXPECT_EQ(Ask(RequestKind::kControl, 2, {}, usb::kUnbindPipe).action.reads, Reads::kAreRequests);
}

TEST_F(UsbDeviceTest, HandsWritesToTheReceiverAndItsReplyToTheHost) {
  Connect();
  const Acted answer = Write("%1%\r\n");
  EXPECT_EQ(answer.action.status, usb::kSuccess);
  EXPECT_EQ(answer.action.count, 5U);
  EXPECT_EQ(SendDue(), std::vector<std::string>{"RE003%1%\r\n"});
  EXPECT_TRUE(SendDue().empty());
}

TEST_F(UsbDeviceTest, CutsEachMessageIntoTransfers) {
  options.transfer_length = 4;
  Connect();
  Write("%1%\r\n%2%\r\n");
  EXPECT_EQ(SendDue(), (std::vector<std::string>{"RE00", "3%1%", "\r\n"}));
  EXPECT_EQ(SendDue(), (std::vector<std::string>{"RE00", "3%2%", "\r\n"}));
}

TEST_F(UsbDeviceTest, SendsWhenItIsDue) {
  quorin.faults.replies = {{ReplyFaultKind::kSilence, "*", kOnce, /*ms=*/500}};
  Connect();
  Write("%1%\r\n");
  now_ms = 499;
  EXPECT_TRUE(SendDue().empty());
  now_ms = 500;
  EXPECT_EQ(SendDue(), std::vector<std::string>{"RE003%1%\r\n"});
}

TEST_F(UsbDeviceTest, TransfersNeedTheirEndpoint) {
  EXPECT_EQ(Write("x").action.status, usb::kNotBound);
  EXPECT_EQ(Ask(RequestKind::kRead, kReader).action.status, usb::kNotBound);
  Connect();
  EXPECT_EQ(Ask(RequestKind::kWrite, kReader, {1}).action.status, usb::kInvalidDeviceRequest);
  EXPECT_EQ(Ask(RequestKind::kRead, kWriter).action.status, usb::kInvalidDeviceRequest);
}

TEST_F(UsbDeviceTest, BytesOfAFailedWriteAreLost) {
  options.faults.writes = {{/*status=*/0xE0000001, /*after=*/1, /*times=*/kOnce}};
  Connect();
  EXPECT_EQ(Write("%1%").action.status, usb::kSuccess);
  EXPECT_EQ(Write("lost").action.status, 0xE0000001U);
  EXPECT_EQ(Write("\r\n").action.status, usb::kSuccess);
  EXPECT_EQ(SendDue(), std::vector<std::string>{"RE003%1%\r\n"});
}

TEST_F(UsbDeviceTest, OtherEndpointsAreSilent) {
  options.configured = true;
  options.descriptor.endpoints = {{0x81}, {0x02}, {0x83}, {0x04}};
  Bind(kReader, 0x83);
  Bind(kWriter, 0x04);
  EXPECT_EQ(Write("%1%\r\n").action.count, 5U);
  EXPECT_TRUE(SendDue().empty());
  EXPECT_TRUE(Take(RequestKind::kRead, kReader).empty()) << "it waits";
  const uint64_t read = last_id;

  const auto acted = Take(RequestKind::kControl, kReader, {}, usb::kUnbindPipe);
  ASSERT_EQ(acted.size(), 2U);
  EXPECT_EQ(acted[0].action.id, read);
  EXPECT_EQ(acted[0].action.status, usb::kCancelled);
  EXPECT_EQ(acted[1].action.status, usb::kSuccess);
  EXPECT_EQ(Control(kReader, usb::kUnbindPipe), usb::kNotBound);
}

TEST_F(UsbDeviceTest, AHandleThatIsClosedFreesItsEndpoint) {
  Connect();
  EXPECT_TRUE(Take(RequestKind::kClosed, kReader).empty());
  EXPECT_EQ(Bind(kReader + 2, kDefaultInEndpoint), usb::kSuccess);
}

TEST_F(UsbDeviceTest, RefusesUnknownRequests) {
  EXPECT_EQ(Control(kReader, 0x80942000), usb::kInvalidDeviceRequest);
}

TEST_F(UsbDeviceTest, RecordsWhatHappens) {
  Connect();
  Write("%1%\r\n");
  SendDue();
  Control(kReader, usb::kResetPipe);
  Control(kReader, usb::kUnbindPipe);
  Take(RequestKind::kClosed, kReader);
  Take(RequestKind::kClosed, kWriter);
  EXPECT_EQ(log.str(),
            "= configuration transfer=0\n= bind 0x81\n= bind 0x02\n= reset 0x81\n= unbind 0x81\n"
            "= close\n= close 0x02\n");
}

}  // namespace
}  // namespace sim
