// An abort at each call of a whole download, against the simulated receiver.
#include <gtest/gtest.h>

#include <sstream>
#include <string>
#include <tuple>
#include <vector>

#include "platform/hresult.h"
#include "simulator/quorin/receiver.h"
#include "tests/quorin/quorin_driver.h"
#include "tests/support/aborting_connection.h"
#include "tests/support/block_stream.h"
#include "tests/support/content.h"
#include "tests/support/simulated_driver.h"

namespace {

constexpr char kName[] = "A0101.log";
constexpr size_t kSize = 1300;
constexpr DWORD kUsb = 0;  // a link without a speed

sim::FileStore OneFile() {
  sim::FileStore files;
  files.Add(kName, sim::ToBytes(Content(kSize)), 600000000);
  return files;
}

struct Bench : SimulatedDriver<QuorinDriver, sim::QuorinReceiver, AbortingConnection> {
  Bench(CancelledWrite cancelled_write, DWORD host_speed, const sim::QuorinOptions& options = {})
      : SimulatedDriver(options, OneFile(), cancelled_write, host_speed) {
    connection->abort = [this] { driver.Abort(); };
  }

  HRESULT Download() { return driver.DownloadFile(L"A0101.log", &stream, nullptr); }
  std::vector<std::string> Lines() const {
    std::vector<std::string> lines;
    std::istringstream in(log.str());
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
  }
};

bool IsControl(const std::string& line) {
  return line == "> \\x06" || line == "> \\x15" || line == "> #";
}

// Whether the transfer was closed: the last control byte ends it, before the speed is put back.
void ExpectTransferEnded(const Bench& bench) {
  std::string last_control = "> #";
  for (const std::string& line : bench.Lines()) {
    if (line.find("set,cur/term/rate,9600") != std::string::npos) break;
    if (IsControl(line)) last_control = line;
  }
  EXPECT_EQ(last_control, "> #");
  EXPECT_FALSE(bench.receiver.in_transfer());
}

class QuorinDownloadAbort
    : public testing::TestWithParam<
          std::tuple<CancelledWrite, bool /*at the end of the call*/, DWORD /*the host's speed*/>> {
 protected:
  CancelledWrite HowWritesAreCancelled() const { return std::get<0>(GetParam()); }
  DWORD HostSpeed() const { return std::get<2>(GetParam()); }

  // How many calls an undisturbed download makes.
  size_t CountCalls() const {
    Bench bench(HowWritesAreCancelled(), HostSpeed());
    EXPECT_EQ(bench.Download(), S_OK);
    EXPECT_EQ(bench.stream.bytes, Content(kSize));
    return bench.connection->calls;
  }
};

TEST_P(QuorinDownloadAbort, EndsItInOrderAtAnyCall) {
  const size_t calls = CountCalls();
  ASSERT_GT(calls, HostSpeed() == kUsb ? 20U : 30U);
  for (size_t call = 0; call < calls; ++call) {
    SCOPED_TRACE("abort at call " + std::to_string(call));
    Bench bench(HowWritesAreCancelled(), HostSpeed());
    bench.connection->abort_at = call;
    bench.connection->at_end = std::get<1>(GetParam());
    EXPECT_EQ(bench.Download(), S_FALSE);
    ExpectTransferEnded(bench);
    EXPECT_EQ(bench.receiver.speed(), 9600U);
    EXPECT_EQ(bench.connection->Speed(), HostSpeed());
    EXPECT_TRUE(IsFreeForOthers(bench.driver));
    // The received bytes are the beginning of the file.
    EXPECT_TRUE(Content(kSize).starts_with(bench.stream.bytes));
    if (testing::Test::HasFailure()) FAIL() << bench.log.str();
  }
}

TEST_P(QuorinDownloadAbort, DoesNotDisturbWhatFollows) {
  const size_t calls = CountCalls();
  for (size_t call = 0; call < calls; ++call) {
    SCOPED_TRACE("abort at call " + std::to_string(call));
    Bench bench(HowWritesAreCancelled(), HostSpeed());
    bench.connection->abort_at = call;
    bench.connection->at_end = std::get<1>(GetParam());
    bench.Download();
    CReceiverInfo info{};
    EXPECT_EQ(bench.driver.GetReceiverInfo(nullptr, &info), S_OK);
    SysFreeString(info.bstrReceiverId);
    SysFreeString(info.bstrModel);
    bench.stream.bytes.clear();
    EXPECT_EQ(bench.Download(), S_OK);
    EXPECT_TRUE(bench.stream.bytes == Content(kSize));
    EXPECT_EQ(bench.driver.DeleteFile(L"A0101.log"), S_OK);
    if (testing::Test::HasFailure()) FAIL() << bench.log.str();
  }
}

TEST_P(QuorinDownloadAbort, EndsItInOrderAtASpeedThatWasNotRaised) {
  sim::QuorinOptions options;
  options.identity.port_name = "ttyX";
  Bench counting(HowWritesAreCancelled(), HostSpeed(), options);
  ASSERT_EQ(counting.Download(), S_OK);
  for (size_t call = 0; call < counting.connection->calls; ++call) {
    SCOPED_TRACE("abort at call " + std::to_string(call));
    Bench bench(HowWritesAreCancelled(), HostSpeed(), options);
    bench.connection->abort_at = call;
    bench.connection->at_end = std::get<1>(GetParam());
    EXPECT_EQ(bench.Download(), S_FALSE);
    EXPECT_EQ(bench.driver.DeleteFile(L"A0101.log"), S_OK);
    EXPECT_EQ(bench.connection->Speed(), HostSpeed());
    if (testing::Test::HasFailure()) FAIL() << bench.log.str();
  }
}

INSTANTIATE_TEST_SUITE_P(All,
                         QuorinDownloadAbort,
                         testing::Combine(testing::Values(CancelledWrite::kCompletes,
                                                          CancelledWrite::kIsLost,
                                                          CancelledWrite::kIsSentAllTheSame),
                                          testing::Bool(),
                                          testing::Values(9600, kUsb)));

}  // namespace
