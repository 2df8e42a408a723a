#include "output.h"

#include <gtest/gtest.h>

#include "handle.h"

namespace cli {
namespace {

// Replaces the standard output with a pipe during a test.
class OutputTest : public testing::Test {
 protected:
  OutputTest() {
    HANDLE reader = nullptr;
    HANDLE writer = nullptr;
    CreatePipe(&reader, &writer, nullptr, 0);
    reader_.reset(reader);
    writer_.reset(writer);
    SetStdHandle(STD_OUTPUT_HANDLE, writer);
  }
  ~OutputTest() override { SetStdHandle(STD_OUTPUT_HANDLE, saved_); }

  const HANDLE saved_ = GetStdHandle(STD_OUTPUT_HANDLE);
  UniqueHandle reader_;
  UniqueHandle writer_;
};

TEST_F(OutputTest, WritesIntoAPipe) {
  Output out(STD_OUTPUT_HANDLE);
  out.Write("hello");
  char buffer[8] = {};
  DWORD count = 0;
  ASSERT_TRUE(ReadFile(reader_.get(), buffer, sizeof(buffer), &count, nullptr));
  EXPECT_EQ(std::string_view(buffer, count), "hello");
  EXPECT_EQ(out.first_error(), DWORD{ERROR_SUCCESS});
  EXPECT_FALSE(out.IsClosed());
}

TEST_F(OutputTest, KnowsThatItsReaderIsGone) {
  Output out(STD_OUTPUT_HANDLE);
  reader_.reset();
  out.Write("hello");
  EXPECT_TRUE(out.IsClosed());
  EXPECT_NE(out.WriteRaw("more"), DWORD{ERROR_SUCCESS});
}

}  // namespace
}  // namespace cli
