# Installs the build as a user would, and builds the host of package/ from that tree with either compiler.
set(folder ${CMAKE_BINARY_DIR}/package)
set(tree ${folder}/tree)
file(GLOB installed CONFIGURE_DEPENDS
  ${PROJECT_SOURCE_DIR}/include/* ${PROJECT_SOURCE_DIR}/cmake/* ${PROJECT_SOURCE_DIR}/docs/*
  ${PROJECT_SOURCE_DIR}/bindings/csharp/* ${PROJECT_SOURCE_DIR}/examples/*
  ${PROJECT_SOURCE_DIR}/kit/*)
add_custom_command(
  OUTPUT ${folder}/tree.stamp
  COMMAND ${CMAKE_COMMAND} -E rm -rf ${tree}
  COMMAND ${CMAKE_COMMAND} --install ${PROJECT_BINARY_DIR} --prefix ${tree}
  COMMAND ${CMAKE_COMMAND} -E touch ${folder}/tree.stamp
  DEPENDS rcvlink rcvlink-cli rcvlink-sim rcvlink_msvc_library ${installed}
  VERBATIM)

set(toolchain_mingw ${PROJECT_SOURCE_DIR}/cmake/mingw-w64.cmake)
set(toolchain_msvc ${CMAKE_CURRENT_SOURCE_DIR}/package/msvc.cmake)
find_library(KERNEL32_IMPORTS kernel32 REQUIRED)
get_filename_component(windows_imports ${KERNEL32_IMPORTS} DIRECTORY)
foreach(compiler mingw msvc)
  set(program ${CMAKE_RUNTIME_OUTPUT_DIRECTORY}/package_${compiler}.exe)
  if(compiler STREQUAL mingw)
    list(APPEND program ${CMAKE_RUNTIME_OUTPUT_DIRECTORY}/package_hpp.exe)
  endif()
  add_custom_command(
    OUTPUT ${program}
    COMMAND ${CMAKE_COMMAND} -S ${CMAKE_CURRENT_SOURCE_DIR}/package -B ${folder}/${compiler} -G Ninja
            --toolchain ${toolchain_${compiler}} -DCMAKE_BUILD_TYPE=Release -DCMAKE_PREFIX_PATH=${tree}
            -DHOST_NAME=package_${compiler} -DWINDOWS_IMPORTS=${windows_imports}
            -DCMAKE_RUNTIME_OUTPUT_DIRECTORY=${CMAKE_RUNTIME_OUTPUT_DIRECTORY}
    COMMAND ${CMAKE_COMMAND} --build ${folder}/${compiler} --clean-first
    DEPENDS ${folder}/tree.stamp package/CMakeLists.txt package/host.cpp package/hpp_host.cpp ${toolchain_${compiler}}
    VERBATIM)
  list(APPEND programs ${program})
endforeach()
add_custom_target(package_hosts ALL DEPENDS ${programs})
