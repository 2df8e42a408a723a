#include "mirror_file.h"

#include <gtest/gtest.h>

namespace cli {
namespace {

TEST(MirrorFileTest, AVerifiedDownloadMovesItsBytesTwice) {
  const auto bytes = [](MirrorStep step, bool verify) {
    return BytesOf({.file = {.size = 100}, .step = step}, verify);
  };
  EXPECT_EQ(bytes(MirrorStep::kDownload, false), 100U);
  EXPECT_EQ(bytes(MirrorStep::kDownload, true), 200U);
  EXPECT_EQ(bytes(MirrorStep::kCompare, true), 100U);
  EXPECT_EQ(bytes(MirrorStep::kNothing, true), 0U);
}

}  // namespace
}  // namespace cli
