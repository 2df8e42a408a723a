#include "platform/event.h"

#include <gtest/gtest.h>

#include "platform/handle.h"

using rcvlink::IsSignalled;
using rcvlink::KernelHandle;

namespace {

TEST(IsSignalled, IsFalseWithoutAnEvent) { EXPECT_FALSE(IsSignalled(nullptr)); }

TEST(IsSignalled, LeavesAManualResetEventAsItIs) {
  const KernelHandle event(CreateEventW(nullptr, TRUE, FALSE, nullptr));
  EXPECT_FALSE(IsSignalled(event.get()));
  SetEvent(event.get());
  EXPECT_TRUE(IsSignalled(event.get()));
  EXPECT_TRUE(IsSignalled(event.get()));
}

TEST(IsSignalled, ClearsAnAutoResetEvent) {
  const KernelHandle event(CreateEventW(nullptr, FALSE, TRUE, nullptr));
  EXPECT_TRUE(IsSignalled(event.get()));
  EXPECT_FALSE(IsSignalled(event.get()));
}

}  // namespace
