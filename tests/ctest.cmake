# What ctest runs. Each entry writes its log and its results to build/test-logs (bed/run_program.py).

set(folder ${PROJECT_SOURCE_DIR}/tests/bed)
find_package(Python3 REQUIRED COMPONENTS Interpreter)
# As many entries at a time as there are sets of ports. Most of them wait for a receiver. A program that computes counts
# as a third, so that there are two at most, and the others find the processor free.
set(computing 11)

# rcvlink_test(NAME KIND SECONDS COMMAND...): one entry
function(rcvlink_test name kind seconds)
  add_test(NAME ${name}
           COMMAND ${Python3_EXECUTABLE} -B ${folder}/run_program.py ${name} ${kind} ${seconds} ${ARGN})
  # The program ends itself; ctest is the last resort.
  math(EXPR limit "${seconds} + 60")
  set_tests_properties(${name} PROPERTIES TIMEOUT ${limit} LABELS gtest)
  if(NOT kind STREQUAL "native")
    set_tests_properties(${name} PROPERTIES FIXTURES_REQUIRED wine)
  endif()
  if(kind STREQUAL "bed")
    set_tests_properties(${name} PROPERTIES RESOURCE_GROUPS ports:1)
  else()
    set_tests_properties(${name} PROPERTIES LABELS "gtest;fast" PROCESSORS ${computing} COST 1000)
  endif()
endfunction()

# rcvlink_shards(COUNT PROGRAM KIND SECONDS): as many entries, each with its share of the tests
function(rcvlink_shards count program kind seconds)
  math(EXPR last "${count} - 1")
  foreach(shard RANGE ${last})
    set(name ${program}.${shard})
    rcvlink_test(${name} ${kind} ${seconds} $<TARGET_FILE:${program}>)
    set_tests_properties(${name} PROPERTIES
      ENVIRONMENT "GTEST_TOTAL_SHARDS=${count};GTEST_SHARD_INDEX=${shard}")
  endforeach()
endfunction()

if(NOT WIN32)
  rcvlink_test(simulator_tests native 120 $<TARGET_FILE:simulator_tests>)
  return()
endif()

foreach(action start end)
  add_test(NAME wine.${action}
           COMMAND ${Python3_EXECUTABLE} -B ${folder}/run_program.py --${action}-wine)
  set_tests_properties(wine.${action} PROPERTIES LABELS wine)
endforeach()
set_tests_properties(wine.start PROPERTIES FIXTURES_SETUP wine)
set_tests_properties(wine.end PROPERTIES FIXTURES_CLEANUP wine)

file(GLOB checks ${folder}/check_*.py)
foreach(check IN LISTS checks)
  get_filename_component(name ${check} NAME_WE)
  add_test(NAME ${name} COMMAND ${Python3_EXECUTABLE} -B ${check})
  set_tests_properties(${name} PROPERTIES PROCESSORS ${computing} COST 1000)
endforeach()
# It compiles for minutes at a low priority, so it begins early and leaves the processor to the others.
set_tests_properties(check_release PROPERTIES PROCESSORS 1 COST 2000 TIMEOUT 1200)

rcvlink_shards(2 unit_tests wine 300)
rcvlink_shards(1 cli_unit_tests wine 120)
# Of the preset sanitize, which ./test has configured. They are here because this preset starts Wine. They are compiled
# while other tests wait for a port, at a low priority, but before check_release gets its turn.
set(sanitize ${PROJECT_SOURCE_DIR}/build/sanitize)
rcvlink_test(sanitized_tests sanitized 300 ${sanitize}/bin/sanitized_tests.exe.so)
add_test(NAME fuzz COMMAND ${Python3_EXECUTABLE} -B ${folder}/run_fuzz.py 60)
set_tests_properties(fuzz PROPERTIES PROCESSORS ${computing} COST 1000 TIMEOUT 600)
foreach(target sanitized_tests fuzz)
  add_test(NAME build.${target} COMMAND nice -n 10 ${CMAKE_COMMAND} --build ${sanitize} --target ${target})
  set_tests_properties(build.${target} PROPERTIES FIXTURES_SETUP ${target} COST 3000 TIMEOUT 1200)
  set_tests_properties(${target} PROPERTIES FIXTURES_REQUIRED "wine;${target}")
endforeach()
set_tests_properties(sanitized_tests PROPERTIES LABELS gtest)
set_tests_properties(build.fuzz PROPERTIES DEPENDS build.sanitized_tests)  # one at a time in a folder
# Many small shards: the last ones end at about the same time.
rcvlink_shards(32 host_tests bed 600)
rcvlink_shards(32 cli_tests bed 300)
rcvlink_shards(4 usb_tests bed 120)

# The sets of ports, as ctest's resources. A set is named by the number of its first port.
file(STRINGS ${folder}/ports.conf lines REGEX "^[A-Z_]+=")
foreach(line IN LISTS lines)
  string(REGEX MATCH "^([A-Z_]+)=([0-9]+)" ignored ${line})
  set(${CMAKE_MATCH_1} ${CMAKE_MATCH_2})
endforeach()
math(EXPR last_port "${FIRST_PORT} + (${PORT_SETS} - 1) * ${PORTS_PER_SET}")
foreach(port RANGE ${FIRST_PORT} ${last_port} ${PORTS_PER_SET})
  list(APPEND sets "{\"id\": \"${port}\", \"slots\": 1}")
endforeach()
list(JOIN sets ", " sets)
file(WRITE ${CMAKE_BINARY_DIR}/ports.json
  "{\"version\": {\"major\": 1, \"minor\": 0}, \"local\": [{\"ports\": [${sets}]}]}\n")
