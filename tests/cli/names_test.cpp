#include "names.h"

#include <gtest/gtest.h>

#include <string>

namespace cli {
namespace {

TEST(NamesTest, OrdinaryNamesMayBeSent) {
  for (const wchar_t* name : {L"LOG0001.DAT", L"a b", L"/cur/log", L"x.tar.gz", L"-x", L"[a,b]"}) {
    EXPECT_EQ(WhyNotSendable(name), std::nullopt) << name;
  }
}

TEST(NamesTest, QuotesAndControlCharactersAreNotSent) {
  for (const wchar_t* name :
       {L"", L"a\"b", L"a'b", L"a\nb", L"a\rb", L"a\tb", L"\x1B[m", L"a\x7F", L"a\x85"}) {
    EXPECT_NE(WhyNotSendable(name), std::nullopt) << name;
  }
  EXPECT_NE(WhyNotSendable(std::wstring_view(L"a\0b", 3)), std::nullopt);
}

TEST(NamesTest, NamesThatTheCodePageWouldChangeAreNotSent) {
  // A wide quote would be sent as an ordinary one, or as a question mark.
  EXPECT_NE(WhyNotSendable(L"a\xFF02"), std::nullopt);
  EXPECT_NE(WhyNotSendable(L"\xD83D\xDE00"), std::nullopt);
}

TEST(NamesTest, OrdinaryNamesStayAsTheyAre) {
  for (const wchar_t* name : {L"LOG0001.DAT",
                              L"a b.c",
                              L".hidden",
                              L"gr\xFC\xDF",
                              L"CONSOLE",
                              L"COM",
                              L"COM10",
                              L"LPTX",
                              L"xCON"}) {
    EXPECT_EQ(SafeLocalName(name), name);
    EXPECT_TRUE(IsPlainFileName(name));
  }
}

struct Escape {
  const wchar_t* name;
  const wchar_t* local;
};

class EscapeTest : public testing::TestWithParam<Escape> {};

TEST_P(EscapeTest, LandsUnderAnotherName) {
  EXPECT_EQ(SafeLocalName(GetParam().name), GetParam().local);
  EXPECT_FALSE(IsPlainFileName(GetParam().name));
}

INSTANTIATE_TEST_SUITE_P(OutOfTheFolder,
                         EscapeTest,
                         testing::Values(Escape{L"..", L"%2E%2E"},
                                         Escape{L".", L"%2E"},
                                         Escape{L"..\\evil", L"..%5Cevil"},
                                         Escape{L"../evil", L"..%2Fevil"},
                                         Escape{L"\\\\host\\share", L"%5C%5Chost%5Cshare"},
                                         Escape{L"C:evil", L"C%3Aevil"},
                                         Escape{L"a:stream", L"a%3Astream"},
                                         Escape{L".. ", L"%2E%2E%20"}));

INSTANTIATE_TEST_SUITE_P(IntoADevice,
                         EscapeTest,
                         testing::Values(Escape{L"CON", L"_CON"},
                                         Escape{L"nul.txt", L"_nul.txt"},
                                         Escape{L"Aux .x.y", L"_Aux .x.y"},
                                         Escape{L"PRN.", L"_PRN%2E"},
                                         Escape{L"COM7", L"_COM7"},
                                         Escape{L"lpt0.log", L"_lpt0.log"},
                                         Escape{L"COM\xB9", L"_COM\xB9"},
                                         Escape{L"CONIN$", L"_CONIN$"},
                                         Escape{L"conout$.a", L"_conout$.a"}));

INSTANTIATE_TEST_SUITE_P(Impossible,
                         EscapeTest,
                         testing::Values(Escape{L"a\x1B[m", L"a%1B[m"},
                                         Escape{L"a\nb", L"a%0Ab"},
                                         Escape{L"a<b>c|d?e*f\"", L"a%3Cb%3Ec%7Cd%3Fe%2Af%22"},
                                         Escape{L"a. .", L"a%2E%20%2E"},
                                         Escape{L"a\x202E"
                                                L"b",
                                                L"a%202E"
                                                L"b"}));

TEST(NamesTest, NoNameAndTooLongNamesAreRefused) {
  constexpr size_t kLongest = 250;  // 255 without ".part"
  EXPECT_EQ(SafeLocalName(L""), std::nullopt);
  EXPECT_NE(SafeLocalName(std::wstring(kLongest, L'a')), std::nullopt);
  EXPECT_EQ(SafeLocalName(std::wstring(kLongest + 1, L'a')), std::nullopt);
  EXPECT_EQ(SafeLocalName(std::wstring(kLongest, L'/')), std::nullopt);
}

TEST(NamesTest, LetterCaseMakesNoOtherFile) {
  EXPECT_TRUE(SameLocalName(L"log\xE9.dat", L"LOG\xC9.DAT"));
  EXPECT_FALSE(SameLocalName(L"log1", L"log2"));
}

TEST(NamesTest, KnowsComPorts) {
  EXPECT_TRUE(IsComPort(L"COM7"));
  EXPECT_TRUE(IsComPort(L"com10"));
  for (const wchar_t* name : {L"", L"COM", L"COMx", L"COM7x", L"LPT1"}) {
    EXPECT_FALSE(IsComPort(name)) << name;
  }
}

TEST(NamesTest, PortsAreKnownHoweverTheyAreWritten) {
  for (const wchar_t* name :
       {L"COM7", L"com7", L"COM7:", L"com7:", L"\\\\.\\COM7", L"\\\\.\\com7:"}) {
    EXPECT_EQ(PlainPortName(name), L"COM7") << name;
  }
  for (const wchar_t* name :
       {L"", L":", L"COM", L"com7::", L"\\\\?\\usb#x", L"C:", L"\\\\.\\other"}) {
    EXPECT_EQ(PlainPortName(name), name);
  }
}

}  // namespace
}  // namespace cli
