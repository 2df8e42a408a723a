#include "quorin/reply_framing.h"

#include <gtest/gtest.h>

#include <cctype>
#include <cstdlib>
#include <ostream>
#include <random>
#include <string>

#include "tests/support/guarded_bytes.h"

using namespace QuorinCommands;

namespace {

std::optional<ReplyHeader> Find(std::string_view bytes, size_t scan_from = 0) {
  const GuardedBytes guarded(bytes);
  return FindReplyHeader(guarded.View(), scan_from);
}

struct HeaderCase {
  std::string_view bytes;
  size_t position;
  ReplyKind kind;
  size_t body_length;
};

void PrintTo(const HeaderCase& header, std::ostream* out) { *out << header.bytes; }

class QuorinHeader : public testing::TestWithParam<HeaderCase> {};

TEST_P(QuorinHeader, IsFound) {
  const auto header = Find(GetParam().bytes);
  ASSERT_TRUE(header.has_value());
  EXPECT_EQ(header->position, GetParam().position);
  EXPECT_EQ(header->kind, GetParam().kind);
  EXPECT_EQ(header->body_length, GetParam().body_length);
  EXPECT_EQ(header->MessageLength(), GetParam().body_length + 5);
}

INSTANTIATE_TEST_SUITE_P(Kinds,
                         QuorinHeader,
                         testing::Values(HeaderCase{"RE003%1%", 0, ReplyKind::kReply, 3},
                                         HeaderCase{"ER003%1%", 0, ReplyKind::kError, 3},
                                         HeaderCase{"  003%1%", 0, ReplyKind::kBlank, 3}));

INSTANTIATE_TEST_SUITE_P(Lengths,
                         QuorinHeader,
                         testing::Values(HeaderCase{"RE000", 0, ReplyKind::kReply, 0},
                                         HeaderCase{"RE0aF", 0, ReplyKind::kReply, 0xAF},
                                         HeaderCase{"RE00D%7%/dev/ser/a", 0, ReplyKind::kReply, 13},
                                         HeaderCase{"REFFF", 0, ReplyKind::kReply, 4095},
                                         HeaderCase{"REFFF!", 0, ReplyKind::kReply, 4095},
                                         // Any three characters are accepted, not only digits.
                                         HeaderCase{"RE1zz", 0, ReplyKind::kReply, 1},
                                         HeaderCase{"RE12x", 0, ReplyKind::kReply, 0x12},
                                         HeaderCase{"RE0x7", 0, ReplyKind::kReply, 7},
                                         // Digits of the body belong to the length.
                                         HeaderCase{"RE0034.", 0, ReplyKind::kReply, 0x34},
                                         HeaderCase{"RE000000FFF.", 0, ReplyKind::kReply, 4095}));

INSTANTIATE_TEST_SUITE_P(AfterWhatIsNoHeader,
                         QuorinHeader,
                         testing::Values(HeaderCase{"*$\xFF RE003%1%", 4, ReplyKind::kReply, 3},
                                         HeaderCase{"RRE003%1%", 1, ReplyKind::kReply, 3},
                                         HeaderCase{"EEER003%1%", 2, ReplyKind::kError, 3},
                                         HeaderCase{"RERE003%1%", 2, ReplyKind::kReply, 3},
                                         HeaderCase{"RER003%1%", 1, ReplyKind::kError, 3},
                                         HeaderCase{"RE1 RE003%1%", 4, ReplyKind::kReply, 3},
                                         HeaderCase{"RExyzRE003%1%", 5, ReplyKind::kReply, 3},
                                         HeaderCase{"   003%1%", 1, ReplyKind::kBlank, 3},
                                         HeaderCase{"   RE003%1%", 3, ReplyKind::kReply, 3},
                                         HeaderCase{"RE1000!RE003%1%", 7, ReplyKind::kReply, 3},
                                         HeaderCase{"RE003ABCRE003%1%", 8, ReplyKind::kReply, 3},
                                         // The second header begins inside the first one's digits.
                                         HeaderCase{"REEEEER003%1%", 5, ReplyKind::kError, 3}));

class QuorinNoHeader : public testing::TestWithParam<std::string_view> {};

TEST_P(QuorinNoHeader, IsFound) { EXPECT_FALSE(Find(GetParam()).has_value()); }

INSTANTIATE_TEST_SUITE_P(Identifiers,
                         QuorinNoHeader,
                         testing::Values("re003%1%",
                                         "Re003%1%",
                                         "rE003%1%",
                                         "RR003%1%",
                                         "EE003%1%",
                                         " E003%1%",
                                         " R003%1%",
                                         "R E003%1%",
                                         "E 003%1%",
                                         "\t\t003%1%"));

INSTANTIATE_TEST_SUITE_P(Lengths,
                         QuorinNoHeader,
                         testing::Values("RExyz",
                                         "REG00",
                                         "RE-12",
                                         "RE+12",
                                         "RE0.5",
                                         "RE 12.",
                                         "RE1 2.",
                                         "RE12%",
                                         "RE12\r\n",
                                         "RE1\xE9\xE9",
                                         "RE1000",
                                         "REFFFF",
                                         "RE001000",
                                         "RE0x1000",
                                         "RE003ABC",
                                         "REFFFFFFFFFFFFFFFFFFFFFFFF"));

INSTANTIATE_TEST_SUITE_P(TooShort,
                         QuorinNoHeader,
                         testing::Values("", "R", "RE", "RE0", "RE00", " ", "  ", "  00", "E"));

TEST(QuorinHeaderSearch, StartsAtTheGivenPosition) {
  EXPECT_EQ(Find("RE001aER001b", 1)->position, 6U);
  EXPECT_EQ(Find("RE001aER001b", 6)->position, 6U);
  EXPECT_FALSE(Find("RE001aER001b", 7));
}

TEST(QuorinHeaderSearch, StartingAfterTheEndFindsNothing) {
  EXPECT_FALSE(Find("RE000", 5));
  EXPECT_FALSE(Find("RE000", 9));
}

TEST(QuorinHeaderSearch, StaysAtAHeaderUntilItsMessageIsWhole) {
  size_t scan_from = 0;
  ASSERT_TRUE(FindReplyHeader("***RE010", scan_from));
  EXPECT_EQ(scan_from, 3U);
}

TEST(QuorinHeaderSearch, KeepsAHeaderThatIsCutOff) {
  const std::string bytes = "RExyz1RE003%1%";
  for (size_t cut = 0; cut <= bytes.size(); ++cut) {
    size_t scan_from = 0;
    FindReplyHeader(std::string_view(bytes).substr(0, cut), scan_from);
    const auto header = FindReplyHeader(bytes, scan_from);
    ASSERT_TRUE(header.has_value()) << "cut at " << cut;
    EXPECT_EQ(header->position, 6U) << "cut at " << cut;
  }
}

TEST(QuorinHeaderSearch, SkipsBytesThatAreNoHeader) {
  size_t scan_from = 0;
  EXPECT_FALSE(FindReplyHeader(std::string(1000, '*'), scan_from));
  EXPECT_EQ(scan_from, 996U);
}

TEST(QuorinHeaderSearch, ReadsNothingAfterTheBytes) {
  const std::string bytes = "RERE   ER0REFFF0x RE0x";
  for (size_t end = 0; end <= bytes.size(); ++end) {
    for (size_t from = 0; from <= end; ++from) {
      const auto header = Find(std::string_view(bytes).substr(0, end), from);
      if (header) {
        EXPECT_LE(header->position + kReplyHeaderLength, end);
      }
    }
  }
}

// The same search in the simplest way.
std::optional<ReplyHeader> FindSlowly(const std::string& bytes) {
  for (size_t p = 0; p + 5 <= bytes.size(); ++p) {
    const std::string identifier = bytes.substr(p, 2);
    const size_t kind =
        identifier == "  " ? 0U : (identifier == "RE" ? 1U : (identifier == "ER" ? 2U : 3U));
    if (kind == 3) continue;
    bool letters_or_digits = true;
    for (size_t i = p + 2; i < p + 5; ++i) {
      letters_or_digits =
          letters_or_digits && std::isalnum(static_cast<unsigned char>(bytes[i])) != 0;
    }
    if (!letters_or_digits) continue;
    const char* const digits = bytes.c_str() + p + 2;
    char* end = nullptr;
    const unsigned long long length = std::strtoull(digits, &end, 16);
    if (end == digits || length > 4095) continue;
    return ReplyHeader{p, static_cast<ReplyKind>(kind), static_cast<size_t>(length)};
  }
  return std::nullopt;
}

TEST(QuorinHeaderSearch, AgreesWithASlowOneOnGarbage) {
  constexpr std::string_view kAlphabet = "RERE  019AFg%";
  std::mt19937 random(20240607);  // the same in each run
  size_t found = 0;
  for (int round = 0; round < 20000; ++round) {
    std::string bytes(random() % 24, '\0');
    for (char& c : bytes) c = kAlphabet[random() % kAlphabet.size()];
    const auto expected = FindSlowly(bytes);
    size_t scan_from = 0;
    const auto header = FindReplyHeader(bytes, scan_from);
    ASSERT_EQ(header.has_value(), expected.has_value()) << bytes;
    if (!expected) continue;
    ++found;
    ASSERT_EQ(header->position, expected->position) << bytes;
    ASSERT_EQ(header->kind, expected->kind) << bytes;
    ASSERT_EQ(header->body_length, expected->body_length) << bytes;
  }
  EXPECT_GT(found, 1000U);
}

}  // namespace
