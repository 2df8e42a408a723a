# No warning is let through in our own code.
#  - non-virtual-dtor is left out: COM's interfaces have none, by their nature.
#  - restrict is off: GCC 12 sees overlaps in std::string's operator+ where there are none.
add_library(rcvlink_warnings INTERFACE)
target_compile_options(rcvlink_warnings INTERFACE
  -Wall -Wextra -Wpedantic -Wconversion -Wsign-conversion -Wshadow -Woverloaded-virtual
  -Wold-style-cast -Wcast-qual -Wno-restrict)
# A project that includes this one may have a compiler with further warnings.
if(PROJECT_IS_TOP_LEVEL)
  target_compile_options(rcvlink_warnings INTERFACE -Werror)
endif()
