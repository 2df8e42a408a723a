// Binding handles to the endpoints of a simulated USB device.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <vector>

#include "tests/host/support/simulated_usb.h"
#include "tests/usb/usb_host.h"

namespace {

using testing::HasSubstr;
using usb_host::Bytes;
using usb_host::File;
using usb_host::kBindPipe;
using usb_host::kNotBound;
using usb_host::Pending;

constexpr DWORD kDone = ERROR_SUCCESS;
constexpr DWORD kInvalid = ERROR_INVALID_PARAMETER;
constexpr DWORD kWrongState = ERROR_BAD_COMMAND;
constexpr uint8_t kIn = 0x81;
constexpr uint8_t kOut = 0x02;

class UsbPipe : public testing::Test {
 protected:
  // A configured device with these switches, and two handles of it.
  void Plug(std::vector<std::string> switches = {}) {
    switches.insert(switches.begin(), {"quorin", "--configured"});
    usb_.emplace(switches);
    Open();
  }
  void Open() {
    writer_.emplace(usb_->device(), GENERIC_WRITE);
    reader_.emplace(usb_->device(), GENERIC_READ);
    ASSERT_TRUE(writer_->open() && reader_->open());
  }

  std::optional<bed::SimulatedUsb> usb_;
  std::optional<File> writer_;
  std::optional<File> reader_;
};

TEST_F(UsbPipe, IsBoundOnce) {
  Plug();
  EXPECT_EQ(reader_->Bind(kIn), kDone);
  EXPECT_EQ(reader_->Bind(kIn), kWrongState) << "the same again";
  EXPECT_EQ(reader_->Bind(kOut), kWrongState) << "a handle that is bound";
  EXPECT_EQ(writer_->Bind(kIn), kWrongState) << "an endpoint that is bound";
  EXPECT_EQ(writer_->Bind(kOut), kDone);
  EXPECT_EQ(usb_->Transcript(),
            "= bind 0x81\n- refused bind 0x81\n- refused bind 0x02\n- refused bind 0x81\n"
            "= bind 0x02\n");
}

TEST_F(UsbPipe, MustExist) {
  Plug();
  for (const uint8_t unknown : Bytes{0x00, 0x01, 0x80, 0x82, 0xFF}) {
    EXPECT_EQ(reader_->Bind(unknown), kInvalid) << int{unknown};
  }
  EXPECT_EQ(reader_->Control(kBindPipe, {}).error, kInvalid);
  EXPECT_EQ(reader_->Control(kBindPipe, {kIn, 0}).error, kInvalid);
}

TEST(UsbPipeOfNewDevice, WaitsForTheConfiguration) {
  const bed::SimulatedUsb usb({"quorin"});
  const File file(usb.device(), GENERIC_READ);
  EXPECT_EQ(file.Bind(kIn), kWrongState);
  EXPECT_EQ(file.Configure(), kDone);
  EXPECT_EQ(file.Bind(kIn), kDone);
}

TEST_F(UsbPipe, IsFreeWhenUnbound) {
  Plug();
  EXPECT_EQ(reader_->Unbind(), kNotBound);
  EXPECT_EQ(reader_->Bind(kIn), kDone);
  EXPECT_EQ(reader_->Unbind(), kDone);
  EXPECT_EQ(reader_->Unbind(), kNotBound);
  EXPECT_EQ(writer_->Bind(kIn), kDone);
  EXPECT_EQ(usb_->Transcript(),
            "- refused unbind\n= bind 0x81\n= unbind 0x81\n- refused unbind\n= bind 0x81\n");
}

TEST_F(UsbPipe, IsFreeWhenItsHandleIsClosed) {
  Plug();
  EXPECT_EQ(reader_->Bind(kIn), kDone);
  EXPECT_EQ(writer_->Bind(kOut), kDone);
  reader_.reset();
  writer_.reset();
  Open();
  EXPECT_EQ(reader_->Bind(kIn), kDone);
  EXPECT_EQ(writer_->Bind(kOut), kDone);
  EXPECT_EQ(usb_->Transcript(),
            "= bind 0x81\n= bind 0x02\n= close 0x81\n= close 0x02\n= bind 0x81\n= bind 0x02\n");
}

TEST_F(UsbPipe, ReportsHandlesThatWereNotBound) {
  Plug();
  reader_.reset();
  usb_->WaitForTranscript("= close\n");
}

TEST_F(UsbPipe, IsReset) {
  Plug();
  EXPECT_EQ(reader_->Reset(), kNotBound);
  EXPECT_EQ(reader_->Bind(kIn), kDone);
  EXPECT_EQ(reader_->Reset(), kDone);
  EXPECT_EQ(usb_->Transcript(), "- refused reset\n= bind 0x81\n= reset 0x81\n");
}

TEST_F(UsbPipe, IsRefused) {
  Plug({"--refuse-bind", "0x81", "--refuse-bind", "2@1"});
  EXPECT_EQ(reader_->Bind(kIn), kInvalid);
  EXPECT_EQ(reader_->Bind(kIn), kInvalid);
  EXPECT_EQ(writer_->Bind(kOut), kInvalid);
  EXPECT_EQ(writer_->Bind(kOut), kDone);
}

TEST_F(UsbPipe, RefusesToBeReset) {
  Plug({"--refuse-reset", "0x02@1"});
  EXPECT_EQ(reader_->Bind(kIn), kDone);
  EXPECT_EQ(writer_->Bind(kOut), kDone);
  EXPECT_EQ(reader_->Reset(), kDone);
  EXPECT_EQ(writer_->Reset(), kInvalid);
  EXPECT_EQ(writer_->Reset(), kDone);
  EXPECT_THAT(usb_->Transcript(), HasSubstr("- refused reset 0x02\n= reset 0x02\n"));
}

TEST_F(UsbPipe, MustBeBoundForTransfers) {
  Plug();
  EXPECT_EQ(reader_->Read(10).error, kNotBound);
  EXPECT_EQ(writer_->Write("x").error, kNotBound);
  EXPECT_EQ(usb_->Transcript(), "- refused read\n- refused write\n");
}

TEST_F(UsbPipe, IsNoLongerBoundForTransfers) {
  Plug();
  EXPECT_EQ(reader_->Bind(kIn), kDone);
  EXPECT_EQ(writer_->Bind(kOut), kDone);
  EXPECT_EQ(reader_->Unbind(), kDone);
  EXPECT_EQ(writer_->Unbind(), kDone);
  EXPECT_EQ(reader_->Read(10).error, kNotBound);
  EXPECT_EQ(writer_->Write("x").error, kNotBound);
}

TEST_F(UsbPipe, GoesOneWay) {
  Plug();
  EXPECT_EQ(reader_->Bind(kOut), kDone);
  EXPECT_EQ(writer_->Bind(kIn), kDone);
  EXPECT_EQ(reader_->Read(10).error, DWORD{ERROR_INVALID_FUNCTION});
  EXPECT_EQ(writer_->Write("x").error, DWORD{ERROR_INVALID_FUNCTION});
}

TEST_F(UsbPipe, RefusesOtherRequests) {
  Plug();
  constexpr DWORD kUnknown = 0x80942200;
  constexpr DWORD kMethods = 4;
  for (DWORD method = 0; method < kMethods; ++method) {
    const auto result = reader_->Control(kUnknown + method, Bytes(10), 10);
    EXPECT_EQ(result.error, DWORD{ERROR_INVALID_FUNCTION}) << method;
  }
  // The driver does not even report the last one, whose buffers are the caller's memory.
  EXPECT_EQ(usb_->Transcript(),
            "- refused request 0x80942200\n- refused request 0x80942201\n"
            "- refused request 0x80942202\n");
}

// The receiver is on the first bulk endpoints; an interrupt endpoint never sends anything.
TEST_F(UsbPipe, CanBeOneThatIsSilent) {
  Plug({"--endpoints", "0x84:interrupt,0x02,0x83"});
  const File silent(usb_->device(), GENERIC_READ);
  EXPECT_EQ(silent.Bind(0x84), kDone);
  EXPECT_EQ(writer_->Bind(0x02), kDone);
  EXPECT_EQ(reader_->Bind(0x83), kDone);
  Pending unanswered = silent.StartRead(10);

  writer_->Write("%1%\r\n");
  EXPECT_EQ(reader_->ReadAll(10), "RE003%1%\r\n");

  EXPECT_FALSE(unanswered.Ended());
  ASSERT_TRUE(CancelIo(silent.get()));
  EXPECT_EQ(unanswered.Finish().error, DWORD{ERROR_OPERATION_ABORTED});
  Pending unbound = silent.StartRead(10);
  EXPECT_EQ(silent.Unbind(), kDone);
  EXPECT_EQ(unbound.Finish().error, DWORD{ERROR_OPERATION_ABORTED});
}

TEST_F(UsbPipe, CanBeAnotherOutEndpoint) {
  Plug({"--endpoints", "0x02,0x81,0x03"});
  EXPECT_EQ(writer_->Bind(0x03), kDone);
  EXPECT_EQ(writer_->Write("abc").bytes.size(), 3U);
  EXPECT_THAT(usb_->Transcript(), HasSubstr("- 3 bytes to 0x03\n"));
}

}  // namespace
