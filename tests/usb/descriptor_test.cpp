// How a simulated USB device describes itself, and how it is configured.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/host/support/simulated_usb.h"
#include "tests/usb/usb_host.h"

namespace {

using testing::HasSubstr;
using usb_host::Bytes;
using usb_host::Configuration;
using usb_host::DescriptorRequest;
using usb_host::File;
using usb_host::kGetDescriptor;
using usb_host::kSetConfiguration;
using usb_host::Result;

constexpr size_t kHeader = 9;
constexpr size_t kRoom = 512;
constexpr DWORD kDone = ERROR_SUCCESS;
constexpr DWORD kInvalid = ERROR_INVALID_PARAMETER;
constexpr DWORD kWrongState = ERROR_BAD_COMMAND;

const Bytes kConfigurationPart = {9, 2, 32, 0, 1, 1, 0, 0x80, 50};
const Bytes kInterfacePart = {9, 4, 0, 0, 2, 0xFF, 0, 0, 0};
const Bytes kInPart = {7, 5, 0x81, 2, 64, 0, 0};
const Bytes kOutPart = {7, 5, 0x02, 2, 64, 0, 0};

Bytes Joined(const std::vector<Bytes>& parts) {
  Bytes all;
  for (const Bytes& part : parts) all.insert(all.end(), part.begin(), part.end());
  return all;
}

class UsbDescriptor : public testing::Test {
 protected:
  // A device with these switches, and one handle of it.
  void Plug(std::vector<std::string> switches = {}) {
    switches.insert(switches.begin(), "quorin");
    usb_.emplace(switches);
    file_.emplace(usb_->device(), GENERIC_READ);
    ASSERT_TRUE(file_->open());
  }
  Result Get(size_t room = kRoom) const {
    return file_->Control(kGetDescriptor, DescriptorRequest(), room);
  }
  Bytes Descriptor() const { return Get().bytes; }
  DWORD Configure(const Bytes& input) const {
    return file_->Control(kSetConfiguration, input).error;
  }

