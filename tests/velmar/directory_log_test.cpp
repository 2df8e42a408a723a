// The directory's logs where a mistake in a number or a lack of memory would show.
#include <gtest/gtest.h>

#include <string>

#include "tests/support/allocations.h"
#include "tests/velmar/velmar_replies.h"
#include "velmar/logs.h"

namespace {

using namespace VelmarCommands;

SYSTEMTIME TimeOfEntry(const std::string& date_and_time) {
  FileEntries entries;
  EXPECT_EQ(DecodeDirectory(AsciiLog("DIRENTA", "a,1,0," + date_and_time), entries),
            Progress::kComplete);
  return entries.empty() ? SYSTEMTIME{} : entries[0].time;
}

// The first value of each part is the nearest to that of the part before.
TEST(DirectoryLogTimes, HaveTheFirstOfEachPart) {
  const SYSTEMTIME time = TimeOfEntry("20121001,200100");
  EXPECT_EQ(time.wYear, 2012);
  EXPECT_EQ(time.wMonth, 10);
  EXPECT_EQ(time.wDay, 1);
  EXPECT_EQ(time.wHour, 20);
  EXPECT_EQ(time.wMinute, 1);
  EXPECT_EQ(time.wSecond, 0);
}

TEST(DirectoryLogTimes, HaveTheLastOfEachPart) {
  const SYSTEMTIME time = TimeOfEntry("99991231,235959");
  EXPECT_EQ(time.wYear, 9999);
  EXPECT_EQ(time.wMonth, 12);
  EXPECT_EQ(time.wDay, 31);
  EXPECT_EQ(time.wHour, 23);
  EXPECT_EQ(time.wMinute, 59);
  EXPECT_EQ(time.wSecond, 59);
}

// Whichever allocation fails, the directory is not taken as complete.
TEST(DirectoryLogMemory, ADirectoryThatIsReadIsWhole) {
  const std::string text = AsciiLog("DIRENTA", "\"a name of some length\",1,0,20121231,235959");
  bool said_so = false;
  bool completed = false;
  for (size_t failing = 0; !completed; ++failing) {
    FileEntries entries;
    Progress progress = Progress::kNothing;
    bool has_failed = false;
    {
      const Allocations allocations(failing);
      try {
        progress = DecodeDirectory(text, entries);
      } catch (const std::bad_alloc&) {
        progress = Progress::kNothing;
      }
      has_failed = Allocations::HasFailed();
    }
    completed = !has_failed;
    EXPECT_EQ(progress == Progress::kComplete, completed) << "allocation " << failing;
    said_so = said_so || progress == Progress::kNoMemory;
  }
  EXPECT_TRUE(said_so);
}

}  // namespace
