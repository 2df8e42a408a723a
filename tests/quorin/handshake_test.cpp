// Whether a Quorin receiver answers.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/handle.h"
#include "platform/hresult.h"
#include "tests/quorin/quorin_driver.h"
#include "tests/support/report_capture.h"

using rcvlink::KernelHandle;

using testing::ElementsAre;
using testing::ElementsAreArray;

namespace {

constexpr char kPing[] = "\r\n";
constexpr char kGetPort[] = "print,/cur/term\r\n";
constexpr char kDisableEcho[] = "set,/par/dev/ser/b/echo,/dev/null\r\n";

const std::vector<std::string> kWholeHandshake = {
    "\n", "#OFF#\r\n", "dm\r\n", "%%\r\n", "%%print,/cur/term\r\n", kDisableEcho};

class QuorinHandshake : public QuorinDriverTest {
 protected:
  QuorinHandshake() {
    receiver.Reply(kPing, "");
    receiver.Reply(kGetPort, "/dev/ser/b");
  }

  // -1 for a receiver that was found, 0 for none.
  int Check() {
    short answer = 77;
    EXPECT_EQ(driver.CheckConnection(event.get(), &answer), S_OK);
    EXPECT_TRUE(IsFreeForOthers(driver));
    return answer;
  }
  // The first part of the handshake.
  static std::vector<std::string> First(size_t count) {
    return {kWholeHandshake.begin(), kWholeHandshake.begin() + static_cast<std::ptrdiff_t>(count)};
  }

  const KernelHandle event{CreateEventW(nullptr, TRUE, FALSE, nullptr)};
};

TEST_F(QuorinHandshake, FindsAReceiver) {
  EXPECT_EQ(Check(), -1);
  EXPECT_THAT(Said(), ElementsAreArray(kWholeHandshake));
}

TEST_F(QuorinHandshake, NeedsNoEvent) {
  short answer = 0;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, -1);
}

TEST_F(QuorinHandshake, IsTheSameForTheProbeWithoutADriver) {
  EXPECT_TRUE(CQuorinProtocol::Probe(connection, nullptr));
  EXPECT_THAT(Said(), ElementsAreArray(kWholeHandshake));
}

TEST_F(QuorinHandshake, ReadsOnlyForThePingAndThePort) {
  Check();
  std::vector<std::string> reads;
  for (const std::string& call : connection->calls) {
    if (call.starts_with("read ")) reads.push_back(call);
  }
  EXPECT_THAT(reads, ElementsAre("read 65536 8000", "read 65536 30000"));
}

TEST_F(QuorinHandshake, HoldsTheConnectionMeanwhile) {
  std::vector<bool> free;
  receiver.on_hear = [&](const std::string&) { free.push_back(IsFreeForOthers(driver)); };
  Check();
  EXPECT_THAT(free, ElementsAreArray(std::vector<bool>(6, false)));
}

TEST_F(QuorinHandshake, FindsNothingWhenThePortHasNoLetter) {
  receiver.Reply(kGetPort, "usb");
  EXPECT_EQ(Check(), 0);
  EXPECT_THAT(Said(), ElementsAreArray(First(5)));
}

TEST_F(QuorinHandshake, FindsNothingWhenThePortIsRefused) {
  receiver.Reply(kGetPort, "/dev/ser/b", "ER");
  EXPECT_EQ(Check(), 0);
  EXPECT_THAT(Said(), ElementsAreArray(First(5)));
}

TEST_F(QuorinHandshake, FindsNothingWhenThePortIsNotAnswered) {
  receiver.On(kGetPort, [](const std::string&) {});
  EXPECT_EQ(Check(), 0);
  EXPECT_THAT(Said(), ElementsAreArray(First(5)));
}

TEST_F(QuorinHandshake, FindsNothingOnARefusedPing) {
  receiver.Reply(kPing, "", "ER");
  EXPECT_EQ(Check(), 0);
  EXPECT_THAT(Said(), ElementsAreArray(First(4)));
}

TEST_F(QuorinHandshake, FindsNothingOnABlankAnswerToThePing) {
  receiver.Reply(kPing, "", "  ");
  EXPECT_EQ(Check(), 0);
  EXPECT_THAT(Said(), ElementsAreArray(First(4)));
}

TEST_F(QuorinHandshake, FindsNothingWhenThePingIsNotAnswered) {
  const ReportCapture report;
  receiver.On(kPing, [](const std::string&) {});
  EXPECT_EQ(Check(), 0);
  EXPECT_THAT(Said(), ElementsAreArray(First(4)));
  EXPECT_TRUE(report.Has("CQuorinProtocol::CheckConnection - ping cmd failed [0x800705B4] [COM7]"));
  EXPECT_TRUE(report.Has("CQuorinProtocol::DumpInvalidResponse - [0x800705B4] [COM7]"));
}

TEST_F(QuorinHandshake, ReportsAFailedPingOfAConnectionWithoutAName) {
  const ReportCapture report;
  connection->name_result = E_OUTOFMEMORY;
  receiver.On(kPing, [](const std::string&) {});
  Check();
  EXPECT_TRUE(report.Has("CQuorinProtocol::CheckConnection - ping cmd failed [0x800705B4] []"));
}

