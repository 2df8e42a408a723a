// The download of a Velmar receiver: the steps around the transfer of the file.
#include <algorithm>
#include <string>
#include <utility>
#include <vector>

#include "platform/hresult.h"
#include "tests/velmar/download_fixture.h"

namespace {

using testing::ElementsAre;

TEST_F(VelmarDownload, HoldsTheConnectionUntilAllIsDone) {
  Serve(2);
  connection->speed = 9600;
  std::vector<bool> free;
  before_command = [&](const std::string&) { free.push_back(IsFreeForOthers(driver)); };
  on_percent = [&](int) { free.push_back(IsFreeForOthers(driver)); };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(free.size(), 7u + 4u);
  EXPECT_THAT(free, testing::Each(false));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDownload, NamesAreInTheCodePageOfTheThread) {
  constexpr LCID kGreek = 0x0408;
  const LCID before = GetThreadLocale();
  SetThreadLocale(kGreek);
  driver.DownloadFile(L"\x3B1 \"%s\"", &stream, nullptr);
  SetThreadLocale(before);
  EXPECT_THAT(connection->Writes(), ElementsAre("currentfile \xE1 \"%s\" all\r"));
}

TEST_F(VelmarDownload, AFastLinkIsLeftAlone) {
  Serve(1);
  Download();
  EXPECT_THAT(connection->Writes(), ElementsAre(kCurrent, kHeader, kRead));
}

TEST_F(VelmarDownload, ASlowLinkIsRaisedAndPutBackTheReceiverFirst) {
  Serve(1);
  connection->speed = 9600;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(connection->Writes(),
              ElementsAre(kConfig, kRaise, kCurrent, kHeader, kRead, kConfig, kRestore));
  EXPECT_EQ(connection->speed, 9600u);
  const auto at = [&](const std::string& call) {
    return std::ranges::find(connection->calls, call) - connection->calls.begin();
  };
  EXPECT_LT(at("write " + kRaise), at("speed 115200"));
  EXPECT_LT(at("write " + kRestore), at("speed 9600"));
}

TEST_F(VelmarDownload, AReceiverThatCannotBeRaisedStaysSlow) {
  Serve(1);
  connection->speed = 9600;
  const auto answer = connection->on_write;
  connection->on_write = [=](std::string_view bytes) {
    return bytes == kConfig ? E_HANDLE : answer(bytes);
  };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_TRUE(
      report.Has("CVelmarProtocol::DownloadFile - receiver speed up is failed [0x80070006]"));
  EXPECT_EQ(connection->speed, 9600u);
  EXPECT_EQ(stream.bytes.size(), 100u);
}

TEST_F(VelmarDownload, AReceiverThatRefusesTheSpeedStaysSlow) {
  for (const std::string& refusal : {kErrorPrompt, kErrorTextPrompt}) {
    Serve(1);
    connection->speed = 9600;
    answers[kRaise] = refusal;
    stream.bytes.clear();
    EXPECT_EQ(Download(), S_OK);
    EXPECT_TRUE(
        report.Has("CVelmarProtocol::DownloadFile - receiver speed up is failed [0x00000001]"));
    EXPECT_THAT(connection->calls, testing::Not(testing::Contains("speed 115200")));
    EXPECT_EQ(stream.bytes.size(), 100u);
    EXPECT_EQ(connection->Writes().back(), kRead);  // and no speed is put back
  }
}

// One bit per second less than full speed is raised.
TEST_F(VelmarDownload, AnySlowerLinkIsRaised) {
  for (const DWORD speed : {1ul, 300ul, 57600ul, 115199ul}) {
    Serve(1);
    connection->speed = speed;
    connection->calls.clear();
    EXPECT_EQ(Download(), S_OK);
    EXPECT_THAT(connection->calls, testing::Contains("speed 115200"));
    EXPECT_EQ(connection->speed, speed);
  }
}

// A host that knows no speed of its own, or one that is negative as a number, is raised, and no
// speed is put back.
TEST_F(VelmarDownload, UnusualSpeedsAreNotPutBack) {
  for (const DWORD speed : {0ul, 0x80000000ul, 0xFFFFFFFFul}) {
    ScriptedConnection* const link = connection;
    const size_t before = link->Writes().size();
    Serve(1);
    link->speed = speed;
    EXPECT_EQ(Download(), S_OK);
    EXPECT_EQ(link->speed, 115200u) << speed;
    const std::vector<std::string> writes = link->Writes();
    EXPECT_THAT(std::vector<std::string>(writes.begin() + static_cast<std::ptrdiff_t>(before),
                                         writes.end()),
                ElementsAre(kConfig, kRaise, kCurrent, kHeader, kRead));
  }
}

TEST_F(VelmarDownload, TheLargestPositiveSpeedIsFastEnough) {
  Serve(1);
  connection->speed = 0x7FFFFFFF;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kCurrent, kHeader, kRead));
  EXPECT_EQ(connection->speed, 0x7FFFFFFFu);
}

