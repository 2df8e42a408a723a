# The symbols of a released program stand in a file of their own, NAME.debug beside it. GDB finds it by the
# program's .gnu_debuglink. The other configurations keep their symbols inside.
#
# No folder of the build machine is in either file, and no time of the build (--preserve-dates), so that equal sources
# give equal files.
function(rcvlink_split_symbols target)
  if(NOT (PROJECT_IS_TOP_LEVEL AND CMAKE_BUILD_TYPE STREQUAL "Release"))
    return()
  endif()
  set(symbols "$<TARGET_FILE_NAME:${target}>.debug")
  add_custom_command(TARGET ${target} POST_BUILD
    WORKING_DIRECTORY ${CMAKE_RUNTIME_OUTPUT_DIRECTORY}
    COMMAND ${CMAKE_OBJCOPY} --preserve-dates --only-keep-debug $<TARGET_FILE_NAME:${target}> ${symbols}
    COMMAND ${CMAKE_STRIP} --preserve-dates $<TARGET_FILE_NAME:${target}>
    COMMAND ${CMAKE_OBJCOPY} --preserve-dates --add-gnu-debuglink=${symbols} $<TARGET_FILE_NAME:${target}>
    VERBATIM)
  install(FILES $<TARGET_FILE:${target}>.debug DESTINATION bin COMPONENT symbols EXCLUDE_FROM_ALL)
endfunction()

# What is released is compiled with symbols: `level` is -g, or -g1 where a backtrace is enough.
function(rcvlink_compile_symbols level)
  add_compile_options($<$<AND:$<CONFIG:Release>,$<COMPILE_LANGUAGE:CXX>>:${level}>
                      $<$<COMPILE_LANGUAGE:CXX>:-ffile-prefix-map=${PROJECT_SOURCE_DIR}=.>)
endfunction()
