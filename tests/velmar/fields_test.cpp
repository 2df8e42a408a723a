#include "velmar/fields.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

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

TEST(Fields, QuotesAreTakenFromBothEnds) {
  EXPECT_EQ(WithoutQuotes(L"\"a\"b\""), L"a\"b");
  EXPECT_EQ(WithoutQuotes(L"plain"), L"plain");
  EXPECT_EQ(WithoutQuotes(L"\"\""), L"");
  EXPECT_EQ(WithoutQuotes(L""), L"");
}

TEST(Fields, IntegersAreTheirLeadingDigits) {
  EXPECT_EQ(ToInteger(L"42abc"), 42);
  EXPECT_EQ(ToInteger(L"-7"), -7);
  EXPECT_EQ(ToInteger(L"x"), 0);
  EXPECT_EQ(ToInteger(L""), 0);
}

}  // namespace