// The kept reply then repeats its beginning.
TEST_F(VelmarDownload, ARefusalOfTheSpeedIsSeenWhereverItIsCut) {
  for (const std::string& refusal : {kErrorPrompt, kErrorTextPrompt}) {
    for (size_t cut = 1; cut < refusal.size(); ++cut) {
      Serve(1);
      connection->speed = 9600;
      connection->calls.clear();
      before_command = [&](const std::string& command) {
        if (command == kRaise) connection->GiveRead(refusal.substr(0, cut));
      };
      answers[kRaise] = refusal.substr(cut);
      stream.bytes.clear();
      EXPECT_EQ(Download(), S_OK) << cut;
      EXPECT_THAT(connection->calls, testing::Not(testing::Contains("speed 115200"))) << cut;
      EXPECT_EQ(stream.bytes.size(), 100u) << cut;
    }
  }
}

// It was not raised: raising the host would cut the link.
TEST_F(VelmarDownload, AReceiverThatNamesNoPortStaysSlow) {
  Serve(1);
  connection->speed = 9600;
  answers[kConfig] = kOkPrompt;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig, kCurrent, kHeader, kRead));
  EXPECT_EQ(connection->speed, 9600u);
}

TEST_F(VelmarDownload, AHostThatCannotFollowPutsTheReceiverBackAtOnce) {
  Serve(1);
  connection->speed = 9600;
  connection->set_speed_result = E_ACCESSDENIED;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_TRUE(report.Has("CVelmarProtocol::DownloadFile - host speed up is failed [0x80070005]"));
  EXPECT_THAT(connection->Writes(),
              ElementsAre(kConfig, kRaise, kConfig, kRestore, kCurrent, kHeader, kRead));
  EXPECT_EQ(connection->speed, 9600u);
  EXPECT_EQ(stream.bytes.size(), 100u);
}

// When the speed is put back at once, a failure of that is not reported.
TEST_F(VelmarDownload, AHostThatCannotFollowIgnoresTheResultOfThePutBack) {
  Serve(1);
  connection->speed = 9600;
  connection->set_speed_result = E_ACCESSDENIED;
  answers[kRestore] = kOkPrompt + "<";
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes.size(), 100u);
}

// A host that reports that it already has the full speed.
TEST_F(VelmarDownload, AHostThatHasNothingToChangeHasFollowed) {
  Serve(1);
  connection->speed = 9600;
  connection->set_speed_result = S_FALSE;
  EXPECT_EQ(Download(), S_FALSE);  // the result of putting the speed back
  EXPECT_THAT(connection->Writes(),
              ElementsAre(kConfig, kRaise, kCurrent, kHeader, kRead, kConfig, kRestore));
}

TEST_F(VelmarDownload, UsbHasNoSpeed) {
  Serve(1);
  connection->instance_type = eInstanceUSB;
  connection->speed_result = E_HANDLE;  // it is never read
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kCurrent, kHeader, kRead));
}

TEST_F(VelmarDownload, ALinkThatCannotBeAskedEndsItBeforeAnythingIsSent) {
  connection->instance_type_result = E_HANDLE;
  EXPECT_EQ(Download(), E_HANDLE);
  connection->instance_type_result = S_OK;
  connection->speed_result = E_ACCESSDENIED;
  EXPECT_EQ(Download(), E_ACCESSDENIED);
  EXPECT_TRUE(connection->Writes().empty());
  EXPECT_THAT(percents, ElementsAre(0, 0));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDownload, AnUnknownFileIsAnEmptySuccess) {
  answers[kCurrent] = kErrorPrompt;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kCurrent));
  EXPECT_EQ(stream.writes, 0u);
  EXPECT_THAT(percents, ElementsAre(0, 100));
}

TEST_F(VelmarDownload, AFileThatIsRefusedWithATextIsAnEmptySuccess) {
  answers[kCurrent] = kErrorTextPrompt;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kCurrent));
  EXPECT_THAT(percents, ElementsAre(0, 100));
}

// With bytes after the prompt it is not a plain acknowledgement.
TEST_F(VelmarDownload, AFileThatIsAnsweredWithALogIsAnEmptySuccess) {
  answers[kCurrent] = kOkPrompt + AsciiLog("A", "body");
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kCurrent));
}

