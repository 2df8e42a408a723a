// Downloads over a bad line, again and again: each is complete, or the result says that it is not.
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <string>

#include "simulator/damaged_line.h"
#include "simulator/files.h"
#include "simulator/quorin/receiver.h"
#include "simulator/velmar/receiver.h"
#include "tests/support/content.h"
#include "tests/torture/session.h"

namespace torture {
namespace {

// The chances of a byte to be damaged.
constexpr std::array<double, 4> kRates = {1e-5, 1e-4, 1e-3, 1e-2};
constexpr size_t kFileSize = 5000;
constexpr int kDownloads = 834;  // for each link and rate: ten thousand together
// A host that has waited so long for a file of this size gives it up.
constexpr DWORD kPatienceMs = 60'000;

struct Counts {
  int complete = 0;
  int failed = 0;
  int short_or_long = 0;  // S_OK, but not as many bytes as the receiver lists
  int other_bytes = 0;    // S_OK and as many bytes, but not those of the file
};

Counts DownloadAgainAndAgain(const Link& link, double rate) {
  const std::string content = Content(kFileSize);
  Counts counts;
  for (uint64_t seed = 0; seed < kDownloads; ++seed) {
    sim::FileStore files;
    files.Add("A.LOG", sim::Bytes(content.begin(), content.end()), 1'700'000'000);
    Bench bench(link, std::move(files));
    const Found receiver(link);
    bench.Damage({.rate = rate, .command_rate = rate, .seed = seed});
    bench.AbortAfter(receiver.handle(), kPatienceMs);
    MemoryStream stream;
    wchar_t name[] = L"A.LOG";
    const long result = devapi::DownloadFile(receiver.handle(), name, &stream, nullptr);
    if (result != S_OK) {
      ++counts.failed;
    } else if (stream.bytes == content) {
      ++counts.complete;
    } else if (stream.bytes.size() == content.size()) {
      ++counts.other_bytes;
    } else {
      ++counts.short_or_long;
    }
  }
  return counts;
}

class Noise : public testing::TestWithParam<Link> {};

TEST_P(Noise, NeverMakesAnotherFileThatLooksComplete) {
  for (const double rate : kRates) {
    const Counts counts = DownloadAgainAndAgain(GetParam(), rate);
    std::printf("%s at %g: %d complete, %d failed, %d of another size, %d with other bytes\n",
                GetParam().name,
                rate,
                counts.complete,
                counts.failed,
                counts.short_or_long,
                counts.other_bytes);
    // The checksums of a Velmar file are not compared.
    if (GetParam().family == eProtocolQuorin) {
      EXPECT_EQ(counts.other_bytes, 0);
      EXPECT_EQ(counts.short_or_long, 0);
    }
    EXPECT_EQ(counts.complete + counts.failed + counts.short_or_long + counts.other_bytes,
              kDownloads);
  }
}

INSTANTIATE_TEST_SUITE_P(Links, Noise, testing::ValuesIn(kLinks), [](const auto& link) {
  return link.param.name;
});

}  // namespace
}  // namespace torture
