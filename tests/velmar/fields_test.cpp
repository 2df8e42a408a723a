#include "velmar/fields.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <string_view>

#include "platform/win32.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using VelmarCommands::SplitFields;
using VelmarCommands::ToInteger;
using VelmarCommands::WithoutQuotes;

TEST(Fields, SplitAtCommas) {
  EXPECT_THAT(SplitFields("a,bc,,d"), ElementsAre(L"a", L"bc", L"", L"d"));
}

TEST(Fields, KeepAnEmptyEnd) { EXPECT_THAT(SplitFields("a,"), ElementsAre(L"a", L"")); }

TEST(Fields, OfNothingAreOneEmptyField) { EXPECT_THAT(SplitFields(""), ElementsAre(L"")); }

TEST(Fields, QuotesProtectCommasAndStay) {
  EXPECT_THAT(SplitFields("\"a,b\",c\"d,e\"f"), ElementsAre(L"\"a,b\"", L"c\"d,e\"f"));
}

TEST(Fields, ATextThatEndsInsideQuotesLosesItsLastField) {
  EXPECT_THAT(SplitFields("a,\"b,c"), ElementsAre(L"a"));
  EXPECT_THAT(SplitFields("\""), IsEmpty());
}

TEST(Fields, AreNotTrimmed) { EXPECT_THAT(SplitFields(" a ,\r\n"), ElementsAre(L" a ", L"\r\n")); }

TEST(Fields, MayHaveZeroBytes) {
  EXPECT_THAT(SplitFields(std::string_view("a\0b,c", 5)),
              ElementsAre(std::wstring(L"a\0b", 3), L"c"));
}

// It is the thread's code page: alpha is one byte in the Greek one, and another letter elsewhere.
TEST(Fields, AreInTheCodePageOfTheThread) {
  constexpr LCID kGreek = 0x0408;
  constexpr LCID kEnglish = 0x0409;
  const LCID before = GetThreadLocale();
  SetThreadLocale(kGreek);
  const auto greek = SplitFields("\xE1,b");
  SetThreadLocale(kEnglish);
  const auto english = SplitFields("\xE1,b");
  SetThreadLocale(before);
  EXPECT_THAT(greek, ElementsAre(L"\x3B1", L"b"));
  EXPECT_THAT(english, ElementsAre(L"\xE1", L"b"));
}

TEST(Fields, QuotesAreTakenFromBothEnds) {
  EXPECT_EQ(WithoutQuotes(L"\"a\"b\""), L"a\"b");
  EXPECT_EQ(WithoutQuotes(L"plain"), L"plain");
  EXPECT_EQ(WithoutQuotes(L"\"\""), L"");
  EXPECT_EQ(WithoutQuotes(L""), L"");
  EXPECT_EQ(WithoutQuotes(L"\"\"a\"\""), L"a");
  EXPECT_EQ(WithoutQuotes(L"\"a"), L"a");
  EXPECT_EQ(WithoutQuotes(L" \"a\""), L" \"a");  // not at the end
}

TEST(Fields, IntegersAreTheirLeadingDigits) {
  EXPECT_EQ(ToInteger(L"42abc"), 42);
  EXPECT_EQ(ToInteger(L"-7"), -7);
  EXPECT_EQ(ToInteger(L"x"), 0);
  EXPECT_EQ(ToInteger(L""), 0);
  EXPECT_EQ(ToInteger(L"-2147483648"), -2147483647 - 1);
  EXPECT_EQ(ToInteger(L"2147483647"), 2147483647);
  EXPECT_EQ(ToInteger(L"4000000000"), 2147483647);  // the largest number
  EXPECT_EQ(ToInteger(L"\"7\""), 0);
}

}  // namespace
