#include "simulator/usb/faults.h"

#include <gtest/gtest.h>

#include <stdexcept>

namespace sim {
namespace {

TEST(UsbFaultsTest, EndpointsHaveAnAddressAndAType) {
  const std::vector<Endpoint> endpoints = ParseEndpoints("0x84:interrupt,2,0x83:bulk");
  ASSERT_EQ(endpoints.size(), 3U);
  EXPECT_EQ(endpoints[0].address, 0x84);
  EXPECT_EQ(endpoints[0].type, EndpointType::kInterrupt);
  EXPECT_EQ(endpoints[1].address, 2);
  EXPECT_EQ(endpoints[1].type, EndpointType::kBulk);
  EXPECT_TRUE(endpoints[2].to_host());
}

TEST(UsbFaultsTest, TextsThatDoNotFitAreRefused) {
  EXPECT_THROW(ParseEndpoints("0x100"), std::invalid_argument);
  EXPECT_THROW(ParseEndpoints("0x81:bulky"), std::invalid_argument);
  EXPECT_THROW(ParseEndpoints("0x81,,0x02"), std::invalid_argument);
  EXPECT_THROW(ParseDescriptorRefusal("half"), std::invalid_argument);
  EXPECT_THROW(ParseDescriptorRefusal("whole@0"), std::invalid_argument);
  EXPECT_THROW(ParseEndpointRefusal("in"), std::invalid_argument);
  EXPECT_THROW(ParseEndpointRefusal("0x"), std::invalid_argument);
  EXPECT_THROW(ParseWriteError("0x40000001"), std::invalid_argument);
  EXPECT_THROW(ParseWriteError("0xE0000001:often"), std::invalid_argument);
  EXPECT_THROW(ParseWriteError("0x1E0000001"), std::invalid_argument);
}

TEST(UsbFaultsTest, RefusalsLastUnlessACountIsGiven) {
  std::vector<EndpointRefusal> refusals = {ParseEndpointRefusal("0x81"),
                                           ParseEndpointRefusal("2@2")};
  for (int i = 0; i < 3; ++i) {
    EXPECT_TRUE(TakeRefusal(refusals, 0x81));
  }
  EXPECT_TRUE(TakeRefusal(refusals, 0x02));
  EXPECT_TRUE(TakeRefusal(refusals, 0x02));
  EXPECT_FALSE(TakeRefusal(refusals, 0x02));
  EXPECT_FALSE(TakeRefusal(refusals, 0x03));
}

TEST(UsbFaultsTest, RefusalsConcernAPartOfTheDescriptor) {
  std::vector<DescriptorRefusal> refusals = {ParseDescriptorRefusal("header@1")};
  EXPECT_FALSE(TakeRefusal(refusals, DescriptorPart::kWhole));
  EXPECT_TRUE(TakeRefusal(refusals, DescriptorPart::kHeader));
  EXPECT_FALSE(TakeRefusal(refusals, DescriptorPart::kHeader));
}

TEST(UsbFaultsTest, WriteErrorsWaitForTheirWrite) {
  std::vector<WriteError> errors = {ParseWriteError("0xE0000003:2@2"),
                                    ParseWriteError("3758096386")};
  EXPECT_EQ(TakeWriteError(errors, 0), 0xE0000002);
  EXPECT_EQ(TakeWriteError(errors, 1), std::nullopt);
  EXPECT_EQ(TakeWriteError(errors, 2), 0xE0000003);
  EXPECT_EQ(TakeWriteError(errors, 2), 0xE0000003);
  EXPECT_EQ(TakeWriteError(errors, 3), std::nullopt);
}

}  // namespace
}  // namespace sim
