#include "platform/process_object.h"

#include <gtest/gtest.h>

#include <stdexcept>

using rcvlink::ProcessObject;

namespace {

struct Counted {
  Counted() {
    if (refused) throw std::runtime_error("refused");
    ++made;
  }

  static inline int made = 0;
  static inline bool refused = false;
};

TEST(ProcessObject, IsMadeByTheFirstCallAndNoOther) {
  const int before = Counted::made;
  ProcessObject<Counted> object;
  EXPECT_EQ(Counted::made, before);
  Counted* const first = &object.get();
  EXPECT_EQ(&object.get(), first);
  EXPECT_EQ(Counted::made, before + 1);
}

TEST(ProcessObject, IsMadeByALaterCallWhenTheFirstRaised) {
  const int before = Counted::made;
  ProcessObject<Counted> object;
  Counted::refused = true;
  EXPECT_THROW(object.get(), std::runtime_error);
  Counted::refused = false;
  object.get();
  EXPECT_EQ(Counted::made, before + 1);
}

}  // namespace
