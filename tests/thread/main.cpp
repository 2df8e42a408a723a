// Runs the tests. The first report of ThreadSanitizer ends the program.
#include "tests/support/allocations.h"

extern "C" const char* __tsan_default_options() {
  return "halt_on_error=1:second_deadlock_stack=1:history_size=7";
}

// Nothing is counted here.
UncountedAllocations::UncountedAllocations() = default;
UncountedAllocations::~UncountedAllocations() = default;

int main(int argc, char** argv) {
  testing::InitGoogleMock(&argc, argv);
  return RUN_ALL_TESTS();
}
