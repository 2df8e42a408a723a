// The download of a Velmar receiver, on a scripted connection.
#include <algorithm>
#include <string>
#include <vector>

#include "platform/hresult.h"
#include "tests/support/memory_stream.h"
#include "tests/velmar/velmar_driver.h"

namespace {

using testing::ElementsAre;

const std::string kCurrent = "currentfile a.pdc all\r";
const std::string kHeader = "log filehdra\r";
const std::string kRead = "log filetransferb\r";
const std::string kConfig = "log comconfiga once\r";
const std::string kRaise = "COM 115200 N 8 1 N\r";
const std::string kRestore = "COM 9600 N 8 1 N\r";

std::string HeaderReply(const std::string& size) {
  std::string body = "\"a.pdc\"," + size;
  for (int i = 2; i < 23; ++i) body += ",0";
  return kOkPrompt + AsciiLog("FILEHDRA", body);
}

class VelmarDownload : public VelmarDriver {
 protected:
  VelmarDownload() {
    connection->speed = 115200;
    answers = {
        {kCurrent, kOkPrompt},
        {kConfig,
         kOkPrompt + AsciiLog("COMCONFIGA", "1,COM1,9600,N,8,1,N,ON,OFF,NOVATEL,NOVATEL,ON")},
        {kRaise, kOkPrompt},
        {kRestore, kOkPrompt}};
  }
  // A file in chunks of 100 bytes.
  void Serve(int chunks) {
    answers[kHeader] = HeaderReply(std::to_string(chunks * 100));
    std::string reply = kOkPrompt;
    for (int i = chunks - 1; i >= 0; --i) {
      reply +=
          BinaryLog{std::string(100, static_cast<char>('a' + i)), static_cast<uint16_t>(i)}.Bytes();
    }
    answers[kRead] = reply;
  }
  HRESULT Download() { return driver.DownloadFile(L"a.pdc", &stream, nullptr); }

  MemoryStream stream;
};

TEST_F(VelmarDownload, BringsTheFileAndReportsEachPercentOnce) {
  Serve(10);
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes.size(), 1000u);
  EXPECT_EQ(stream.bytes.substr(0, 1), "j");
  EXPECT_EQ(stream.bytes.substr(999), "a");
  EXPECT_THAT(percents, ElementsAre(0, 10, 20, 30, 40, 50, 60, 70, 80, 90, 100, 100));
  EXPECT_EQ(stream.references, 1u);
  EXPECT_TRUE(report.HasStart("CVelmarProtocol::DownloadFile - connection is locked [0x"));
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
    EXPECT_EQ(connection->Writes().back(), kRead);  // and nothing is put back
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
}

TEST_F(VelmarDownload, UsbHasNoSpeed) {
  Serve(1);
  connection->instance_type = eInstanceUSB;
  connection->speed_result = E_HANDLE;  // nobody asks
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
}

TEST_F(VelmarDownload, AnUnknownFileIsAnEmptySuccess) {
  answers[kCurrent] = kErrorPrompt;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kCurrent));
  EXPECT_EQ(stream.writes, 0u);
  EXPECT_THAT(percents, ElementsAre(0, 100));
}

TEST_F(VelmarDownload, WithoutAHeaderNothingIsRead) {
  answers[kHeader] = kOkPrompt;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kCurrent, kHeader));
  EXPECT_THAT(percents, ElementsAre(0, 100));
}

TEST_F(VelmarDownload, AFileSaidToBeEmptyIsCompleteAtOnce) {
  Serve(2);
  answers[kHeader] = HeaderReply("0");
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes.size(), 200u);
  EXPECT_THAT(percents, ElementsAre(0, 100, 100));
}

TEST_F(VelmarDownload, AFailingStreamEndsIt) {
  Serve(3);
  stream.fail_at_write = 1;
  EXPECT_EQ(Download(), STG_E_MEDIUMFULL);
  EXPECT_EQ(stream.writes, 2u);
  EXPECT_THAT(percents, ElementsAre(0, 33));
}

// The put-back's result takes the place of the transfer's.
TEST_F(VelmarDownload, AtRaisedSpeedAFailureIsCoveredByThePutBack) {
  Serve(3);
  connection->speed = 9600;
  stream.fail_at_write = 1;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(connection->speed, 9600u);
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

// In 32-bit arithmetic the product of a large file wraps, as hosts have always seen it.
TEST_F(VelmarDownload, ThePercentOfALargeFileWraps) {
  answers[kHeader] = HeaderReply("100000000");
  answers[kRead] = kOkPrompt + BinaryLog{std::string(1024, 'x'), 1}.Bytes() +
                   BinaryLog{std::string(1024, 'x'), 0}.Bytes();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(percents, ElementsAre(0, 100));
}

}  // namespace
