// The download of a Velmar receiver: the steps around the transfer of the file.
#include <algorithm>
#include <string>
#include <utility>
#include <vector>

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
    before_command = [&, changed = command, to = answer](const std::string& now) {
      if (now == kRead) answers[changed] = to;
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

}  // namespace
