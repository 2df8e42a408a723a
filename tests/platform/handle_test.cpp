#include "platform/handle.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <utility>
#include <vector>

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

// A handle is a number, and closing it is recorded.
std::vector<int> closed;

struct NumberTraits {
  using Handle = int;
  static int Empty() { return -1; }
  static void Close(int handle) {
    closed.push_back(handle);
    SetLastError(ERROR_INVALID_HANDLE);
  }
};
using Owner = rcvlink::UniqueHandle<NumberTraits>;

class UniqueHandle : public testing::Test {
 protected:
  UniqueHandle() { closed.clear(); }
};

TEST_F(UniqueHandle, ClosesItsHandleOnce) {
  {
    Owner owner(7);
    EXPECT_TRUE(owner);
    EXPECT_EQ(owner.get(), 7);
    owner.Reset();
    EXPECT_FALSE(owner);
    EXPECT_EQ(owner.get(), -1);
  }
  EXPECT_THAT(closed, ElementsAre(7));
}

TEST_F(UniqueHandle, ClosesAtItsEnd) {
  { const Owner owner(7); }
  EXPECT_THAT(closed, ElementsAre(7));
}

TEST_F(UniqueHandle, DoesNotCloseNothing) {
  {
    const Owner none;
    const Owner empty(-1);
    EXPECT_FALSE(none);
    EXPECT_FALSE(empty);
  }
  EXPECT_THAT(closed, IsEmpty());
}

TEST_F(UniqueHandle, MovesIntoANewOwner) {
  {
    Owner first(7);
    const Owner second(std::move(first));
    EXPECT_FALSE(first);
    EXPECT_EQ(second.get(), 7);
  }
  EXPECT_THAT(closed, ElementsAre(7));
}

TEST_F(UniqueHandle, ClosesWhatItHadWhenItTakesAnother) {
  {
    Owner first(7);
    Owner second(8);
    second = std::move(first);
    EXPECT_THAT(closed, ElementsAre(8));
    EXPECT_FALSE(first);
    EXPECT_EQ(second.get(), 7);
  }
  EXPECT_THAT(closed, ElementsAre(8, 7));
}

TEST_F(UniqueHandle, KeepsWhatIsMovedOntoItself) {
  Owner owner(7);
  Owner& same = owner;
  owner = std::move(same);
  EXPECT_EQ(owner.get(), 7);
  EXPECT_THAT(closed, IsEmpty());
}

TEST_F(UniqueHandle, LeavesTheLastError) {
  Owner owner(7);
  SetLastError(ERROR_FILE_NOT_FOUND);
  owner.Reset();
  EXPECT_EQ(GetLastError(), DWORD{ERROR_FILE_NOT_FOUND});
}

// CreateFile and CreateEvent fail with different values.
TEST(HandleTraits, KnowTheirEmptyValue) {
  EXPECT_FALSE(rcvlink::FileHandle(INVALID_HANDLE_VALUE));
  EXPECT_FALSE(rcvlink::KernelHandle(nullptr));
}

TEST(HandleTraits, CloseTheirHandles) {
  const HANDLE event = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  rcvlink::KernelHandle{event};
  EXPECT_FALSE(SetEvent(event));
  const HANDLE file = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  rcvlink::FileHandle{file};
  EXPECT_FALSE(SetEvent(file));
}

}  // namespace
