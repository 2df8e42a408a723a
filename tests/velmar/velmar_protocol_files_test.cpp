// The driver's list of files, and their changes.
#include <string>
#include <vector>

#include "tests/velmar/velmar_driver.h"

namespace {

using testing::Contains;
using testing::ElementsAre;

const std::string kDirectory = "log direnta once\r";

TEST_F(VelmarDriver, ListsFilesAndReportsTheirShare) {
  std::string reply = kOkPrompt;
  for (int i = 3; i >= 0; --i) {
    reply += AsciiLog("DIRENTA", "\"f" + std::to_string(i) + "\",10,0,20121231,235959", i);
  }
  answers = {{kDirectory, reply}};
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  ASSERT_EQ(files.Count(), 4);
  EXPECT_STREQ(files.At(0).bstrName, L"f3");
  EXPECT_EQ(files.At(0).stTime2.wYear, 2012);
  EXPECT_THAT(percents, ElementsAre(0, 90, 90, 92, 95, 97));
}

TEST_F(VelmarDriver, FillsTheRecordOfAFile) {
  answers = {{kDirectory, kOkPrompt + AsciiLog("DIRENTA", "\"a b\",1000,7,20130709,010203")}};
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  ASSERT_EQ(files.Count(), 1);
  const CFileInfo& file = files.At(0);
  EXPECT_EQ(file.dwSize, 1000u);
  EXPECT_STREQ(file.bstrName, L"a b");
  EXPECT_EQ(file.qwReserved, 0u);
  for (const SYSTEMTIME& time : {file.stTime1, file.stTime2}) {
    EXPECT_EQ(time.wYear, 2013);
    EXPECT_EQ(time.wMonth, 7);
    EXPECT_EQ(time.wDay, 9);
    EXPECT_EQ(time.wHour, 1);
    EXPECT_EQ(time.wMinute, 2);
    EXPECT_EQ(time.wSecond, 3);
  }
}

// The list belongs to the host: its entries stay.
TEST_F(VelmarDriver, AppendsToTheList) {
  answers = {{kDirectory, kOkPrompt + AsciiLog("DIRENTA", "a,1,0,20121231,235959")}};
  CFileList files;
  driver.GetFiles(&files);
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  EXPECT_EQ(files.Count(), 2);
}

// The logs before a gap in their numbers are still listed.
TEST_F(VelmarDriver, ADirectoryWithAGapIsListedAsFarAsItWent) {
  answers = {{kDirectory,
              kOkPrompt + AsciiLog("DIRENTA", "a,1,0,20121231,235959", 3) +
                  AsciiLog("DIRENTA", "b,1,0,20121231,235959", 1)}};
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  EXPECT_EQ(files.Count(), 2);
  EXPECT_THAT(percents, ElementsAre(0, 90, 90, 95));
}

TEST_F(VelmarDriver, ADirectoryThatIsRefusedIsAnEmptyOne) {
  for (const std::string& refusal : {kErrorPrompt, kErrorTextPrompt, std::string()}) {
    answers = {{kDirectory, refusal}};
    CFileList files;
    EXPECT_EQ(driver.GetFiles(&files), S_OK);
    EXPECT_EQ(files.Count(), 0);
  }
}

TEST_F(VelmarDriver, ADirectoryThatFailsGivesItsCode) {
  answers = {{kDirectory, kOkPrompt + "<DIRENT"}};
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), E_NOTIMPL);
  EXPECT_THAT(percents, ElementsAre(0));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, AnAbortLeavesTheListAlone) {
  answers = {{kDirectory, kOkPrompt + AsciiLog("DIRENTA", "a,1,0,20121231,235959")}};
  driver.Abort();
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), S_FALSE);
  EXPECT_EQ(files.Count(), 0);
  EXPECT_THAT(percents, ElementsAre(0));
  EXPECT_TRUE(IsFreeForOthers(driver));
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  EXPECT_EQ(files.Count(), 1);
}

TEST_F(VelmarDriver, HoldsTheConnectionWhileItLists) {
  answers = {{kDirectory, kOkPrompt + AsciiLog("DIRENTA", "a,1,0,20121231,235959")}};
  std::vector<bool> free;
  on_percent = [&](int) { free.push_back(IsFreeForOthers(driver)); };
  CFileList files;
  driver.GetFiles(&files);
  EXPECT_THAT(free, ElementsAre(false, false, false));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, AnEmptyDirectoryEndsAtNinety) {
  answers = {{kDirectory, kOkPrompt}};
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  EXPECT_EQ(files.Count(), 0);
  EXPECT_THAT(percents, ElementsAre(0, 90));
}

// --- DeleteFile, RenameFile

TEST_F(VelmarDriver, DeletesAndRenames) {
  EXPECT_EQ(driver.DeleteFile(L"a.pdc"), S_OK);
  EXPECT_EQ(driver.RenameFile(L"a", L"b"), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre("del file a.pdc\r", "rename a b\r"));
  EXPECT_THAT(percents, ElementsAre(0, 100, 0, 100));
}

TEST_F(VelmarDriver, ARefusedDeletionCountsAsDone) {
  answers = {{"del file a\r", kErrorTextPrompt}};
  EXPECT_EQ(driver.DeleteFile(L"a"), S_OK);
}

TEST_F(VelmarDriver, AChangeThatCannotBeSentGivesItsCode) {
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(driver.DeleteFile(L"a"), E_HANDLE);
  EXPECT_EQ(driver.RenameFile(L"a", L"b"), E_HANDLE);
  EXPECT_THAT(percents, ElementsAre(0, 0));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, HoldsTheConnectionWhileItChangesAFile) {
  std::vector<bool> free;
  on_percent = [&](int) { free.push_back(IsFreeForOthers(driver)); };
  driver.DeleteFile(L"a");
  driver.RenameFile(L"a", L"b");
  EXPECT_THAT(free, ElementsAre(false, false, false, false));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

// Names are sent unchanged in the code page of the thread.
TEST_F(VelmarDriver, NamesAreInTheCodePageOfTheThread) {
  constexpr LCID kGreek = 0x0408;
  const LCID before = GetThreadLocale();
  SetThreadLocale(kGreek);
  driver.DeleteFile(L"\x3B1 \"%s\"");
  driver.RenameFile(L"\x3B1", L"\x3B2");
  SetThreadLocale(before);
  EXPECT_THAT(connection->Writes(), ElementsAre("del file \xE1 \"%s\"\r", "rename \xE1 \xE2\r"));
}

TEST_F(VelmarDriver, EmptyNamesAreSentToo) {
  EXPECT_EQ(driver.DeleteFile(L""), S_OK);
  EXPECT_EQ(driver.RenameFile(L"", L""), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre("del file \r", "rename  \r"));
}

TEST_F(VelmarDriver, AnAbortBetweenOperationsEndsTheNextAfterItsCommand) {
  driver.Abort();
  EXPECT_EQ(driver.DeleteFile(L"a"), S_FALSE);
  EXPECT_THAT(connection->Writes(), ElementsAre("del file a\r"));
  EXPECT_EQ(driver.DeleteFile(L"a"), S_OK);
}

TEST_F(VelmarDriver, AnAbortDuringARenameEndsIt) {
  before_command = [&](const std::string&) { driver.Abort(); };
  EXPECT_EQ(driver.RenameFile(L"a", L"b"), S_FALSE);
  EXPECT_THAT(connection->calls, Contains("cancel"));
  EXPECT_THAT(percents, ElementsAre(0));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

}  // namespace