  std::optional<bed::SimulatedUsb> usb_;
  std::optional<File> file_;
};

TEST_F(UsbDescriptor, IsWhatTheDeviceHas) {
  Plug();
  const Result result = Get();
  EXPECT_EQ(result.error, kDone);
  EXPECT_EQ(result.bytes, Joined({kConfigurationPart, kInterfacePart, kInPart, kOutPart}));
}

TEST_F(UsbDescriptor, IsCutToTheRoom) {
  Plug();
  EXPECT_EQ(Get(kHeader).bytes, kConfigurationPart);
  EXPECT_EQ(Get(1).bytes, Bytes{9});
  EXPECT_EQ(Get(33).bytes.size(), 32U);
  EXPECT_EQ(Get(32).bytes.size(), 32U);
  EXPECT_EQ(Get(0).error, kDone);
  EXPECT_THAT(usb_->Transcript(),
              HasSubstr("- descriptor 9\n- descriptor 1\n- descriptor 32\n- descriptor 32\n"));
}

TEST_F(UsbDescriptor, RefusesWrongRequests) {
  Plug();
  const Bytes right = DescriptorRequest();
  Bytes long_request = right;
  long_request.push_back(0);
  const Bytes short_request(right.begin(), right.end() - 1);
  for (const Bytes& wrong : {DescriptorRequest(/*type=*/1),
                             DescriptorRequest(2, /*index=*/1),
                             DescriptorRequest(2, 0, /*recipient=*/1),
                             short_request,
                             long_request,
                             Bytes()}) {
    const Result result = file_->Control(kGetDescriptor, wrong, kRoom);
    EXPECT_EQ(result.error, kInvalid);
    EXPECT_TRUE(result.bytes.empty());
  }
  EXPECT_THAT(usb_->Transcript(), HasSubstr("- refused descriptor\n"));
}

TEST_F(UsbDescriptor, HasOtherEndpoints) {
  Plug({"--endpoints", "0x84:interrupt,0x02,0x83"});
  EXPECT_EQ(Descriptor(),
            Joined({{9, 2, 39, 0, 1, 1, 0, 0x80, 50},
                    {9, 4, 0, 0, 3, 0xFF, 0, 0, 0},
                    {7, 5, 0x84, 3, 16, 0, 10},
                    {7, 5, 0x02, 2, 64, 0, 0},
                    {7, 5, 0x83, 2, 64, 0, 0}}));
}

TEST_F(UsbDescriptor, HasOneEndpoint) {
  Plug({"--one-endpoint"});
  EXPECT_EQ(Descriptor(),
            Joined({{9, 2, 25, 0, 1, 1, 0, 0x80, 50}, {9, 4, 0, 0, 1, 0xFF, 0, 0, 0}, kInPart}));
}

TEST_F(UsbDescriptor, HasPartsOfAClass) {
  Plug({"--class-descriptor"});
  EXPECT_EQ(Descriptor(),
            Joined({{9, 2, 41, 0, 1, 1, 0, 0x80, 50},
                    kInterfacePart,
                    {5, 0x24, 0x00, 0x10, 0x01},
                    {4, 0x24, 0x02, 0x02},
                    kInPart,
                    kOutPart}));
}

TEST_F(UsbDescriptor, HasLongEndpoints) {
  Plug({"--endpoint-length", "9"});
  EXPECT_EQ(Descriptor(),
            Joined({{9, 2, 36, 0, 1, 1, 0, 0x80, 50},
                    kInterfacePart,
                    {9, 5, 0x81, 2, 64, 0, 0, 0, 0},
                    {9, 5, 0x02, 2, 64, 0, 0, 0, 0}}));
}

TEST_F(UsbDescriptor, MayHaveEndpointsWithoutLength) {
  Plug({"--endpoint-length", "0"});
  EXPECT_EQ(Descriptor(),
            Joined({kConfigurationPart,
                    kInterfacePart,
                    {0, 5, 0x81, 2, 64, 0, 0},
                    {0, 5, 0x02, 2, 64, 0, 0}}));
}

TEST_F(UsbDescriptor, MayHaveAWrongTotalLength) {
  Plug({"--total-length", "770"});
  EXPECT_EQ(Descriptor(),
            Joined({{9, 2, 2, 3, 1, 1, 0, 0x80, 50}, kInterfacePart, kInPart, kOutPart}));
}

TEST_F(UsbDescriptor, IsShort) {
  Plug({"--short-descriptor", "5"});
  EXPECT_EQ(Get(kHeader).bytes.size(), 5U);
  EXPECT_EQ(Get(kRoom).bytes.size(), 5U);
  EXPECT_EQ(Get(2).bytes.size(), 2U);
}

TEST_F(UsbDescriptor, IsRefusedForItsHeader) {
  Plug({"--refuse-descriptor", "header"});
  EXPECT_EQ(Get(kHeader).error, kInvalid);
  EXPECT_EQ(Get(kHeader).error, kInvalid);
  EXPECT_EQ(Get(kHeader + 1).error, kDone);
}

TEST_F(UsbDescriptor, IsRefusedAsAWholeOnce) {
  Plug({"--refuse-descriptor", "whole@1"});
  EXPECT_EQ(Get(kHeader).error, kDone);
  EXPECT_EQ(Get().error, kInvalid);
  EXPECT_EQ(Get().error, kDone);
}

TEST_F(UsbDescriptor, IsConfiguredOnce) {
  Plug();
  EXPECT_EQ(file_->Configure(/*transfer=*/70'000), kDone);
  EXPECT_EQ(file_->Configure(), kWrongState);
  EXPECT_EQ(usb_->Transcript(), "= configuration transfer=70000\n- refused configuration\n");
}

TEST_F(UsbDescriptor, StaysConfiguredForOtherHandles) {
  Plug();
  EXPECT_EQ(file_->Configure(), kDone);
  file_->Close();
  const File other(usb_->device(), GENERIC_READ);
  EXPECT_EQ(other.Configure(), kWrongState);
  EXPECT_EQ(other.Bind(0x81), kDone);
}

TEST_F(UsbDescriptor, IsConfiguredFromTheStart) {
  Plug({"--configured"});
  EXPECT_EQ(file_->Configure(), kWrongState);
  EXPECT_EQ(file_->Bind(0x81), kDone);
}

TEST_F(UsbDescriptor, RefusesWrongConfigurations) {
  Plug();
  const Bytes right = Configuration();
  Bytes long_input = right;
  long_input.push_back(0);
  const Bytes short_input(right.begin(), right.end() - 1);
  Bytes other_interface = right;
  other_interface[4] = 1;
  Bytes other_setting = right;
  other_setting[6] = 1;
  EXPECT_EQ(Configure(long_input), kInvalid);
  EXPECT_EQ(Configure(short_input), kInvalid);
  EXPECT_EQ(Configure({}), kInvalid);
  EXPECT_EQ(Configure(Configuration(4096, /*index=*/1)), kInvalid);
  EXPECT_EQ(Configure(Configuration(4096, 0, /*interfaces=*/0)), kInvalid);
  EXPECT_EQ(Configure(Configuration(4096, 0, /*interfaces=*/33)), kInvalid);
  EXPECT_EQ(Configure(other_interface), kInvalid);
  EXPECT_EQ(Configure(other_setting), kInvalid);
  EXPECT_EQ(Configure(right), kDone);
}

}  // namespace
