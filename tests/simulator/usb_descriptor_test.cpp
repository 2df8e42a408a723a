#include "simulator/usb/descriptor.h"

#include <gtest/gtest.h>

namespace sim {
namespace {

const Bytes kConfiguration = {9, 2, 32, 0, 1, 1, 0, 0x80, 50};
const Bytes kInterfaceOfTwo = {9, 4, 0, 0, 2, 0xFF, 0, 0, 0};

// The descriptor after the configuration and its interface.
Bytes EndpointsOf(const DescriptorOptions& options) {
  Bytes bytes = MakeConfigurationDescriptor(options);
  EXPECT_GE(bytes.size(), kConfiguration.size() + kInterfaceOfTwo.size());
  bytes.erase(bytes.begin(), bytes.begin() + 18);
  return bytes;
}

TEST(UsbDescriptorTest, HasAConfigurationAnInterfaceAndTwoEndpoints) {
  Bytes expected = kConfiguration;
  expected.insert(expected.end(), kInterfaceOfTwo.begin(), kInterfaceOfTwo.end());
  const Bytes endpoints = {7, 5, 0x81, 2, 64, 0, 0, 7, 5, 0x02, 2, 64, 0, 0};
  expected.insert(expected.end(), endpoints.begin(), endpoints.end());
  EXPECT_EQ(MakeConfigurationDescriptor({}), expected);
}

TEST(UsbDescriptorTest, CountsItsEndpoints) {
  DescriptorOptions options;
  options.endpoints = {{0x83}};
  const Bytes bytes = MakeConfigurationDescriptor(options);
  EXPECT_EQ(bytes[2], 25);
  EXPECT_EQ(bytes[13], 1);
}

TEST(UsbDescriptorTest, OtherEndpointsThanBulkHaveSmallPacketsAndAPollInterval) {
  DescriptorOptions options;
  options.endpoints = {{0x84, EndpointType::kInterrupt}};
  EXPECT_EQ(EndpointsOf(options), (Bytes{7, 5, 0x84, 3, 16, 0, 10}));
}

TEST(UsbDescriptorTest, PartsOfAClassComeBeforeTheEndpoints) {
  DescriptorOptions options;
  options.class_descriptor = true;
  options.endpoints = {{0x81}};
  EXPECT_EQ(EndpointsOf(options),
            (Bytes{5, 0x24, 0x00, 0x10, 0x01, 4, 0x24, 0x02, 0x02, 7, 5, 0x81, 2, 64, 0, 0}));
}

TEST(UsbDescriptorTest, LongEndpointsAreFilledUpAndShortOnesAreNotCut) {
  DescriptorOptions options;
  options.endpoints = {{0x81}};
  options.endpoint_length = 9;
  EXPECT_EQ(EndpointsOf(options), (Bytes{9, 5, 0x81, 2, 64, 0, 0, 0, 0}));
  options.endpoint_length = 0;
  EXPECT_EQ(EndpointsOf(options), (Bytes{0, 5, 0x81, 2, 64, 0, 0}));
}

TEST(UsbDescriptorTest, MayGiveAnotherTotalLength) {
  DescriptorOptions options;
  options.total_length = 0x1234;
  const Bytes bytes = MakeConfigurationDescriptor(options);
  EXPECT_EQ(bytes[2], 0x34);
  EXPECT_EQ(bytes[3], 0x12);
  EXPECT_EQ(bytes.size(), 32U);
}

}  // namespace
}  // namespace sim
