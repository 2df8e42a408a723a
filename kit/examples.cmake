# Builds the samples from the folders of the zip file:
#   cmake -S share/doc/rcvlink/examples -B build
cmake_minimum_required(VERSION 3.21)
project(rcvlink_examples LANGUAGES C CXX)
set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)

find_package(rcvlink CONFIG REQUIRED HINTS ${CMAKE_CURRENT_SOURCE_DIR}/../../../..)

foreach(sample download cancel several mirror)
  add_executable(${sample} ${sample}.cpp)
  target_link_libraries(${sample} PRIVATE rcvlink::rcvlink oleaut32)
endforeach()

# It loads the DLL itself.
add_executable(list list.c)
target_link_libraries(list PRIVATE oleaut32)
get_target_property(include_folder rcvlink::rcvlink INTERFACE_INCLUDE_DIRECTORIES)
target_include_directories(list PRIVATE ${include_folder})

foreach(sample download cancel several mirror list)
  if(MINGW)
    target_link_options(${sample} PRIVATE -municode -static)
  endif()
endforeach()

# A program needs the DLL beside it.
add_custom_command(TARGET download POST_BUILD
  COMMAND ${CMAKE_COMMAND} -E copy_if_different
          $<TARGET_FILE:rcvlink::rcvlink> $<TARGET_FILE_DIR:download>)
