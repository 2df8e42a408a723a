#include "wildcard.h"

#include <gtest/gtest.h>

#include <string>

namespace cli {
namespace {

TEST(WildcardTest, KnowsPatternsFromNames) {
  EXPECT_TRUE(IsPattern(L"*.JPS"));
  EXPECT_TRUE(IsPattern(L"LOG?"));
  EXPECT_FALSE(IsPattern(L"LOG0001.JPS"));
  EXPECT_FALSE(IsPattern(L"[a]"));
}

TEST(WildcardTest, AStarStandsForAnyCharacters) {
  for (const wchar_t* const pattern :
       {L"*", L"*.*", L"*.JPS", L"LOG*", L"*01*", L"L*G*1*.J*S", L"LOG0001.JPS*", L"**.JPS"}) {
    EXPECT_TRUE(FitsPattern(L"LOG0001.JPS", pattern)) << pattern;
  }
  for (const wchar_t* const pattern : {L"*.PDC", L"OG*", L"*JP", L"*2*", L"", L"*S*L*"}) {
    EXPECT_FALSE(FitsPattern(L"LOG0001.JPS", pattern)) << pattern;
  }
}

TEST(WildcardTest, AQuestionMarkStandsForOneCharacter) {
  EXPECT_TRUE(FitsPattern(L"LOG1", L"LOG?"));
  EXPECT_TRUE(FitsPattern(L"LOG1", L"????"));
  EXPECT_FALSE(FitsPattern(L"LOG", L"LOG?"));
  EXPECT_FALSE(FitsPattern(L"LOG12", L"LOG?"));
  EXPECT_TRUE(FitsPattern(L"LOG12", L"LOG?*"));
}

TEST(WildcardTest, TheLetterCaseDoesNotCount) {
  EXPECT_TRUE(FitsPattern(L"log0001.jps", L"*.JPS"));
  EXPECT_TRUE(FitsPattern(L"LOG0001.JPS", L"log*"));
}

TEST(WildcardTest, OtherCharactersStandForThemselves) {
  EXPECT_TRUE(FitsPattern(L"a[1].jps", L"a[1].*"));
  EXPECT_FALSE(FitsPattern(L"a1.jps", L"a[1].*"));
  EXPECT_FALSE(FitsPattern(L"aXjps", L"a.jps"));
}

TEST(WildcardTest, AnEmptyNameFitsStarsOnly) {
  EXPECT_TRUE(FitsPattern(L"", L"*"));
  EXPECT_TRUE(FitsPattern(L"", L""));
  EXPECT_FALSE(FitsPattern(L"", L"?"));
}

// Another star must not double the time.
TEST(WildcardTest, ManyStarsDoNotSlowTheSearch) {
  const std::wstring name(250, L'a');
  std::wstring pattern;
  for (int i = 0; i < 60; ++i) pattern += L"a*";
  EXPECT_FALSE(FitsPattern(name, pattern + L"b"));
  EXPECT_TRUE(FitsPattern(name, pattern));
}

}  // namespace
}  // namespace cli
