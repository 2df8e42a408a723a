#include "text.h"

#include <gtest/gtest.h>

namespace cli {
namespace {

TEST(TextTest, GoesToUtf8AndBack) {
  EXPECT_EQ(ToUtf8(L"gr\xFC\xDF \x20AC"), "gr\xC3\xBC\xC3\x9F \xE2\x82\xAC");
  EXPECT_EQ(ToUtf16("gr\xC3\xBC\xC3\x9F \xE2\x82\xAC"), L"gr\xFC\xDF \x20AC");
  EXPECT_EQ(ToUtf8(L""), "");
  EXPECT_EQ(ToUtf16(""), L"");
}

TEST(TextTest, HalfACharacterStaysValidUtf8) { EXPECT_EQ(ToUtf8(L"a\xD800"), "a\xEF\xBF\xBD"); }

TEST(TextTest, PrintableKeepsWhatShowsItself) {
  EXPECT_EQ(Printable(L"LOG 1.DAT"), "LOG 1.DAT");
  EXPECT_EQ(Printable(L"\xE9t\xE9"), "\xC3\xA9t\xC3\xA9");
}

TEST(TextTest, PrintableEscapesWhatControlsATerminal) {
  EXPECT_EQ(Printable(L"a\x1B[31m"), "a\\x1B[31m");
  EXPECT_EQ(Printable(L"a\nb"),
            "a\\x0A"
            "b");
  EXPECT_EQ(Printable(L"\x7F\x9B"), "\\x7F\\x9B");
  EXPECT_EQ(Printable(L"a\x202Etxt"), "a\\u202Etxt");
  EXPECT_EQ(Printable(std::wstring_view(L"a\0b", 3)),
            "a\\x00"
            "b");
}

TEST(TextTest, WritesCodesInHex) {
  EXPECT_EQ(HexCode(1), "0x00000001");
  EXPECT_EQ(HexCode(static_cast<long>(0x8007048F)), "0x8007048F");
  EXPECT_EQ(Hex(0x1B, 2), "1B");
  EXPECT_EQ(Hex(0x1, 4), "0001");
  EXPECT_EQ(Hex(0x12345, 2), "12345");
}

TEST(TextTest, PadsButNeverCuts) {
  EXPECT_EQ(PadLeft("12", 4), "  12");
  EXPECT_EQ(PadRight("12", 4), "12  ");
  EXPECT_EQ(PadLeft("12345", 4), "12345");
  EXPECT_EQ(PadRight("12345", 4), "12345");
}

TEST(TextTest, RedrawsALineOverALongerOne) {
  EXPECT_EQ(Redrawn("ab", 4), "\rab  ");
  EXPECT_EQ(Erased(3), "\r   \r");
}

TEST(TextTest, LowersAsciiLettersOnly) { EXPECT_EQ(Lowered("Com7 \xC3\x84"), "com7 \xC3\x84"); }

TEST(TextTest, CountsChangesBetweenWords) {
  EXPECT_EQ(ChangesBetween("", ""), 0U);
  EXPECT_EQ(ChangesBetween("find", "find"), 0U);
  EXPECT_EQ(ChangesBetween("", "ls"), 2U);
  EXPECT_EQ(ChangesBetween("ports", "port"), 1U);
  EXPECT_EQ(ChangesBetween("fnid", "find"), 2U);
  EXPECT_EQ(ChangesBetween("chek", "check"), 1U);
}

}  // namespace
}  // namespace cli
