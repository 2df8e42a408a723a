// Aborts of a download, call by call.
#include <algorithm>
#include <string>
#include <vector>

#include "tests/velmar/download_fixture.h"

namespace {

using testing::ElementsAre;

TEST_F(VelmarDownload, AnAbortEndsItAndItsFlagOutlivesIt) {
  Serve(3);
  before_command = [&](const std::string& command) {
    if (command == kRead) driver.Abort();
  };
  EXPECT_EQ(Download(), S_FALSE);
  before_command = nullptr;
  EXPECT_EQ(driver.DeleteFile(L"a"), S_FALSE);
  EXPECT_EQ(driver.DeleteFile(L"a"), S_OK);
}

TEST_F(VelmarDownload, AnAbortAtRaisedSpeedPutsTheSpeedBack) {
  Serve(3);
  connection->speed = 9600;
  before_command = [&](const std::string& command) {
    if (command == kRead) driver.Abort();
  };
  Download();
  const std::vector<std::string> writes = connection->Writes();
  EXPECT_THAT(std::vector<std::string>(writes.end() - 3, writes.end()),
              ElementsAre("unlogall thisport\r", kConfig, kRestore));
  EXPECT_EQ(connection->speed, 9600u);
  before_command = nullptr;
  EXPECT_EQ(driver.DeleteFile(L"a"), S_FALSE);
}

// It is not known whether the receiver took the higher speed, so it is sent the old one at the
// higher one.
TEST_F(VelmarDownload, AnAbortWhileTheReceiverConfirmsItsSpeedPutsItBackAtOnce) {
  Serve(3);
  connection->speed = 9600;
  std::vector<DWORD> speeds;
  before_command = [&](const std::string& command) {
    if (command == kRaise) {
      answers[kRaise].clear();
      driver.Abort();
    }
    if (command == kRestore) speeds.push_back(connection->speed);
  };
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig, kRaise, kRestore));
  EXPECT_THAT(speeds, ElementsAre(115200u));
  EXPECT_EQ(connection->speed, 9600u);
  EXPECT_FALSE(report.Has("CVelmarCommand::Execute - read failed [0x800705B4]"));
}

// An abort while the speed is put back ends the waits, but the receiver is still sent its old
// speed, with the settings that it had before.
class VelmarAbortedPutBack : public VelmarDownload {
 protected:
  VelmarAbortedPutBack() {
    connection->speed = 9600;
    answers[kConfig] = kOkPrompt + AsciiLog("COMCONFIGA", "1,COM1,9600,E,8,2,XON,ON,OFF,A,B,ON");
    answers[kRaiseEven] = kOkPrompt;
    answers[kStop] = kOkPrompt;
    Serve(3);
    stream.fail_at_write = 1;
  }
  // The abort comes when this command is sent at the raised speed, and the receiver no longer
  // answers.
  std::vector<std::string> DownloadAndAbortAt(const std::string& fatal) {
    before_command = [this, fatal](const std::string& command) {
      if (connection->speed != 115200 || command != fatal) return;
      answers.clear();
      driver.Abort();
    };
    EXPECT_EQ(Download(), S_OK);
    std::vector<std::string> writes = connection->Writes();
    const auto stop = std::ranges::find(writes, kStop);
    return {stop, writes.end()};
  }
  size_t TimesTimedOut() const {
    return static_cast<size_t>(
        std::ranges::count(report.Lines(), "CVelmarCommand::Execute - read failed [0x800705B4]"));
  }

  const std::string kRaiseEven = "COM 115200 E 8 2 XON\r";
  const std::string kRestoreEven = "COM 9600 E 8 2 XON\r";
};

TEST_F(VelmarAbortedPutBack, WhileTheReceiverIsStopped) {
  EXPECT_THAT(DownloadAndAbortAt(kStop), ElementsAre(kStop, kRestoreEven));
  EXPECT_EQ(TimesTimedOut(), 0u);
  EXPECT_EQ(connection->speed, 9600u);
}

TEST_F(VelmarAbortedPutBack, WhileItIsAskedForItsSettings) {
  EXPECT_THAT(DownloadAndAbortAt(kConfig), ElementsAre(kStop, kConfig, kRestoreEven));
  EXPECT_EQ(TimesTimedOut(), 0u);
  EXPECT_EQ(connection->speed, 9600u);
}

TEST_F(VelmarAbortedPutBack, WhileItConfirmsItsSpeed) {
  EXPECT_THAT(DownloadAndAbortAt(kRestoreEven), ElementsAre(kStop, kConfig, kRestoreEven));
  EXPECT_EQ(TimesTimedOut(), 0u);
  EXPECT_EQ(connection->speed, 9600u);
}

// Just before the line is written, when a cancel would end a command before it is sent.
TEST_F(VelmarAbortedPutBack, AsTheLineIsAboutToBeSent) {
  const auto discard = connection->on_flush;
  bool asked = false;
  connection->on_flush = [&] {
    if (asked) driver.Abort();
    return discard();
  };
  before_command = [&](const std::string& command) {
    asked = connection->speed == 115200 && command == kConfig;
  };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(connection->Writes().back(), kRestoreEven);
  EXPECT_EQ(connection->speed, 9600u);
}

// The line is sent before the host changes its own speed.
TEST_F(VelmarAbortedPutBack, DoesNotInterruptTheLine) {
  DownloadAndAbortAt(kConfig);
  const auto told = std::ranges::find(connection->calls, "write " + kRestoreEven);
  ASSERT_NE(told, connection->calls.end());
  EXPECT_THAT(std::vector<std::string>(told + 1, connection->calls.end()),
              ElementsAre("flush", "speed 9600"));
}

// Nobody waited for the answer to the line, so it may still come.
TEST_F(VelmarAbortedPutBack, TheNextCommandWaitsForTheAnswerToTheLine) {
  DownloadAndAbortAt(kConfig);
  before_command = nullptr;
  answers["del file a\r"] = kOkPrompt;
  const DWORD paused = clock.paused;
  driver.DeleteFile(L"a");
  EXPECT_EQ(clock.paused - paused, 500u + 500u)
      << "once before it, and after it as after every command";
}

TEST_F(VelmarDownload, AnAbortThatEndedItDoesNotDisturbThePutBack) {
  Serve(3);
  connection->speed = 9600;
  before_command = [&](const std::string& command) {
    if (command == kRead) driver.Abort();
    if (command == kStop || command == kRestore) answers[command] = kOkPrompt;
  };
  EXPECT_EQ(Download(), S_OK);
  const std::vector<std::string> writes = connection->Writes();
  EXPECT_THAT(std::vector<std::string>(writes.end() - 3, writes.end()),
              ElementsAre(kStop, kConfig, kRestore));
  EXPECT_FALSE(report.Has("CVelmarCommand::Execute - read failed [0x800705B4]"));
}

// The answer to the interrupted command would be taken for that of the next one.
TEST_F(VelmarDownload, TheCommandAfterAnInterruptedOneWaitsForItsLateAnswer) {
  Serve(3);
  before_command = [&](const std::string& command) {
    if (command == kCurrent) driver.Abort();
  };
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(clock.paused, 0u);
  before_command = nullptr;
  answers["del file a\r"] = kOkPrompt;
  driver.DeleteFile(L"a");
  EXPECT_EQ(clock.paused, 500u + 500u) << "once before it, and after it as after every command";
  driver.DeleteFile(L"a");
  EXPECT_EQ(clock.paused, 500u + 500u + 500u);
}

}  // namespace
