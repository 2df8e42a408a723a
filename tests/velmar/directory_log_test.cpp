// The directory's logs where a mistake in a number or a lack of memory would show.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <new>
#include <string>
#include <vector>

#include "tests/support/allocations.h"
#include "tests/velmar/velmar_replies.h"
#include "velmar/commands.h"
#include "velmar/logs.h"

namespace {

using namespace VelmarCommands;
using testing::Contains;
using testing::Not;

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

const std::string kLog = AsciiLog("DIRENTA", "\"a name of some length\",1,0,20121231,235959");

// Runs the function with each of its allocations failing, then with none; an exception leaves the
// value as it was.
template <typename Value, typename Function>
std::vector<Value> WithEachAllocationFailing(Value value_of_exception, Function function) {
  std::vector<Value> values;
  for (bool has_failed = true; has_failed;) {
    Value value = value_of_exception;
    {
      const Allocations allocations(values.size());
      try {
        value = function();
      } catch (const std::bad_alloc&) {
      }
      has_failed = Allocations::HasFailed();
    }
    values.push_back(value);
  }
  return values;
}

// Whichever allocation fails, the directory is not taken as complete.
TEST(DirectoryLogMemory, ADirectoryThatIsReadIsWhole) {
  std::vector<Progress> all = WithEachAllocationFailing(Progress::kNothing, [] {
    FileEntries entries;
    return DecodeDirectory(kLog, entries);
  });
  EXPECT_EQ(all.back(), Progress::kComplete);
  all.pop_back();
  EXPECT_THAT(all, Contains(Progress::kNoMemory));
  EXPECT_THAT(all, Not(Contains(Progress::kComplete)));
}

TEST(DirectoryLogMemory, TheCommandEndsWithoutIt) {
  std::vector<HRESULT> all = WithEachAllocationFailing(S_FALSE, [] {
    CGetFileListCmd command;
    bool done = false;
    uint32_t consumed = 0;
    return command.ParseAsciiLog(kLog.data(), static_cast<uint32_t>(kLog.size()), &done, &consumed);
  });
  EXPECT_EQ(all.back(), S_OK);
  all.pop_back();
  EXPECT_THAT(all, Contains(E_OUTOFMEMORY));
  EXPECT_THAT(all, Not(Contains(S_OK)));
}

}  // namespace
