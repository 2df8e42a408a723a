// A host that runs for years: searches, lists, downloads and closes again and again.
#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>

#include "tests/races/options.h"
#include "tests/support/resources.h"
#include "tests/torture/session.h"

using torture::Bench;
using torture::Link;
using torture::Session;

namespace races {
namespace {

constexpr uint64_t kFirstCycles = 5;  // the system keeps something of the first ones
constexpr uint64_t kCycles = 200;     // for each link
constexpr size_t kLeastOfACycle = 8;  // bytes
constexpr size_t kSmallSet = 256 * 1024;

class LongUse : public testing::TestWithParam<Link> {
 protected:
  static void Cycle(uint64_t times) {
    for (uint64_t i = 0; i < times && !HasFailure(); ++i) {
      Bench bench(GetParam());
      MemoryStream stream;
      Session session;
      session.Run(GetParam(), &stream, /*removes=*/false);
      EXPECT_TRUE(session.IsWhole(stream.bytes)) << session.InWords() << ", cycle " << i;
    }
  }
};

TEST_P(LongUse, LeavesNothing) {
  const uint64_t cycles = kCycles * Times();
  Cycle(kFirstCycles);
  const Resources before = CountResources();
  const size_t bytes_before = HeapBytes();
  const size_t set_before = WorkingSetBytes();
  Cycle(cycles);
  EXPECT_EQ(CountResources(), before);
  EXPECT_LT(HeapBytes(), bytes_before + cycles * kLeastOfACycle);
#ifdef __MINGW32__  // elsewhere the sanitizer keeps what was freed
  EXPECT_LT(WorkingSetBytes(), set_before + kSmallSet);
#endif
}

INSTANTIATE_TEST_SUITE_P(Links, LongUse, testing::ValuesIn(torture::kLinks), [](const auto& link) {
  return link.param.name;
});

}  // namespace
}  // namespace races
