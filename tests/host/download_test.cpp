// DownloadFile without faults, and where it cannot begin.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <algorithm>
#include <cstdint>
#include <string>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/support/content.h"

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;

namespace {

constexpr size_t kBlock = 512;

// The progress of a download, computed: a new percent after each block that changes it.
std::vector<int> ExpectedPercents(uint32_t size, uint32_t told_size) {
  std::vector<int> percents = {0, 1};
  uint8_t last = 0;
  for (uint32_t delivered = 0; delivered < size;) {
    delivered += std::min<uint32_t>(kBlock, size - delivered);
    const auto percent = static_cast<uint8_t>(delivered * 99U / told_size + 1U);
    if (percent != last) percents.push_back(std::min<int>(percent, 100));
    last = percent;
  }
  return percents;
}

// The lines from the size query to the end of a successful transfer.
host::Lines TransferOf(const std::string& name, size_t size) {
  host::Lines lines = {R"(> %#%\n)",
                       R"(< RE%#%\r\n)",
                       "> %#%print,/log/" + name + R"(&size\r\n)",
                       "< RE%#%" + std::to_string(size) + R"(\r\n)",
                       R"(> %#%get,")" + name + R"(":{500,512}\r\n)",
                       R"(< RE%#%\r\n)",
                       R"(> \x15)"};
  size_t number = 0;
  for (; size > kBlock; size -= kBlock) {
    lines.push_back("< block type=02 seq=" + std::to_string(number++) + " bytes=518");
    lines.push_back(R"(> \x06)");
  }
  lines.push_back("< block type=04 len=" + std::to_string(size) + " bytes=518");
  lines.push_back("> #");
  return lines;
}

class ApiDownloadOf : public testing::TestWithParam<size_t> {};

TEST_P(ApiDownloadOf, DeliversEveryByte) {
  const size_t size = GetParam();
  const std::string content = Content(size);
  const bed::SimulatedPort port({"quorin", "--speed", "115200"}, {{"A0101.log", content}});
  const host::Receiver receiver(port, CBR_115200);
  MemoryStream stream;
  host::Progress progress;
  EXPECT_EQ(receiver.Download(L"A0101.log", stream, &progress), S_OK);

  EXPECT_TRUE(stream.bytes == content);
  EXPECT_EQ(stream.other_calls, 0U);
  EXPECT_EQ(stream.thread, GetCurrentThreadId());
  const auto told = static_cast<uint32_t>(size);
  EXPECT_THAT(progress.percents(), ElementsAreArray(ExpectedPercents(told, told)));
  EXPECT_EQ(progress.percents().back(), 100);
  port.WaitForTranscript("\n> #\n");
  EXPECT_THAT(receiver.WireSince(), ElementsAreArray(TransferOf("A0101.log", size)))
      << "at full speed nothing else is said";
}

INSTANTIATE_TEST_SUITE_P(Sizes, ApiDownloadOf, testing::Values(1, 511, 512, 513, 60000));

TEST(ApiDownload, TracesItsSteps) {
  const bed::SimulatedPort port({"quorin"}, {{"A.log", Content(20000)}});
  const host::Receiver receiver(port);
  const host::Report report;
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
  EXPECT_EQ(stream.bytes.size(), 20000U);
  const char* const reading = "CQuorinCommand::Execute - start reading. Timeout is [30000 msec]";
  EXPECT_THAT(report.Lines(),
              ElementsAre("CAbstractReceiver::DownloadFile",
                          "CQuorinProtocol::DownloadFile - connection is locked [HANDLE]",
                          "CGetPortCmd::CGetPortCmd",
                          "CSerialConnection::Flush",
                          reading,
                          "CSerialConnection::Flush",
                          "CSerialConnection::SetSpeed - changing of baudrate [9600 -> 115200]",
                          "CSerialConnection::Flush",
                          reading,
                          "CGetFileSizeCmd::CGetFileSizeCmd",
                          "CSerialConnection::Flush",
                          reading,
                          "CQuorinProtocol::DownloadFile - file size [A.log] is 20000 bytes",
                          "CGetFileCmd::CGetFileCmd",
                          "CSerialConnection::Flush",
                          reading,
                          "CSerialConnection::Flush",
                          "CSetBoudRateCmd::CSetBoudRateCmd",
                          "CSerialConnection::Flush",
                          reading,
                          "CSerialConnection::SetSpeed - changing of baudrate [115200 -> 9600]"));
}

TEST(ApiDownload, RaisesTheSpeedAndPutsItBack) {
  const bed::SimulatedPort port({"quorin", "--port-letter", "b", "--speed", "19200"},
                                {{"A.log", Content(20000)}});
  const host::Receiver receiver(port, CBR_19200);
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
  EXPECT_TRUE(stream.bytes == Content(20000));

  host::Lines expected = {R"(> %#%print,/cur/term\r\n)",
                          R"(< RE%#%/dev/ser/b\r\n)",
                          R"(> set,/par/dev/ser/b/rate,115200\r\n)",
                          "= speed 115200"};
  const host::Lines transfer = TransferOf("A.log", 20000);
  expected.insert(expected.end(), transfer.begin(), transfer.end());
  expected.insert(expected.end(),
                  {R"(> %#%set,cur/term/rate,19200\r\n)", R"(< RE%#%\r\n)", "= speed 19200"});
  EXPECT_THAT(receiver.WireSince(), ElementsAreArray(expected));
  EXPECT_EQ(receiver.Check(), -1) << "host and receiver are at different speeds";
}

TEST(ApiDownload, TwoInARowAreTheSame) {
  const bed::SimulatedPort port({"quorin", "--speed", "57600"}, {{"A.log", Content(1500)}});
  const host::Receiver receiver(port, CBR_57600);
  for (int i = 0; i < 2; ++i) {
    MemoryStream stream;
    EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
    EXPECT_TRUE(stream.bytes == Content(1500));
  }
  const host::Lines lines = receiver.WireSince();
  EXPECT_EQ(host::CountOf(lines, "= speed 115200"), 2U);
  EXPECT_EQ(host::CountOf(lines, "= speed 57600"), 2U);
}

// Two receivers, two threads: each gets its own file.
TEST(ApiDownload, RunsOnTwoPortsAtOnce) {
  const std::vector<std::string> arguments = {"quorin", "--speed", "115200"};
  const bed::SimulatedPort first(arguments, {{"A.log", Content(9000)}});
  const bed::SimulatedPort second(arguments, {{"A.log", std::string(7000, 'x')}});
  const host::Receiver receiver(first, CBR_115200);
  const host::Receiver other(second, CBR_115200);
  host::GatedProgress held(50);
  MemoryStream stream;
  MemoryStream other_stream;
  auto download =
      host::OnThread([&] { return receiver.Download(L"A.log", stream, &held.progress); });
  ASSERT_TRUE(held.gate.WaitForArrival());
  EXPECT_EQ(other.Download(L"A.log", other_stream), S_OK) << "while the first stands still";
  held.gate.Open();
  EXPECT_EQ(download.get(), S_OK);
  EXPECT_TRUE(stream.bytes == Content(9000));
  EXPECT_TRUE(other_stream.bytes == std::string(7000, 'x'));
}

// The size that the receiver reports is used for the percents only; the blocks decide what is
// downloaded.
TEST(ApiDownload, PercentsFollowTheReportedSize) {
  const bed::SimulatedPort port({"quorin", "--speed", "115200", "--lie-size", "A.log=256"},
                                {{"A.log", Content(8000)}});
  const host::Receiver receiver(port, CBR_115200);
  MemoryStream stream;
  host::Progress progress;
  EXPECT_EQ(receiver.Download(L"A.log", stream, &progress), S_OK);
  EXPECT_TRUE(stream.bytes == Content(8000));
  EXPECT_THAT(progress.percents(), ElementsAreArray(ExpectedPercents(8000, 256)));
}

TEST(ApiDownload, LastBlockMayBeEmpty) {
  const bed::SimulatedPort port({"quorin", "--speed", "115200", "--empty-last-block"},
                                {{"A.log", Content(2 * kBlock)}});
  const host::Receiver receiver(port, CBR_115200);
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
  EXPECT_TRUE(stream.bytes == Content(2 * kBlock));
  port.WaitForTranscript("\n> #\n");
  EXPECT_EQ(host::CountOf(receiver.WireSince(), "< block type=04 len=0 bytes=518"), 1U);
}

TEST(ApiDownload, EmptyFileFails) {
  const bed::SimulatedPort port({"quorin"}, {{"A.log", ""}});
  const host::Receiver receiver(port);
  const host::Report report;
  MemoryStream stream;
  host::Progress progress;
  EXPECT_EQ(receiver.Download(L"A.log", stream, &progress), E_FAIL);
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_THAT(progress.percents(), ElementsAre(0));
  EXPECT_TRUE(report.Has("CQuorinProtocol::DownloadFile - file [A.log] size is zero"));
  EXPECT_TRUE(
      report.Has("CQuorinProtocol::DownloadFile - download [A.log] is failed [0x80004005]"));
  EXPECT_EQ(host::CountStarting(receiver.SentSince(), "%#%get"), 0U);
  EXPECT_EQ(receiver.WireSince().back(), "= speed 9600") << "the speed was not put back";
  EXPECT_EQ(receiver.Identify().result, S_OK);
}

TEST(ApiDownload, UnknownFileFails) {
  const bed::SimulatedPort port({"quorin"}, {{"A.log", "abc"}});
  const host::Receiver receiver(port);
  const host::Report report;
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"B.log", stream), host::kNotConnected);
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_TRUE(
      report.Has("CQuorinProtocol::DownloadFile - download [B.log] is failed [0x8007048F]"));
  EXPECT_EQ(host::CountOf(receiver.SentSince(), "#"), 0U) << "there was no transfer to end";
  EXPECT_EQ(receiver.WireSince().back(), "= speed 9600") << "the speed was not put back";
  EXPECT_EQ(receiver.Identify().result, S_OK);
}

