#include "transport/usb_descriptors.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <initializer_list>
#include <optional>
#include <string>

#include "tests/support/guarded_bytes.h"
#include "tests/transport/descriptor_bytes.h"

using rcvlink::BulkEndpoints;
using rcvlink::FindBulkEndpoints;
using rcvlink::TotalLength;

namespace {

using Found = std::optional<BulkEndpoints>;

constexpr Found kNone = std::nullopt;
constexpr Found kDefaults = BulkEndpoints{0x01, 0x81};

Found Endpoints(uint8_t out, uint8_t in) { return BulkEndpoints{out, in}; }

// After the bytes is a page that cannot be read.
Found Find(const std::string& descriptors) {
  const GuardedBytes guarded(descriptors);
  const std::string_view bytes = guarded.View();
  return FindBulkEndpoints({reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size()});
}

// The usual device.
std::string Good() { return DeviceBytes({EndpointBytes(0x02, kBulk), EndpointBytes(0x83, kBulk)}); }

TEST(UsbTotalLength, IsLittleEndian) {
  const auto total = [](uint8_t low, uint8_t high) {
    const std::array<uint8_t, 9> head = {0xF1, 0xF2, low, high, 0xF3, 0xF4, 0xF5, 0xF6, 0xF7};
    return TotalLength(head);
  };
  EXPECT_EQ(total(0x20, 0x00), 32U);
  EXPECT_EQ(total(0x02, 0x01), 258U);
  EXPECT_EQ(total(0x00, 0x80), 0x8000U);
  EXPECT_EQ(total(0xFF, 0xFF), 0xFFFFU);
  EXPECT_EQ(total(0x00, 0x00), 0U);
}

TEST(UsbDescriptors, NameTheTwoEndpoints) { EXPECT_EQ(Find(Good()), Endpoints(0x02, 0x83)); }

TEST(UsbDescriptors, MayNameTheInputFirst) {
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x85, kBulk), EndpointBytes(0x04, kBulk)})),
            Endpoints(0x04, 0x85));
}

TEST(UsbDescriptors, HaveTheDirectionInTheTopBitAlone) {
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x7F, kBulk), EndpointBytes(0x80, kBulk)})),
            Endpoints(0x7F, 0x80));
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0xFF, kBulk), EndpointBytes(0x00, kBulk)})),
            Endpoints(0x00, 0xFF));
}

TEST(UsbDescriptors, MayHaveEndpointsOfOtherKinds) {
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x81, kInterrupt),
                              EndpointBytes(0x01, kIsochronous),
                              EndpointBytes(0x02, kBulk),
                              EndpointBytes(0x84, kControl),
                              EndpointBytes(0x85, kIsochronous),
                              EndpointBytes(0x86, kBulk),
                              EndpointBytes(0x07, kInterrupt)})),
            Endpoints(0x02, 0x86));
}

TEST(UsbDescriptors, HaveTheKindInTheTwoLowestBits) {
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x81, 0xFF),
                              EndpointBytes(0x01, 0xFD),
                              EndpointBytes(0x03, 0xFC),
                              EndpointBytes(0x02, 0xFE),
                              EndpointBytes(0x84, 0x22)})),
            Endpoints(0x02, 0x84));
}

TEST(UsbDescriptors, AreReadUntilBothEndpointsAreFound) {
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x02, kBulk),
                              EndpointBytes(0x83, kBulk),
                              EndpointBytes(0x04, kBulk),
                              EndpointBytes(0x85, kBulk)})),
            Endpoints(0x02, 0x83));
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x83, kBulk),
                              EndpointBytes(0x02, kBulk),
                              EndpointBytes(0x85, kBulk),
                              EndpointBytes(0x04, kBulk)})),
            Endpoints(0x02, 0x83));
}

// Each bulk endpoint replaces the previous one until both directions have one.
TEST(UsbDescriptors, MayNameMoreEndpointsOfOneDirectionBefore) {
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x81, kBulk),
                              EndpointBytes(0x82, kBulk),
                              EndpointBytes(0x03, kBulk),
                              EndpointBytes(0x84, kBulk)})),
            Endpoints(0x03, 0x82));
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x05, kBulk),
                              EndpointBytes(0x06, kBulk),
                              EndpointBytes(0x87, kBulk),
                              EndpointBytes(0x08, kBulk)})),
            Endpoints(0x06, 0x87));
}

