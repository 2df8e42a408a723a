// Aborts against the simulated receiver: at each call of a whole download, and between operations.
#include <gtest/gtest.h>

#include <string>
#include <tuple>
#include <utility>

#include "platform/hresult.h"
#include "simulator/velmar/receiver.h"
#include "tests/support/aborting_connection.h"
#include "tests/support/content.h"
#include "tests/support/simulated_driver.h"
#include "velmar/velmar_protocol.h"

namespace {

constexpr wchar_t kName[] = L"A0101.pdc";
constexpr size_t kSize = 3000;  // three chunks
constexpr DWORD kSpeed = 9600;

sim::FileStore OneFile() {
  sim::FileStore files;
  files.Add("A0101.pdc", sim::ToBytes(Content(kSize)), 600000000);
  return files;
}

struct Bench : SimulatedDriver<CVelmarProtocol, sim::VelmarReceiver, AbortingConnection> {
  explicit Bench(CancelledWrite cancelled_write, const sim::VelmarOptions& options = {})
      : SimulatedDriver(options, OneFile(), cancelled_write) {
    connection->abort = [this] { driver.Abort(); };
  }

  HRESULT Download() { return driver.DownloadFile(kName, &stream, nullptr); }
  // Host and receiver are at the old speed and understand each other.
  void ExpectLinkAtOldSpeed() {
    EXPECT_EQ(receiver.speed(), kSpeed);
    EXPECT_EQ(connection->Speed(), kSpeed);
  }
};

class VelmarDownloadAbort
    : public testing::TestWithParam<std::tuple<CancelledWrite,
                                               bool /*at the end of the call*/,
                                               bool /*stops for commands*/>> {
 protected:
  CancelledWrite HowWritesAreCancelled() const { return std::get<0>(GetParam()); }
  sim::VelmarOptions Options() const {
    sim::VelmarOptions options;
    options.stops_for_commands = std::get<2>(GetParam());
    return options;
  }

  // How many calls an undisturbed download makes.
  size_t CountCalls() const {
    Bench bench(HowWritesAreCancelled(), Options());
    EXPECT_EQ(bench.Download(), S_OK);
    EXPECT_EQ(bench.stream.bytes, Content(kSize));
    bench.ExpectLinkAtOldSpeed();
    return bench.connection->calls;
  }
  // Downloads with an abort at this call, then executes the rest of the test; until one fails.
  template <typename Check>
  void AbortAtEachCall(Check check) const {
    const size_t calls = CountCalls();
    ASSERT_GT(calls, 20U);
    for (size_t call = 0; call < calls; ++call) {
      SCOPED_TRACE("abort at call " + std::to_string(call));
      Bench bench(HowWritesAreCancelled(), Options());
      bench.connection->abort_at = call;
      bench.connection->at_end = std::get<1>(GetParam());
      const HRESULT result = bench.Download();
      check(bench, result);
      if (testing::Test::HasFailure()) FAIL() << bench.log.str();
    }
  }
};

TEST_P(VelmarDownloadAbort, LeavesBothEndsAtTheOldSpeed) {
  AbortAtEachCall([](Bench& bench, HRESULT result) {
    EXPECT_GE(result, S_OK);
    bench.ExpectLinkAtOldSpeed();
    EXPECT_TRUE(Content(kSize).starts_with(bench.stream.bytes));
  });
}

// The flag stays set for the first operation that checks it; this one still sends its command.
TEST_P(VelmarDownloadAbort, EndsTheNextDeletionAfterItsCommand) {
  AbortAtEachCall([](Bench& bench, HRESULT) {
    EXPECT_EQ(bench.driver.DeleteFile(L"other.pdc"), S_FALSE);
    EXPECT_TRUE(bench.log.str().find("> del file other.pdc\\r") != std::string::npos);
    EXPECT_EQ(bench.driver.DeleteFile(L"other.pdc"), S_OK);
  });
}

// A download does not check the flag, and the cancel ended the previous one.
TEST_P(VelmarDownloadAbort, DoesNotDisturbTheNextDownload) {
  AbortAtEachCall([](Bench& bench, HRESULT) {
    bench.stream.bytes.clear();
    EXPECT_EQ(bench.Download(), S_OK);
    EXPECT_TRUE(bench.stream.bytes == Content(kSize));
    bench.ExpectLinkAtOldSpeed();
  });
}

TEST_P(VelmarDownloadAbort, DoesNotDisturbACheck) {
  AbortAtEachCall([](Bench& bench, HRESULT) {
    short answer = 0;
    EXPECT_EQ(bench.driver.CheckConnection(nullptr, &answer), S_OK);
    EXPECT_EQ(answer, VARIANT_TRUE);
  });
}

// An abort ends the download until the receiver is sent the new speed: at 9600 bit/s it would take
// minutes.
TEST_P(VelmarDownloadAbort, DownloadsNothingWhenFoundBeforeTheTransfer) {
  AbortAtEachCall([](Bench& bench, HRESULT) {
    if (bench.log.str().find("> log filetransferb") == std::string::npos) {
      EXPECT_TRUE(bench.stream.bytes.empty());
    }
    // Aborted before the speed-up, it has not even requested the file.
    if (bench.log.str().find("> COM 115200") == std::string::npos) {
      EXPECT_EQ(bench.log.str().find("> currentfile"), std::string::npos);
    }
  });
}

INSTANTIATE_TEST_SUITE_P(All,
                         VelmarDownloadAbort,
                         testing::Combine(testing::Values(CancelledWrite::kCompletes,
                                                          CancelledWrite::kIsLost,
                                                          CancelledWrite::kIsSentAllTheSame),
                                          testing::Bool(),
                                          testing::Bool()));

// A receiver that stopped sending may go on later: it is stopped before the speed is put back.
TEST(VelmarBrokenDownload, StopsAReceiverThatWentSilent) {
  sim::VelmarOptions options;
  options.faults.chunks = {{sim::VelmarChunkFaultKind::kSilence, /*chunk=*/1, /*times=*/1, 45000}};
  Bench bench(CancelledWrite::kCompletes, options);
  EXPECT_EQ(bench.Download(), S_OK);
  EXPECT_EQ(bench.stream.bytes.size(), 1024U);
  EXPECT_NE(bench.log.str().find("> unlogall thisport"), std::string::npos) << bench.log.str();
  bench.ExpectLinkAtOldSpeed();
}

class VelmarAbortBetweenOperations : public testing::TestWithParam<CancelledWrite> {};

// Each operation that checks the flag still sends its command, and then ends with S_FALSE.
TEST_P(VelmarAbortBetweenOperations, EndsTheNextAfterItsCommand) {
  Bench bench(GetParam());
  CVelmarProtocol& driver = bench.driver;
  const auto expect_ended = [&](const std::string& command, auto operation) {
    bench.log.str("");
    driver.Abort();
    EXPECT_EQ(operation(), S_FALSE) << command;
    EXPECT_NE(bench.log.str().find("> " + command + "\\r\n< \\r\\n<"), std::string::npos)
        << command << " was not sent and answered:\n"
        << bench.log.str();
  };
  expect_ended("log versiona once", [&] {
    CReceiverInfo info{};
    return driver.GetReceiverInfo(nullptr, &info);
  });
  expect_ended("log direnta once", [&] {
    CFileList files;
    const HRESULT result = driver.GetFiles(&files);
    EXPECT_EQ(files.Count(), 0);
    return result;
  });
  expect_ended("rename a b", [&] { return driver.RenameFile(L"a", L"b"); });
  expect_ended("del file a", [&] { return driver.DeleteFile(L"a"); });
  expect_ended("log comconfiga once", [&] { return driver.DCSetRcvBaudrate(57600); });
  EXPECT_EQ(bench.receiver.speed(), kSpeed);
}

INSTANTIATE_TEST_SUITE_P(All,
                         VelmarAbortBetweenOperations,
                         testing::Values(CancelledWrite::kCompletes, CancelledWrite::kIsLost));

}  // namespace
