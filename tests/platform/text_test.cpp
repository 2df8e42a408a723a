#include "platform/text.h"

#include <gtest/gtest.h>

#include "platform/hresult.h"

using rcvlink::CatchResult;
using rcvlink::CheckFormat;
using rcvlink::CopyBstr;
using rcvlink::FormatArguments;
using rcvlink::FormatText;
using rcvlink::ToNarrow;
using rcvlink::ToWide;
using rcvlink::UniqueBstr;

namespace {

std::wstring FormatWide(const wchar_t* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  std::wstring text = FormatArguments(format, arguments);
  va_end(arguments);
  return text;
}

HRESULT CheckNarrow(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  const HRESULT result = CatchResult([&] { return CheckFormat(format, arguments), S_OK; });
  va_end(arguments);
  return result;
}

HRESULT CheckWide(const wchar_t* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  const HRESULT result = CatchResult([&] { return CheckFormat(format, arguments), S_OK; });
  va_end(arguments);
  return result;
}

TEST(CopyBstr, CopiesText) {
  const std::wstring text = L"A0101.log";
  const UniqueBstr copy = CopyBstr(text.c_str());
  EXPECT_NE(copy.get(), text.c_str());
  EXPECT_STREQ(copy.get(), L"A0101.log");
  EXPECT_EQ(SysStringLen(copy.get()), 9U);
}

TEST(CopyBstr, TellsAnEmptyTextFromNone) {
  EXPECT_FALSE(CopyBstr(nullptr));
  const UniqueBstr empty = CopyBstr(L"");
  ASSERT_TRUE(empty);
  EXPECT_EQ(SysStringLen(empty.get()), 0U);
}

TEST(Conversion, KeepsAsciiAndZeros) {
  using namespace std::string_view_literals;
  EXPECT_EQ(ToWide("a\0b"sv), L"a\0b"sv);
  EXPECT_EQ(ToNarrow(L"a\0b"sv), "a\0b"sv);
}

TEST(Conversion, TakesTheWholeViewAndNoMore) {
  EXPECT_EQ(ToWide(std::string_view("abc").substr(0, 2)), L"ab");
  EXPECT_EQ(ToNarrow(std::wstring_view(L"abc").substr(0, 2)), "ab");
}

TEST(Conversion, OfNothingIsNothing) {
  EXPECT_EQ(ToWide({}), L"");
  EXPECT_EQ(ToNarrow({}), "");
}

TEST(FormatText, IsThatOfPrintf) {
  EXPECT_EQ(FormatText("%s is %d of %5.1f [0x%08X]", "x", -3, 2.5, 0xABCU),
            "x is -3 of   2.5 [0x00000ABC]");
  EXPECT_EQ(FormatText(""), "");
}

TEST(FormatText, MayBeLong) {
  const std::string text(100'000, 'x');
  EXPECT_EQ(FormatText("[%s]", text.c_str()), "[" + text + "]");
}

TEST(FormatText, NeedsAFormat) {
  const char* const none = nullptr;
  EXPECT_EQ(CatchResult([&] { return FormatText(none), S_OK; }), E_INVALIDARG);
}

TEST(FormatArguments, MakesWideText) {
  EXPECT_EQ(FormatWide(L"%ls is %d", L"COM7", 7), L"COM7 is 7");
  EXPECT_EQ(CatchResult([] { return FormatWide(nullptr), S_OK; }), E_INVALIDARG);
}

TEST(CheckFormat, RaisesWhatTheFormatWouldRaise) {
  EXPECT_EQ(CheckNarrow("%s is %d", "COM7", 7), S_OK);
  EXPECT_EQ(CheckWide(L"%s is %d", L"COM7", 7), S_OK);
  EXPECT_EQ(CheckNarrow(nullptr), E_INVALIDARG);
  EXPECT_EQ(CheckWide(nullptr), E_INVALIDARG);
}

// A character that the code page does not have cannot be measured.
TEST(CheckFormat, RaisesForATextThatCannotBeMeasured) {
  EXPECT_EQ(CheckNarrow("%ls", L"\xD800"), E_FAIL);
}

}  // namespace
