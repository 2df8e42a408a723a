# Windows sources as native code, with one of Clang's sanitizers (RCVLINK_SANITIZE): "address" on Wine's functions,
# "thread" on those of tests/thread, since Wine has races of its own.
add_compile_options(-Wno-unknown-warning-option -fPIC -fshort-wchar -g1)

# What is tested, beside the tests.
add_library(rcvlink_sanitizers INTERFACE)
target_compile_options(rcvlink_sanitizers INTERFACE -O1 -fno-omit-frame-pointer)

if(RCVLINK_SANITIZE STREQUAL thread)
  add_compile_options(-fsanitize=thread)
  add_link_options(-fsanitize=thread)
  return()
endif()

add_compile_options(-fsanitize=address -shared-libasan)
target_compile_options(rcvlink_sanitizers INTERFACE
  -fsanitize=undefined,fuzzer-no-link -fno-sanitize-recover=all)

# wineg++ links: NAME is a script that starts Wine, NAME.so the program.
find_program(WINEGXX NAMES wineg++ REQUIRED)
execute_process(COMMAND ${CMAKE_CXX_COMPILER} --print-file-name=libclang_rt.asan-x86_64.so
                OUTPUT_VARIABLE RCVLINK_ASAN OUTPUT_STRIP_TRAILING_WHITESPACE COMMAND_ERROR_IS_FATAL ANY)
set(CMAKE_CXX_LINK_EXECUTABLE "${WINEGXX} -m64 <OBJECTS> -o <TARGET> <LINK_LIBRARIES> ${RCVLINK_ASAN} -loleaut32 -lole32 -ladvapi32 -luuid")
set(CMAKE_EXECUTABLE_SUFFIX .exe)
