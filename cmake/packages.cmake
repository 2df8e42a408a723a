# Header-only packages of the system, usable by the cross compiler too: it is given a folder with
# just these two, never the system's whole include folder.
function(rcvlink_header_package target folder)
  set(root ${CMAKE_BINARY_DIR}/packages/${folder})
  file(MAKE_DIRECTORY ${root})
  if(NOT EXISTS /usr/include/${folder})
    message(FATAL_ERROR "/usr/include/${folder} is missing: run ./test or ./demo, which install it")
  endif()
  file(CREATE_LINK /usr/include/${folder} ${root}/${folder} SYMBOLIC)
  add_library(${target} INTERFACE)
  target_include_directories(${target} SYSTEM INTERFACE ${root})
endfunction()

rcvlink_header_package(rcvlink_cli11 CLI)
rcvlink_header_package(rcvlink_json nlohmann)
