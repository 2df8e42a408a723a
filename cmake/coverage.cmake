# Counts which lines and branches of a target run (./test --coverage). The optimizer would join lines, so it is off.
# The library of GCC is linked by name, because Clang links the tests.
add_library(rcvlink_coverage INTERFACE)
if(RCVLINK_COVERAGE)
  target_compile_options(rcvlink_coverage INTERFACE
    $<$<COMPILE_LANGUAGE:CXX>:--coverage;-fprofile-update=atomic;-O0>)
  target_link_libraries(rcvlink_coverage INTERFACE gcov)
endif()