TEST(ApiDownload, RefusedGetFails) {
  const bed::SimulatedPort port({"quorin", "--refuse", "get"}, {{"A.log", "abc"}});
  const host::Receiver receiver(port);
  MemoryStream stream;
  host::Progress progress;
  EXPECT_EQ(receiver.Download(L"A.log", stream, &progress), host::kNotConnected);
  EXPECT_THAT(progress.percents(), ElementsAre(0));
  EXPECT_EQ(host::CountOf(receiver.SentSince(), "\\x15"), 0U);
  EXPECT_EQ(receiver.WireSince().back(), "= speed 9600");
}

// On a serial port a failure of the host's stream is not returned; the receiver is sent the end.
TEST(ApiDownload, FailingStreamEndsItWithoutAFailure) {
  const bed::SimulatedPort port({"quorin", "--speed", "115200"}, {{"A.log", Content(9000)}});
  const host::Receiver receiver(port, CBR_115200);
  MemoryStream stream;
  stream.fail_at_write = 3;
  host::Progress progress;
  EXPECT_EQ(receiver.Download(L"A.log", stream, &progress), S_OK);
  EXPECT_TRUE(stream.bytes == Content(9000).substr(0, 3 * kBlock));
  EXPECT_EQ(stream.writes, 4U);
  EXPECT_LT(progress.percents().back(), 100);
  port.WaitForTranscript("\n> #\n");
  const host::Lines lines = receiver.WireSince();
  EXPECT_EQ(lines.back(), "> #");
  EXPECT_EQ(lines[lines.size() - 2], "< block type=02 seq=3 bytes=518");

  stream = {};
  EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
  EXPECT_TRUE(stream.bytes == Content(9000));
}

}  // namespace
