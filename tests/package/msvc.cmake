# Clang and LLVM's linker stand in for Microsoft's: same ABI, same import library. WINDOWS_IMPORTS is the
# folder of MinGW's import libraries of Windows, in the place of those of Microsoft's SDK.
set(CMAKE_SYSTEM_NAME Windows)
set(CMAKE_SYSTEM_PROCESSOR AMD64)
set(CMAKE_CXX_COMPILER clang++-14)
set(CMAKE_CXX_COMPILER_TARGET x86_64-pc-windows-msvc)
set(CMAKE_LINKER lld-link-14)
set(CMAKE_RC_COMPILER llvm-rc-14)
set(CMAKE_MT llvm-mt-14)
set(CMAKE_TRY_COMPILE_TARGET_TYPE STATIC_LIBRARY)
set(CMAKE_TRY_COMPILE_PLATFORM_VARIABLES WINDOWS_IMPORTS)
set(CMAKE_MSVC_RUNTIME_LIBRARY "")
set(CMAKE_CXX_FLAGS_INIT
  "-ffreestanding -fno-exceptions -fno-rtti -fno-stack-protector -mno-stack-arg-probe -Wall -Wextra -Werror")
set(CMAKE_EXE_LINKER_FLAGS_INIT "-Wl,/entry:HostMain,/nodefaultlib")
set(CMAKE_CXX_STANDARD_LIBRARIES
  "\"${WINDOWS_IMPORTS}/libkernel32.a\" \"${WINDOWS_IMPORTS}/liboleaut32.a\"" CACHE STRING "")
