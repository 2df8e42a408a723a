// What a search refuses, and what it finds without asking a port.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "api/registry.h"
#include "platform/api_types.h"
#include "tests/support/fake_device.h"
#include "tests/support/report_capture.h"
#include "tests/support/stub_receiver.h"
#include "transport/device_calls.h"

using rcvlink::Receivers;
using rcvlink::SystemCallsOverride;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class SearchArguments : public testing::Test {
 protected:
  FakeDevice device_;
  SystemCallsOverride override_{device_};
  std::wstring name_ = L"COM7";
  DCB settings_{};
  void* handle_ = nullptr;
};

TEST_F(SearchArguments, ASerialPortNeedsNameSettingsAndAPlaceForTheHandle) {
  EXPECT_EQ(devapi::CreateReceiverOnSerial(nullptr, eProtocolAny, &settings_, nullptr, &handle_),
            E_INVALIDARG);
  EXPECT_EQ(devapi::CreateReceiverOnSerial(name_.data(), eProtocolAny, nullptr, nullptr, &handle_),
            E_INVALIDARG);
  EXPECT_EQ(
      devapi::CreateReceiverOnSerial(name_.data(), eProtocolAny, &settings_, nullptr, nullptr),
      E_INVALIDARG);
  EXPECT_THAT(device_.calls, IsEmpty());
}

TEST_F(SearchArguments, ASearchNeedsAPlaceForTheHandle) {
  EXPECT_EQ(devapi::SearchReceiver(name_.data(), eInstanceSerial, eProtocolAny, nullptr, nullptr),
            E_INVALIDARG);
  EXPECT_THAT(device_.calls, IsEmpty());
}

TEST_F(SearchArguments, AnUnknownLinkIsUnexpected) {
  const ReportCapture report;
  constexpr auto kUnknown = static_cast<EInstanceType>(3);
  EXPECT_EQ(devapi::SearchReceiver(name_.data(), kUnknown, eProtocolAny, nullptr, &handle_),
            E_UNEXPECTED);
  EXPECT_EQ(handle_, nullptr);
  EXPECT_THAT(device_.calls, IsEmpty());
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST_F(SearchArguments, AReceiverThatIsOpenGetsAnotherUser) {
  void* open = nullptr;
  ASSERT_EQ(Receivers().Insert(name_.c_str(), std::make_shared<StubReceiver>(), &open), S_OK);
  {
    const ReportCapture report;
    EXPECT_EQ(devapi::SearchReceiver(name_.data(), eInstanceAny, eProtocolAny, nullptr, &handle_),
              S_OK);
    EXPECT_THAT(report.Lines(),
                ElementsAre("OpenReceiver - ref [2] [COM7]",
                            "SearchReceiver - receiver already exists [COM7]"));
  }
  EXPECT_EQ(handle_, open);
  EXPECT_THAT(device_.calls, IsEmpty());
  EXPECT_EQ(devapi::CloseReceiver(handle_), S_FALSE);
  EXPECT_EQ(devapi::CloseReceiver(handle_), S_OK);
}

}  // namespace