TEST(UsbDescriptors, AreNotReadAfterTheSecondEndpoint) {
  for (const uint8_t length : std::initializer_list<uint8_t>{0, 1, 6, 8, 255}) {
    EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x02, kBulk),
                                EndpointBytes(0x83, kBulk),
                                EndpointBytes(0x04, kBulk, length)})),
              Endpoints(0x02, 0x83));
  }
}

// Endpoints without both directions: the usual pair, never a mixture.
TEST(UsbDescriptors, WithoutBulkEndpointsLeaveTheUsualOnes) {
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x02, kInterrupt), EndpointBytes(0x83, kInterrupt)})),
            kDefaults);
}

TEST(UsbDescriptors, WithOneDirectionOnlyLeaveTheUsualOnes) {
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x02, kBulk), EndpointBytes(0x83, kInterrupt)})),
            kDefaults);
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x83, kBulk), EndpointBytes(0x84, kBulk)})), kDefaults);
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x02, kBulk), EndpointBytes(0x03, kBulk)})), kDefaults);
}

TEST(UsbDescriptors, NeedTwoEndpoints) {
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x02, kBulk)})), kNone);
  EXPECT_EQ(Find(DeviceBytes({})), kNone);
}

TEST(UsbDescriptors, MayHaveAsManyEndpointsAsTheCountCanHold) {
  std::string rest = InterfaceBytes(255);
  for (int i = 0; i < 253; ++i) rest += EndpointBytes(0x81, kInterrupt);
  rest += EndpointBytes(0x02, kBulk) + EndpointBytes(0x83, kBulk);
  EXPECT_EQ(Find(ConfigurationBytes(rest)), Endpoints(0x02, 0x83));
}

TEST(UsbDescriptors, WithAWrongCountAreOfAnotherLayout) {
  const std::string endpoints = EndpointBytes(0x02, kBulk) + EndpointBytes(0x83, kBulk);
  for (const size_t count : std::initializer_list<size_t>{0, 1, 3, 4, 255}) {
    EXPECT_EQ(Find(ConfigurationBytes(InterfaceBytes(count) + endpoints)), kNone) << count;
  }
  const std::string three = endpoints + EndpointBytes(0x04, kBulk);
  EXPECT_EQ(Find(ConfigurationBytes(InterfaceBytes(2) + three)), kNone);
}

class UsbEndpointLength : public testing::TestWithParam<uint8_t> {};

TEST_P(UsbEndpointLength, IsSevenWhileTheEndpointsAreLookedFor) {
  const uint8_t length = GetParam();
  const std::string out = EndpointBytes(0x02, kBulk);
  const std::string in = EndpointBytes(0x83, kBulk);
  EXPECT_EQ(Find(DeviceBytes({EndpointBytes(0x02, kBulk, length), in})), kNone);
  EXPECT_EQ(Find(DeviceBytes({out, EndpointBytes(0x83, kBulk, length)})), kNone);
  EXPECT_EQ(Find(DeviceBytes({out, EndpointBytes(0x84, kInterrupt, length), in})), kNone);
  // Also when nothing was found in the end.
  EXPECT_EQ(Find(DeviceBytes({out, EndpointBytes(0x84, kInterrupt, length)})), kNone);
}

INSTANTIATE_TEST_SUITE_P(Lengths, UsbEndpointLength, testing::Values(0, 1, 6, 8, 9, 14, 128, 255));

TEST(UsbDescriptors, OfAClassBetweenAreOfAnotherLayout) {
  const std::string class_specific = Bytes({5, 0x24, 0, 0x10, 0x01});
  const std::string out = EndpointBytes(0x02, kBulk);
  const std::string in = EndpointBytes(0x83, kBulk);
  const std::string usb_interface = InterfaceBytes(2);
  EXPECT_EQ(Find(ConfigurationBytes(class_specific + usb_interface + out + in)), kNone);
  EXPECT_EQ(Find(ConfigurationBytes(usb_interface + class_specific + out + in)), kNone);
  EXPECT_EQ(Find(ConfigurationBytes(usb_interface + out + class_specific + in)), kNone);
  EXPECT_EQ(Find(ConfigurationBytes(usb_interface + out + in + class_specific)), kNone);
}