TEST_F(QuorinHandshake, ReportsAPingThatWasInterrupted) {
  const ReportCapture report;
  receiver.On(kPing, [this](const std::string&) { connection->GiveResult(S_FALSE); });
  EXPECT_EQ(Check(), 0);
  EXPECT_TRUE(report.Has("CQuorinProtocol::CheckConnection - ping cmd failed [0x00000001] [COM7]"));
}

TEST_F(QuorinHandshake, ReportsNoFailedPingWhenItWentWell) {
  const ReportCapture report;
  Check();
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::CheckConnection"));
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::DumpInvalidResponse"));
}

TEST_F(QuorinHandshake, ReportsARefusal) {
  const ReportCapture report;
  receiver.Reply(kGetPort, "{denied}", "ER");
  Check();
  EXPECT_TRUE(report.Has("CQuorinProtocol::DumpInvalidResponse - [0x8007048F] [{denied}] [COM7]"));
}

TEST_F(QuorinHandshake, IgnoresWhatIsNotAnAnswer) {
  receiver.On(kPing, [this](const std::string& tag) {
    connection->GiveRead("$GPGGA,RE1 ER\x80\r\n" + Message("RE", "%0%old") + Message("RE", tag));
  });
  EXPECT_EQ(Check(), -1);
}

// Each step fails, or the event is signalled during it.
class QuorinHandshakeStep : public QuorinHandshake, public testing::WithParamInterface<size_t> {
 protected:
  static std::string Command(size_t step) {
    const std::string& said = kWholeHandshake[step];
    return said.starts_with("%%") ? said.substr(2) : said;
  }
};

TEST_P(QuorinHandshakeStep, EndsTheHandshakeWhenItCannotBeWritten) {
  receiver.FailWriteOf(Command(GetParam()), E_HANDLE);
  EXPECT_EQ(Check(), 0);
  EXPECT_THAT(Said(), ElementsAreArray(First(GetParam() + 1)));
}

TEST_P(QuorinHandshakeStep, EndsTheHandshakeWhenTheLineCannotBeEmptied) {
  size_t flushes = 0;
  connection->on_flush = [&] { return flushes++ == GetParam() ? E_HANDLE : S_OK; };
  EXPECT_EQ(Check(), 0);
  EXPECT_THAT(Said(), ElementsAreArray(First(GetParam())));
}

TEST_P(QuorinHandshakeStep, IsTheLastOnceTheEventIsSignalled) {
  size_t heard = 0;
  receiver.on_hear = [&](const std::string&) {
    if (heard++ == GetParam()) SetEvent(event.get());
  };
  // The event is not checked after the last step.
  const bool last = GetParam() + 1 == kWholeHandshake.size();
  EXPECT_EQ(Check(), last ? -1 : 0);
  EXPECT_THAT(Said(), ElementsAreArray(First(GetParam() + 1)));
  // Nor after the first step: the next one clears the line first.
  EXPECT_EQ(connection->calls.back(), GetParam() == 0 ? "flush" : "write " + Command(GetParam()));
}

INSTANTIATE_TEST_SUITE_P(All, QuorinHandshakeStep, testing::Range(size_t{0}, size_t{6}));

TEST_F(QuorinHandshake, SendsNothingOnceTheEventIsSignalled) {
  SetEvent(event.get());
  EXPECT_EQ(Check(), 0);
  EXPECT_TRUE(Said().empty());
}

// The event is signalled with the answer, so it does not stop the command itself.
TEST_F(QuorinHandshake, LooksAtTheEventAfterThePing) {
  receiver.On(kPing, [this](const std::string& tag) {
    connection->Give({S_OK, Message("RE", tag), [this] { SetEvent(event.get()); }});
  });
  EXPECT_EQ(Check(), 0);
  EXPECT_THAT(Said(), ElementsAreArray(First(4)));
}

TEST_F(QuorinHandshake, ReportsNoFailedPingOnceTheEventIsSignalled) {
  const ReportCapture report;
  receiver.On(kPing, [this](const std::string&) {
    connection->Give({S_FALSE, "", [this] { SetEvent(event.get()); }});
  });
  EXPECT_EQ(Check(), 0);
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::CheckConnection"));
}

TEST_F(QuorinHandshake, LooksAtTheEventAfterThePortQuery) {
  receiver.On(kGetPort, [this](const std::string& tag) {
    connection->Give({S_OK, Message("RE", tag + "/dev/ser/b"), [this] { SetEvent(event.get()); }});
  });
  EXPECT_EQ(Check(), 0);
  EXPECT_THAT(Said(), ElementsAreArray(First(5)));
}

// The abort flag is not checked: the interrupted write shows it.
TEST_F(QuorinHandshake, EndsWithAWriteThatAnAbortCutOff) {
  connection->on_write = [](std::string_view) { return S_FALSE; };
  short answer = 99;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, VARIANT_FALSE);
  EXPECT_EQ(connection->Written(), "\n");
}

TEST_F(QuorinHandshake, LeavesNoCancelToTheNextWait) {
  receiver.on_hear = [this](const std::string& command) {
    if (command.find("echo") != std::string::npos) driver.Abort();
  };
  short answer = 99;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, VARIANT_TRUE) << "the abort came when all was said";
  EXPECT_FALSE(connection->is_cancelled);
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), S_FALSE) << "its flag stays";
}

}  // namespace
