# Windows sources as native code on Wine's functions, with Clang's sanitizers. wineg++ links: NAME is a script that starts
# Wine, NAME.so the program.
add_compile_options(-Wno-unknown-warning-option -fPIC -fshort-wchar -g1 -fsanitize=address -shared-libasan)

# What is tested, beside the tests.
add_library(rcvlink_sanitizers INTERFACE)
target_compile_options(rcvlink_sanitizers INTERFACE
  -O1 -fno-omit-frame-pointer -fsanitize=undefined,fuzzer-no-link -fno-sanitize-recover=all)

find_program(WINEGXX NAMES wineg++ REQUIRED)
execute_process(COMMAND ${CMAKE_CXX_COMPILER} --print-file-name=libclang_rt.asan-x86_64.so
                OUTPUT_VARIABLE RCVLINK_ASAN OUTPUT_STRIP_TRAILING_WHITESPACE COMMAND_ERROR_IS_FATAL ANY)
set(CMAKE_CXX_LINK_EXECUTABLE "${WINEGXX} -m64 <OBJECTS> -o <TARGET> <LINK_LIBRARIES> ${RCVLINK_ASAN} -loleaut32 -lole32 -ladvapi32 -luuid")
set(CMAKE_EXECUTABLE_SUFFIX .exe)