TEST(UsbDescriptors, OfASecondInterfaceAreOfAnotherLayout) {
  const std::string one =
      InterfaceBytes(2) + EndpointBytes(0x02, kBulk) + EndpointBytes(0x83, kBulk);
  EXPECT_EQ(Find(ConfigurationBytes(one + one)), kNone);
}

TEST(UsbDescriptors, HaveTheLengthsOfConfigurationAndInterface) {
  const std::string endpoints = EndpointBytes(0x02, kBulk) + EndpointBytes(0x83, kBulk);
  for (const size_t length : std::initializer_list<size_t>{5, 8, 9, 10, 11, 16, 255}) {
    EXPECT_EQ(Find(ConfigurationBytes(InterfaceBytes(2, length) + endpoints)),
              Endpoints(0x02, 0x83))
        << length;
  }
  for (const size_t length : std::initializer_list<size_t>{4, 8, 9, 10, 12, 255}) {
    EXPECT_EQ(Find(ConfigurationBytes(InterfaceBytes(2) + endpoints, length)),
              Endpoints(0x02, 0x83))
        << length;
  }
}

TEST(UsbDescriptors, WithAWrongLengthOfTheInterfaceAreOfAnotherLayout) {
  const std::string good = Good();
  for (unsigned length = 0; length < 256; ++length) {
    if (length == 9) continue;
    std::string bad = good;
    bad[9] = static_cast<char>(length);
    EXPECT_EQ(Find(bad), kNone) << length;
  }
}

TEST(UsbDescriptors, WithAWrongLengthOfTheConfigurationAreOfAnotherLayout) {
  const std::string good = Good();
  for (unsigned length = 0; length < 256; ++length) {
    if (length == 9) continue;
    std::string bad = good;
    bad[0] = static_cast<char>(length);
    EXPECT_EQ(Find(bad), kNone) << length;
  }
}

// A usb_interface of length 0 would be its own first endpoint, although the total length is right.
TEST(UsbDescriptors, OfAnInterfaceWithoutLengthAreOfAnotherLayout) {
  const std::string usb_interface = Bytes({0, 0x04, 0x02, kBulk, 2, 0, 0});
  const std::string in = EndpointBytes(0x83, kBulk);
  EXPECT_EQ(Find(ConfigurationBytes(usb_interface + in)), kNone);
  EXPECT_EQ(Find(usb_interface + in), kNone);  // nor of a configuration without one
}

TEST(UsbDescriptors, ThatEndEarlyAreOfAnotherLayout) {
  const std::string good = Good();
  for (size_t size = 0; size < good.size(); ++size) {
    EXPECT_EQ(Find(good.substr(0, size)), kNone) << size;
  }
}

TEST(UsbDescriptors, ThatGoOnAreOfAnotherLayout) {
  for (size_t more = 1; more <= 21; ++more) {
    EXPECT_EQ(Find(Good() + std::string(more, '\0')), kNone) << more;
  }
}

// The usb_interface's count may be the last byte.
TEST(UsbDescriptors, AreNotReadAfterTheirEnd) {
  for (size_t size = 1; size <= 20; ++size) {
    for (unsigned first = 0; first < 256; ++first) {
      std::string bytes(size, '\x07');
      bytes[0] = static_cast<char>(first);
      EXPECT_EQ(Find(bytes), kNone) << size << " bytes, the first is " << first;
    }
  }
}

// With any damaged byte, nothing outside the descriptor is read, and no endpoint is invented.
TEST(UsbDescriptors, WithADamagedByteGiveNoOtherEndpointsThanTheirs) {
  const std::string good = Good();
  for (size_t at = 0; at < good.size(); ++at) {
    for (unsigned value = 0; value < 256; ++value) {
      std::string bad = good;
      bad[at] = static_cast<char>(value);
      const Found found = Find(bad);
      if (!found || found == kDefaults) continue;
      const auto holds = [&](uint8_t address) {
        return address == static_cast<uint8_t>(bad[20]) || address == static_cast<uint8_t>(bad[27]);
      };
      EXPECT_TRUE(holds(found->out) && holds(found->in)) << "byte " << at << " is " << value;
    }
  }
}

}  // namespace
