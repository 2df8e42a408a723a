#include "tests/support/allocations.h"

// Nothing counts allocations here.
UncountedAllocations::UncountedAllocations() = default;
UncountedAllocations::~UncountedAllocations() = default;

int main(int argc, char** argv) {
  testing::InitGoogleMock(&argc, argv);
  return RUN_ALL_TESTS();
}
