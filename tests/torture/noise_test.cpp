// Downloads over a bad line, again and again: each is complete, or the result says that it is not.
//
// The damage depends on the seed alone and the clock is moved by hand, so runs of the same tests have
// the same results. RCVLINK_NOISE_SEED has the seed of the only download to make.
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <optional>
#include <ostream>
#include <string>
#include <utility>
#include <vector>

#include "simulator/damaged_line.h"
#include "simulator/files.h"
#include "tests/support/content.h"
#include "tests/torture/session.h"

namespace torture {
namespace {

// The chances of a byte to be damaged.
constexpr std::array<double, 4> kRates = {1e-5, 1e-4, 1e-3, 1e-2};
constexpr size_t kFileSize = 5000;
constexpr uint64_t kDownloads = 626;  // for each line and rate: ten thousand together
// A host that has waited so long for a file of this size gives it up.
constexpr DWORD kPatienceMs = 60'000;

enum class Outcome : size_t {
  kComplete,
  kFailed,
  kGivenUp,     // the host's patience was over, whatever the result
  kEmpty,       // S_OK, but no byte
  kShort,       // S_OK, but fewer bytes than the file has
  kLong,        // S_OK, but more
  kOtherBytes,  // S_OK and as many bytes, but others
};
constexpr std::array<const char*, 7> kOutcomes = {
    "complete", "failed", "given up", "empty", "too short", "too long", "with other bytes"};

// The tags of Quorin commands count on in a process, and a longer number moves the damage to other
// bytes. So a few downloads end in another way when other tests ran before.
constexpr double kTagSlack = 15;

// How many downloads of a line at one rate ended in each way.
using Counts = std::array<size_t, kOutcomes.size()>;

struct NoisyLine {
  Link link;
  std::array<Counts, kRates.size()> expected;
};

std::ostream& operator<<(std::ostream& stream, const NoisyLine& line) {
  return stream << line.link.name;
}

constexpr Link kFastVelmar = {"VelmarAtFullSpeed", eInstanceSerial, eProtocolVelmar, CBR_115200};

// One line for each rate, in the order of kOutcomes. A Quorin receiver's file is complete or the
// result is a failure. The driver of a Velmar receiver does not compare checksums, and takes an
// answer that does not come, or that it does not know, for the end: S_OK is no proof of a complete
// file there. This is so at full speed too, where no speed is set back after the transfer. Never are
// there more bytes than the receiver has listed.
constexpr std::array<NoisyLine, 4> kLines = {{
    {kLinks[0],
     {{{624, 2, 0, 0, 0, 0, 0},
       {621, 5, 0, 0, 0, 0, 0},
       {534, 90, 2, 0, 0, 0, 0},
       {0, 441, 185, 0, 0, 0, 0}}}},
    {kLinks[1],
     {{{591, 0, 0, 3, 24, 0, 8},
       {395, 0, 1, 19, 134, 0, 77},
       {5, 0, 65, 136, 383, 0, 37},
       {0, 0, 190, 432, 4, 0, 0}}}},
    {kLinks[2],
     {{{625, 1, 0, 0, 0, 0, 0},
       {605, 1, 20, 0, 0, 0, 0},
       {103, 51, 472, 0, 0, 0, 0},
       {0, 384, 242, 0, 0, 0, 0}}}},
    {kFastVelmar,
     {{{594, 0, 0, 0, 22, 0, 10},
       {397, 0, 1, 13, 136, 0, 79},
       {5, 0, 39, 129, 411, 0, 42},
       {0, 0, 99, 499, 28, 0, 0}}}},
}};

class Noise : public testing::TestWithParam<NoisyLine> {
 protected:
  static void SetUpTestSuite() { content_ = Content(kFileSize); }

  // Nothing: the receiver was not found, before the line was bad.
  static std::optional<Outcome> Download(double rate, uint64_t seed) {
    const Link& link = GetParam().link;
    sim::FileStore files;
    files.Add("A.LOG", sim::Bytes(content_.begin(), content_.end()), 1'700'000'000);
    Bench bench(link, std::move(files));
    const Found receiver(link);
    if (!receiver.handle()) return std::nullopt;
    bench.Damage({.rate = rate, .command_rate = rate, .seed = seed});
    bench.AbortAfter(receiver.handle(), kPatienceMs);
    MemoryStream stream;
    wchar_t name[] = L"A.LOG";
    const long result = devapi::DownloadFile(receiver.handle(), name, &stream, nullptr);
    if (bench.has_aborted()) return Outcome::kGivenUp;
    return result == S_OK ? OutcomeOf(stream.bytes) : Outcome::kFailed;
  }

  static bool MayHappen(Outcome outcome) {
    if (GetParam().link.family == eProtocolVelmar) return outcome != Outcome::kLong;
    return outcome == Outcome::kComplete || outcome == Outcome::kFailed ||
           outcome == Outcome::kGivenUp;
  }

 private:
  static Outcome OutcomeOf(const std::string& bytes) {
    if (bytes == content_) return Outcome::kComplete;
    if (bytes.empty()) return Outcome::kEmpty;
    if (bytes.size() < content_.size()) return Outcome::kShort;
    return bytes.size() > content_.size() ? Outcome::kLong : Outcome::kOtherBytes;
  }

  static inline std::string content_;
};

std::string InWords(const std::vector<uint64_t>& seeds) {
  constexpr size_t kMost = 20;
  std::string text = "seeds";
  for (size_t i = 0; i < seeds.size() && i < kMost; ++i) text += " " + std::to_string(seeds[i]);
  return seeds.size() > kMost ? text + " ..." : text;
}

TEST_P(Noise, NeverMakesAnotherFileThatLooksComplete) {
  const char* const only = std::getenv("RCVLINK_NOISE_SEED");
  const uint64_t first = only ? std::strtoull(only, nullptr, 10) : 0;
  const uint64_t end = only ? first + 1 : kDownloads;
  for (size_t i = 0; i < kRates.size(); ++i) {
    std::array<std::vector<uint64_t>, kOutcomes.size()> seeds;
    for (uint64_t seed = first; seed < end; ++seed) {
      const auto outcome = Download(kRates.at(i), seed);
      ASSERT_TRUE(outcome) << "no receiver, seed " << seed;
      const auto index = static_cast<size_t>(*outcome);
      EXPECT_TRUE(MayHappen(*outcome)) << kOutcomes.at(index) << ", seed " << seed;
      seeds.at(index).push_back(seed);
    }
    std::printf("%s at %g: ", GetParam().link.name, kRates.at(i));
    for (size_t outcome = 0; outcome < kOutcomes.size(); ++outcome) {
      std::printf("%s%zu %s", outcome ? ", " : "", seeds.at(outcome).size(), kOutcomes.at(outcome));
    }
    std::printf("\n");
    for (size_t outcome = 0; outcome < kOutcomes.size() && !only; ++outcome) {
      EXPECT_NEAR(static_cast<double>(seeds.at(outcome).size()),
                  static_cast<double>(GetParam().expected.at(i).at(outcome)),
                  GetParam().link.family == eProtocolQuorin ? kTagSlack : 0)
          << kOutcomes.at(outcome) << " at " << kRates.at(i) << ", " << InWords(seeds.at(outcome));
    }
  }
}

INSTANTIATE_TEST_SUITE_P(Links, Noise, testing::ValuesIn(kLines), [](const auto& line) {
  return line.param.link.name;
});

}  // namespace
}  // namespace torture
