// Plugging simulated USB devices in and out.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <ctime>
#include <filesystem>
#include <fstream>
#include <optional>
#include <string>

#include "simulator/ports/handle.h"
#include "tests/host/support/simulated_usb.h"
#include "tests/usb/usb_host.h"

namespace {

using testing::HasSubstr;
using usb_host::Connected;
using usb_host::DescriptorRequest;
using usb_host::File;
using usb_host::kGetDescriptor;
using usb_host::Pending;

constexpr DWORD kDone = ERROR_SUCCESS;
constexpr DWORD kGone = ERROR_DEVICE_NOT_CONNECTED;
constexpr const char* kPing = "%1%\r\n";
constexpr const char* kReply = "RE003%1%\r\n";

std::string Ask(const Connected& host) {
  host.writer.Write(kPing);
  return host.reader.Read(100).text();
}

TEST(UsbPlug, IsAbsentWhenUnplugged) {
  bed::SimulatedUsb usb({"quorin"});
  EXPECT_TRUE(File(usb.device(), GENERIC_READ).open());
  EXPECT_FALSE(usb.Status().has_value());

  EXPECT_EQ(usb.Unplug(), 0);

  EXPECT_EQ(File(usb.device(), GENERIC_READ).error(), DWORD{ERROR_FILE_NOT_FOUND});
}

TEST(UsbPlug, EndsPendingTransfers) {
  bed::SimulatedUsb usb({"quorin"});
  const Connected host(usb.device());
  Pending first = host.reader.StartRead(10);
  Pending second = host.reader.StartRead(10);

  usb.Unplug();

  EXPECT_TRUE(first.Ended() && second.Ended());
  EXPECT_EQ(first.Finish().error, kGone);
  EXPECT_EQ(second.Finish().error, kGone);
}

TEST(UsbPlug, FailsEveryLaterRequest) {
  bed::SimulatedUsb usb({"quorin"});
  const Connected host(usb.device());
  host.writer.Write(kPing);

  usb.Unplug();

  EXPECT_EQ(host.reader.Read(10).error, kGone);
  EXPECT_EQ(host.writer.Write("x").error, kGone);
  EXPECT_EQ(host.reader.Unbind(), kGone);
  EXPECT_EQ(host.reader.Reset(), kGone);
  EXPECT_EQ(host.reader.Control(kGetDescriptor, DescriptorRequest(), 9).error, kGone);
}

TEST(UsbPlug, IsUnpluggedWhenItsProgramDies) {
  bed::SimulatedUsb usb({"quorin"});
  const Connected host(usb.device());
  Pending read = host.reader.StartRead(10);

  usb.Kill();

  EXPECT_EQ(read.Finish().error, kGone);
  EXPECT_EQ(File(usb.device(), GENERIC_READ).error(), DWORD{ERROR_FILE_NOT_FOUND});
}

// Handles of the old device do not reach the new one, although it has the same name.
TEST(UsbPlug, IsPluggedInAgain) {
  bed::SimulatedUsb usb({"quorin"});
  std::optional<Connected> before(usb.device());
  usb.Unplug();
  usb.Start({"quorin"});

  const Connected host(usb.device());

  EXPECT_EQ(Ask(host), kReply);
  EXPECT_EQ(before->writer.Write(kPing).error, kGone);
  before.reset();
  EXPECT_EQ(Ask(host), kReply);
  EXPECT_THAT(usb.Transcript(), testing::Not(HasSubstr("close")));
}

// The driver reuses the system's objects.
TEST(UsbPlug, IsPluggedInManyTimes) {
  bed::SimulatedUsb usb({"quorin"});
  for (int round = 0; round < 5; ++round) {
    const Connected host(usb.device());
    EXPECT_EQ(Ask(host), kReply);
    usb.Unplug();
    usb.Start({"quorin"});
  }
}

TEST(UsbPlug, HasNeighbours) {
  bed::SimulatedUsb first({"quorin", "--port-name", "/dev/one"});
  const bed::SimulatedUsb second({"quorin", "--port-name", "/dev/two"});
  ASSERT_NE(first.device(), second.device());
  const Connected first_host(first.device());
  const Connected second_host(second.device());
  Pending read = second_host.reader.StartRead(100);

  first_host.writer.Write("%1%print,/cur/term\r\n");
  EXPECT_THAT(first_host.reader.Read(100).text(), HasSubstr("/dev/one"));
  EXPECT_FALSE(read.Ended());
  first.Unplug();

  second_host.writer.Write("%1%print,/cur/term\r\n");
  EXPECT_THAT(read.Finish().text(), HasSubstr("/dev/two"));
}

TEST(UsbPlug, SaysWhyItDoesNotStart) {
  try {
    const bed::SimulatedUsb usb({"no-such-family"});
    FAIL() << "it has started";
  } catch (const bed::Error& error) {
    EXPECT_THAT(error.what(), HasSubstr("A subcommand is required"));
  }
}

TEST(UsbPlug, RefusesSwitchesThatDoNotFit) {
  for (const char* const wrong : {"--endpoints=0x123",
                                  "--endpoints=0x81:bulky",
                                  "--refuse-descriptor=half",
                                  "--refuse-bind=in",
                                  "--write-error=5",
                                  "--write-error=0xE0000001:x",
                                  "--transfer=0"}) {
    EXPECT_THROW(bed::SimulatedUsb({"quorin", wrong}), bed::Error) << wrong;
  }
}

// 2024-05-01 12:30 UTC, in seconds since 1970 and as a file has it.
constexpr time_t kModified = 1714566600;
constexpr ULONGLONG kModifiedFileTime = 133590402000000000;

// A receiver sends seconds since 1988, in local time.
std::string ModifiedText() {
  tm start{};
  start.tm_year = 88;
  start.tm_mday = 1;
  start.tm_isdst = -1;
  return std::to_string(kModified - mktime(&start));
}

void SetModified(const std::filesystem::path& path) {
  const sim::UniqueHandle file(
      CreateFileW(path.c_str(), FILE_WRITE_ATTRIBUTES, 0, nullptr, OPEN_EXISTING, 0, nullptr));
  const FILETIME time{static_cast<DWORD>(kModifiedFileTime),
                      static_cast<DWORD>(kModifiedFileTime >> 32)};
  ASSERT_TRUE(SetFileTime(file.get(), nullptr, nullptr, &time));
}

TEST(UsbPlug, ServesTheFolderThatIsGiven) {
  const bed::TempFolder folder;
  folder.Write("B0202.log", "xyz");
  SetModified(folder / "B0202.log");
  const std::u8string path = folder.path().u8string();
  const bed::SimulatedUsb usb({"quorin", "--folder", std::string(path.begin(), path.end())});
  const Connected host(usb.device());
  host.writer.Write("%1%print,/log/&[name,size,time]\r\n");
  EXPECT_THAT(host.reader.Read(200).text(), HasSubstr("{{B0202.log,3," + ModifiedText() + "}"));
}

TEST(UsbPlug, ServesNamesInAnyAlphabet) {
  const bed::TempFolder folder;
  const std::filesystem::path served = folder / "served" / u8"\u00E4\u0431";
  std::filesystem::create_directories(served);
  std::ofstream(served / u8"\u0436.log") << "xyz";
  const std::u8string path = served.u8string();
  const bed::SimulatedUsb usb({"quorin", "--folder", std::string(path.begin(), path.end())});
  const Connected host(usb.device());
  host.writer.Write("%1%print,/log/&[name,size,time]\r\n");
  EXPECT_THAT(host.reader.Read(200).text(), HasSubstr("{{\xD0\xB6.log,3,"));
}

TEST(UsbPlug, OpensAndClosesManyTimes) {
  constexpr int kRounds = 50;
  const bed::SimulatedUsb usb({"quorin", "--configured"});
  for (int round = 0; round < kRounds; ++round) {
    const File file(usb.device(), GENERIC_READ);
    ASSERT_EQ(file.Bind(0x81), kDone) << round;
  }
}

}  // namespace
