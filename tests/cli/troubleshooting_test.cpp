#include "troubleshooting.h"

#include <gtest/gtest.h>
#include <windows.h>

#include "results.h"

namespace cli {
namespace {

TEST(TroubleshootingTest, EntriesAreReadFromThePage) {
  const auto entries = ReadTroubleshooting(
      "# Page\n\nText.\n\n## 0x00000001 nothing\n\nLook.\n\n- Here.\n\n## no code\n\nx\n\n## "
      "0x8007048F "
      "gone\n\nAgain.\n");
  ASSERT_EQ(entries.size(), 2U);
  EXPECT_EQ(entries[0].code, 1);
  EXPECT_EQ(entries[0].title, "nothing");
  EXPECT_EQ(entries[0].text, "Look.\n\n- Here.\n");
  EXPECT_EQ(entries[1].code, ResultOfWin32(ERROR_DEVICE_NOT_CONNECTED));
  EXPECT_EQ(entries[1].text, "Again.\n");
  EXPECT_TRUE(ReadTroubleshooting("").empty());
}

TEST(TroubleshootingTest, TheCodesThatPeopleMeetHaveEntries) {
  for (const long code : {long{S_OK},
                          long{S_FALSE},
                          long{E_NOTIMPL},
                          long{E_FAIL},
                          long{E_INVALIDARG},
                          long{E_OUTOFMEMORY},
                          ResultOfWin32(ERROR_FILE_NOT_FOUND),
                          ResultOfWin32(ERROR_PATH_NOT_FOUND),
                          ResultOfWin32(ERROR_ACCESS_DENIED),
                          ResultOfWin32(ERROR_NOT_READY),
                          ResultOfWin32(ERROR_CRC),
                          ResultOfWin32(ERROR_FILE_EXISTS),
                          ResultOfWin32(ERROR_DISK_FULL),
                          ResultOfWin32(ERROR_INVALID_NAME),
                          ResultOfWin32(ERROR_FILE_TOO_LARGE),
                          ResultOfWin32(ERROR_MORE_DATA),
                          ResultOfWin32(ERROR_CANCELLED),
                          ResultOfWin32(ERROR_DEVICE_NOT_CONNECTED),
                          ResultOfWin32(ERROR_TIMEOUT)}) {
    const auto entry = FindTroubleshooting(code);
    ASSERT_TRUE(entry) << std::hex << code;
    EXPECT_FALSE(entry->title.empty());
    EXPECT_GT(entry->text.size(), 20U);
  }
  EXPECT_FALSE(FindTroubleshooting(ResultOfWin32(ERROR_ARENA_TRASHED)));
}

TEST(TroubleshootingTest, CodesAreReadAsPeopleWriteThem) {
  const long code = ResultOfWin32(ERROR_DEVICE_NOT_CONNECTED);
  EXPECT_EQ(ParseCode("0x8007048F"), code);
  EXPECT_EQ(ParseCode("0X8007048f"), code);
  EXPECT_EQ(ParseCode("2147943567"), code);
  EXPECT_EQ(ParseCode("-2147023729"), code);
  EXPECT_EQ(ParseCode("1"), 1);
  for (const char* text : {"", "0x", "8007048F", "0x18007048F", "1x", "4294967296"}) {
    EXPECT_FALSE(ParseCode(text)) << text;
  }
}

}  // namespace
}  // namespace cli