TEST_F(VelmarDownload, ARefusalAtRaisedSpeedIsPutBackToo) {
  connection->speed = 9600;
  answers[kCurrent] = kErrorPrompt;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig, kRaise, kCurrent, kConfig, kRestore));
  EXPECT_EQ(connection->speed, 9600u);
  EXPECT_THAT(percents, ElementsAre(0, 100));
}

TEST_F(VelmarDownload, AFailingCommandEndsItWithoutALastProgress) {
  Serve(1);
  for (const std::string& failing : {kCurrent, kHeader, kRead}) {
    const std::string answer = std::exchange(answers[failing], kOkPrompt + "<");
    percents.clear();
    EXPECT_EQ(Download(), E_NOTIMPL) << failing;
    // When it may have begun to send, it is stopped.
    EXPECT_EQ(connection->Writes().back(), failing == kRead ? kStop : failing);
    EXPECT_THAT(percents, ElementsAre(0));
    EXPECT_TRUE(report.Has("CVelmarProtocol::DumpInvalidResponse - [0x80004001] [] [COM7]"));
    EXPECT_EQ(stream.references, 1u);
    EXPECT_TRUE(IsFreeForOthers(driver));
    answers[failing] = answer;
  }
  EXPECT_EQ(stream.writes, 0u);
}

// The size is not known while the header is incomplete.
TEST_F(VelmarDownload, AHeaderThatStopsInBetweenCountsAsASizeOfNothing) {
  Serve(1);
  answers[kHeader] = kOkPrompt + AsciiLog("FILEHDRA", "\"a.pdc\",100,0");
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes.size(), 100u);
  EXPECT_THAT(percents, ElementsAre(0, 100, 100));
}

TEST_F(VelmarDownload, WithoutAHeaderNothingIsRead) {
  answers[kHeader] = kOkPrompt;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kCurrent, kHeader));
  EXPECT_THAT(percents, ElementsAre(0, 100));
}

// The result of putting the speed back replaces that of the transfer.
TEST_F(VelmarDownload, AtRaisedSpeedTheResultOfThePutBackReplacesAFailure) {
  Serve(3);
  connection->speed = 9600;
  stream.fail_at_write = 1;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(connection->speed, 9600u);
}

// When putting the speed back fails itself, the download returns its code; the host keeps its
// speed.
TEST_F(VelmarDownload, APutBackThatCannotBeAskedForGivesItsCode) {
  for (const std::string& failing : {kConfig, kRestore}) {
    Serve(1);
    connection->speed = 9600;
    connection->calls.clear();
    std::string read_to_the_end;
    before_command = [&](const std::string& command) {
      if (command == kRead) read_to_the_end = std::exchange(answers[failing], kOkPrompt + "<");
    };
    EXPECT_EQ(Download(), E_NOTIMPL) << failing;
    EXPECT_EQ(connection->speed, 115200u);
    EXPECT_THAT(connection->calls, testing::Not(testing::Contains("speed 9600")));
    EXPECT_EQ(stream.bytes.size(), 100u);
    EXPECT_EQ(percents.back(), 100);
    EXPECT_TRUE(IsFreeForOthers(driver));
    answers[failing] = read_to_the_end;
    stream.bytes.clear();
  }
}

// A receiver that keeps its speed, or does not name its port, is not waited for.
TEST_F(VelmarDownload, TheHostGoesBackWhateverTheReceiverAnswers) {
  for (const auto& [command, answer] : {std::pair(kRestore, kErrorPrompt),
                                        std::pair(kRestore, kErrorTextPrompt),
                                        std::pair(kRestore, std::string()),
                                        std::pair(kConfig, kOkPrompt)}) {
    Serve(1);
    connection->speed = 9600;
    const std::string usual = answers[command];
    before_command = [&](const std::string& now) {
      if (now == kRead) answers[command] = answer;
    };
    EXPECT_EQ(Download(), S_OK);
    EXPECT_EQ(connection->speed, 9600u);
    answers[command] = usual;
  }
}

TEST_F(VelmarDownload, AFasterLinkIsLeftAlone) {
  Serve(1);
  connection->speed = 230400;
  Download();
  EXPECT_THAT(connection->Writes(), ElementsAre(kCurrent, kHeader, kRead));
  EXPECT_EQ(connection->speed, 230400u);
}

TEST_F(VelmarDownload, APutBackThatFailsGivesItsCode) {
  Serve(1);
  connection->speed = 9600;
  before_command = [&](const std::string& command) {
    if (command == kRestore) connection->set_speed_result = E_ACCESSDENIED;
  };
  EXPECT_EQ(Download(), E_ACCESSDENIED);
}

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
