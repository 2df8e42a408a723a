# find_package(rcvlink CONFIG) gives the target rcvlink::rcvlink, for compilers of both ABIs.
get_filename_component(_rcvlink_root "${CMAKE_CURRENT_LIST_DIR}/../../.." ABSOLUTE)
if(MSVC OR CMAKE_CXX_SIMULATE_ID STREQUAL "MSVC" OR CMAKE_C_SIMULATE_ID STREQUAL "MSVC")
  set(_rcvlink_imports rcvlink.lib)
else()
  set(_rcvlink_imports librcvlink.dll.a)
endif()
if(NOT CMAKE_SIZEOF_VOID_P EQUAL 8)
  set(rcvlink_FOUND FALSE)
  set(rcvlink_NOT_FOUND_MESSAGE "rcvlink serves 64-bit hosts only")
elseif(NOT TARGET rcvlink::rcvlink)
  add_library(rcvlink::rcvlink SHARED IMPORTED)
  set_target_properties(rcvlink::rcvlink PROPERTIES
    IMPORTED_LOCATION "${_rcvlink_root}/bin/rcvlink.dll"
    IMPORTED_IMPLIB "${_rcvlink_root}/lib/${_rcvlink_imports}"
    INTERFACE_INCLUDE_DIRECTORIES "${_rcvlink_root}/include")
endif()
unset(_rcvlink_root)
unset(_rcvlink_imports)
